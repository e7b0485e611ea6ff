#include <gtest/gtest.h>

#include <stdexcept>
#include <string>

#include "error_record/error.h"
#include "error_record/exception.h"
#include "support/raised.h"

namespace {

using koerr::Status;
using quillon::test_support::Raised;
using quillon::test_support::raisedBy;

TEST(Exception, CopyMovesTheRecordAndWhatFollowsIt) {
  koerr::Exception empty;
  EXPECT_STREQ(empty.what(), "");
  EXPECT_STREQ(static_cast<const std::exception&>(empty).what(), "");

  Status status;
  status.code = -5;
  koerr::addInt(koerr::beginJson(status, 2), "a", 1, status);
  const char* buffer = status.json;
  koerr::Exception original(std::move(status));
  EXPECT_EQ(status.json, nullptr);
  EXPECT_EQ(original.status().json, buffer);

  koerr::Exception copy(original);
  EXPECT_EQ(copy.status().json, buffer) << "the buffer moves, it is not copied";
  EXPECT_EQ(original.status().json, nullptr);
  EXPECT_STREQ(original.what(), "");
  EXPECT_EQ(copy.code(), -5);
  EXPECT_STREQ(static_cast<const std::exception&>(copy).what(), R"({"a":1})");
  EXPECT_STREQ(static_cast<const koerr::ExceptionBase&>(copy).what(), R"({"a":1})");
}

TEST(StatusGuard, ThrowsItsErrorOnlyWhenNothingElseIsInFlight) {
  const Raised raised = raisedBy([] {
    koerr::StatusGuard guard;
    koerr::Report(guard, koerr::koapalerr_osFault, "x/y", 3);
  });
  EXPECT_EQ(raised.code, -52008);
  EXPECT_EQ(raised.record,
            R"({"error_constant":"koapalerr_osFault","file":"x/y","line":3,"component":"quillon"})");

  // A warning is no error: leaving scope is quiet.
  EXPECT_NO_THROW({
    koerr::StatusGuard guard;
    koerr::setCode(guard, 7);
  });

  // While another exception unwinds, the guard stays silent and frees its text.
  try {
    koerr::StatusGuard guard;
    koerr::Report(guard, koerr::kInternalSoftwareError, "a", 1).add("k", "v");
    throw std::runtime_error("first");
  } catch (const std::runtime_error& first) {
    EXPECT_STREQ(first.what(), "first");
  }
}

// Error's chain (add, addUInt, addRaw, raise) is pinned by the resource
// manager's and the service's records; Report's is here.
TEST(ErrorHelpers, ReportWritesTheStandardMembersInOrder) {
  Status status;
  koerr::Report(status, koerr::koapalerr_invalidParameter, "kodynlib/dynload", 64)
      .open("kodynlib_debug").add("debug", "d").close()
      .open("internal_error").add("api", "dlerror").close();
  EXPECT_STREQ(status.json,
               R"({"error_constant":"koapalerr_invalidParameter","file":"kodynlib/dynload",)"
               R"("line":64,"component":"quillon","kodynlib_debug":{"debug":"d"},)"
               R"("internal_error":{"api":"dlerror"}})");

  // A record that already holds an error takes nothing more.
  koerr::Report refused(status, koerr::kCommandNotFound, "z", 1);
  refused.add("ignored", "x");
  EXPECT_FALSE(refused.taken());
  EXPECT_EQ(status.code, -52005);

  Status located;
  koerr::Report(located, -3).location("ko/file", 9);
  EXPECT_STREQ(located.json, R"({"file":"ko/file","line":9,"component":"quillon"})");

  Status caught;
  caught.code = -1074100991;
  Status nesting;
  koerr::Report(nesting, koerr::koapalerr_resourceNotFound, "f", 1)
      .open("kosyncdomain_debug").add("message", "m").nest(caught).close().close()
      .add("after", "root");
  EXPECT_STREQ(nesting.json,
               R"({"error_constant":"koapalerr_resourceNotFound","file":"f","line":1,)"
               R"("component":"quillon","kosyncdomain_debug":{"message":"m"},)"
               R"("nested_error":[{"code":-1074100991}],"after":"root"})");
  for (Status* s : {&status, &located, &caught, &nesting}) koerr::releaseText(*s);
}

}  // namespace
