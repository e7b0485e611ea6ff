#include "syncable_device/call_guard.h"

#include <gtest/gtest.h>

#include <stdexcept>

#include "error_record/error.h"

namespace {

using kosdlib::wrapper::CallGuard;

// What a library does to the record it is handed.
void fill(koerr::Status* status, int32_t code) {
  koerr::Report(*status, code, "libError", "lib/file", 9).open("lib_debug").add("k", "v").close();
}

TEST(CallGuard, WarningsVanishErrorsCarryTheLibraryRecord) {
  {
    CallGuard guard;
    fill(guard.record(), 7);
    ASSERT_NE(guard.record()->json, nullptr);
    guard.check();
    EXPECT_EQ(guard.record()->code, 0);
    EXPECT_EQ(guard.record()->json, nullptr);
  }
  CallGuard guard;
  fill(guard.record(), -52005);
  try {
    guard.check();
    FAIL() << "no throw";
  } catch (const koerr::Exception& e) {
    EXPECT_EQ(e.code(), -52005);
    EXPECT_STREQ(e.what(),
                 "{\"error_constant\":\"libError\",\"file\":\"lib/file\",\"line\":9,"
                 "\"component\":\"quillon\",\"lib_debug\":{\"k\":\"v\"}}");
  }
}

// A failing call made by a destructor during unwinding must not terminate.
struct CallsWhileUnwinding {
  ~CallsWhileUnwinding() {
    CallGuard guard;
    fill(guard.record(), -1);
    guard.check();
    silenced = guard.record()->code == 0 && guard.record()->json == nullptr;
  }
  bool& silenced;
};

TEST(CallGuard, ErrorsAreSilencedWhileAnotherExceptionUnwinds) {
  bool silenced = false;
  try {
    CallsWhileUnwinding c{silenced};
    throw std::runtime_error("first");
  } catch (const std::runtime_error& e) {
    EXPECT_STREQ(e.what(), "first");
  }
  EXPECT_TRUE(silenced);
}

}  // namespace
