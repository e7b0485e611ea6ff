#include "e2e/service_host.h"

#include <cstdio>
#include <fstream>
#include <iterator>
#include <stdexcept>

namespace e2e {

namespace test = quillon::test_support;
using answers_test::quoted;

std::string scenario(const std::vector<Tr>& trs, const std::string& selected,
                     const std::string& extra) {
  std::string out = "{\"apiVersion\":1,\"selectedTrId\":";
  out += selected.empty() ? "null" : quoted(selected);
  out += ",\"trs\":{";
  for (std::size_t i = 0; i < trs.size(); ++i) {
    if (i) out += ',';
    out += quoted(trs[i].id) + ":{\"attrs\":{\"type\":" + quoted(trs[i].type) +
           ",\"gmClockId\":" + quoted(trs[i].gmClockId) +
           ",\"portState\":" + quoted(trs[i].portState) + "}}";
  }
  out += "}";
  if (!extra.empty()) out += "," + extra;
  return out + "}";
}

ServiceHost::ServiceHost(const std::string& scenarioText)
    : scenarioPath_(directory_.write("scenario.json", scenarioText)) {
  const std::string marker = directory_.write("share.dir", QUILLON_SHARE_DIR);
  host_ = std::make_unique<test::HostProcess>(
      std::vector<std::string>{"--plugin", test::kQuillonPluginPath, "--quiet"},
      test::Environment{{"KOPDM_SIM_SCENARIO", scenarioPath_}, {"KOSYSQ_SHARE_DIR_FILE", marker}});
}

void ServiceHost::writeScenario(const std::string& text) {
  const std::string next = directory_.write("next.json", text);
  if (std::rename(next.c_str(), scenarioPath_.c_str()) != 0) {
    throw std::runtime_error("cannot replace " + scenarioPath_);
  }
}

test::HttpResponse ServiceHost::get(const std::string& target, const test::HeaderList& headers) {
  return test::httpRequest(port(), "GET", target, headers);
}

test::HttpResponse ServiceHost::put(const std::string& target, const std::string& body,
                                    const test::HeaderList& headers) {
  return test::httpRequest(port(), "PUT", target, headers, body);
}

std::string shippedExplanation(int32_t code) {
  std::ifstream file(std::string(QUILLON_SHARE_DIR) + "/errors/English/quillon.txt", std::ios::binary);
  const std::string text((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
  const std::string start = "\n<koerror code=\"" + std::to_string(code) + "\">\n";
  const std::size_t begin = text.find(start);
  if (begin == std::string::npos) throw std::runtime_error("no shipped explanation of " + std::to_string(code));
  const std::size_t from = begin + start.size();
  const std::size_t end = text.find("\n</koerror>", from - 1);
  std::string explanation = text.substr(from, end + 1 - from);
  // The service drops the entry's trailing line ends.
  while (!explanation.empty() && (explanation.back() == '\n' || explanation.back() == '\r')) {
    explanation.pop_back();
  }
  return explanation;
}

}  // namespace e2e
