// Init, Run and Finalize over a counting resource manager, watching the wrapper
// singleton and the services they make and delete.
#include <gtest/gtest.h>

#include <memory>
#include <stdexcept>
#include <string>

#include "kopdm_clientapi/api_wrapper.h"
#include "kosdtools_timescales/timescale_helpers.h"
#include "quillon/plugin_lifecycle.h"
#include "ws_runtime/exchange.h"

namespace {

// Answers every resource with "{}"; counts its lifetimes.
struct CountingResourceManager : quillon::ResourceManagerInterface {
  CountingResourceManager(std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface> h, int& d)
      : helpers(std::move(h)), destroyed(d) {}
  ~CountingResourceManager() override { ++destroyed; }
  std::string getResources(const std::string&) override { return "{}"; }
  std::string getSyncableDevice(const std::string&) override { return "{}"; }
  std::string getTimescale(const std::string&) override { return "{}"; }
  void putSyncableDevice(const std::string&, const std::string&) override {}
  std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface> helpers;  // keeps the wrapper
  int& destroyed;
};

class LifecycleTest : public ::testing::Test {
 protected:
  int wrappersMade = 0;
  int managersMade = 0;
  int managersDestroyed = 0;
  bool failNextGraph = false;
  quillon::PluginLifecycle lifecycle{quillon::GraphFactories{
      [this] {
        ++wrappersMade;
        return std::make_shared<kopendulo::ApiWrapper>();
      },
      [](auto wrapper) { return std::make_shared<kosdtools::pendulo::TimescaleHelpers>(std::move(wrapper)); },
      [this](auto helpers) {
        if (failNextGraph) throw std::runtime_error("no graph today");
        ++managersMade;
        return std::make_shared<CountingResourceManager>(std::move(helpers), managersDestroyed);
      }}};
};

TEST_F(LifecycleTest, InitReplacesTheServiceAndFinalizeReleasesTheGraphOnce) {
  lifecycle.finalize();  // before any Init
  lifecycle.init();
  const quillon::Service* first = lifecycle.service();
  auto wrapper = lifecycle.wrapper();
  ASSERT_NE(first, nullptr);
  ASSERT_NE(wrapper, nullptr);

  // A second Init replaces the service and reuses the wrapper.
  lifecycle.init();
  EXPECT_NE(lifecycle.service(), first);
  EXPECT_EQ(lifecycle.wrapper(), wrapper);
  wrapper.reset();
  EXPECT_EQ(managersMade, 2);
  EXPECT_EQ(managersDestroyed, 1);

  // A graph that fails to build leaves the working one in place, silently.
  failNextGraph = true;
  const quillon::Service* current = lifecycle.service();
  lifecycle.init();
  EXPECT_EQ(lifecycle.service(), current);
  EXPECT_EQ(managersDestroyed, 1);
  failNextGraph = false;

  lifecycle.finalize();
  lifecycle.finalize();
  EXPECT_EQ(lifecycle.service(), nullptr);
  EXPECT_EQ(managersDestroyed, 2);
  EXPECT_EQ(lifecycle.wrapper(), nullptr);  // expired with its graph
  lifecycle.init();
  EXPECT_EQ(wrappersMade, 2);
  EXPECT_NE(lifecycle.wrapper(), nullptr);
}

// Answers after Init are checked over HTTP, where the host loads the built
// library; outside Init the service is unavailable.
TEST_F(LifecycleTest, RunAnswers503OutsideInitAndSurvivesBadRequests) {
  ws::runtime::Exchange exchange;
  lifecycle.run(exchange.info(), exchange.id());
  EXPECT_EQ(exchange.response().code, 503);

  lifecycle.init();
  exchange.reset();
  // A null request object answers nothing and returns normally.
  lifecycle.run(nullptr, exchange.id());
  EXPECT_EQ(exchange.response().code, 200);
  EXPECT_TRUE(exchange.response().body.empty());
  EXPECT_FALSE(exchange.response().hasMimeType);

  // A request whose every host call fails (its id is stale) is swallowed.
  const uint32_t stale = exchange.id();
  exchange.reset();
  lifecycle.run(exchange.info(), stale);
  EXPECT_TRUE(exchange.response().body.empty());

  lifecycle.finalize();
  exchange.reset();
  lifecycle.run(exchange.info(), exchange.id());
  EXPECT_EQ(exchange.response().code, 503);
}

}  // namespace
