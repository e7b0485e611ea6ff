// Each test here is one first use of the process-wide binding, against the
// libraries that its CTest entry puts on KO_DSC_LIBRARY_PATH; CTest runs each
// in its own process (GTEST_FILTER picks it).
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <string>
#include <thread>
#include <vector>

#include "transfer_binding/curl.h"

namespace ko::chronos::shared {
namespace {

constexpr size_t kGapIndex = 17;  // kocurl_easy_getinfo, the 18th entry

bool transferLibraryLoaded() {
  void* handle = dlopen("libcurlimpl.so.13", RTLD_NOW | RTLD_NOLOAD);
  if (handle != nullptr) {
    dlclose(handle);
  }
  return handle != nullptr;
}

int initCalls() {
  void* handle = dlopen("libkosslinit.so.13", RTLD_NOW | RTLD_NOLOAD);
  if (handle == nullptr) {
    return -1;
  }
  auto* calls = reinterpret_cast<int (*)()>(dlsym(handle, "kosslinit_test_init_calls"));
  const int answer = calls != nullptr ? calls() : -1;
  dlclose(handle);
  return answer;
}

bool startsWith(const std::string& text, const std::string& prefix) {
  return text.compare(0, prefix.size(), prefix) == 0;
}

TEST(Binding, FullTableBindsTheRealTransferFunctions) {
  tCURL curl;
  EXPECT_EQ(curl.functions(), nullptr);
  ASSERT_TRUE(curl.load()) << curl.lastFailure();
  const CurlFunctions* table = curl.functions();
  ASSERT_NE(table, nullptr);
  for (size_t i = 0; i < CurlFunctions::kSize; ++i) {
    EXPECT_NE(table->entry(i), nullptr) << CurlFunctions::kSymbols[i];
  }
  EXPECT_EQ(curl.lastFailure(), "");
  EXPECT_TRUE(curl.load());
  EXPECT_EQ(tCURL().functions(), table) << "the table is process-wide";

  // The plain names are the system library's own functions, not copies.
  void* system = dlopen("libcurl.so.4", RTLD_NOW | RTLD_NOLOAD);
  ASSERT_NE(system, nullptr);
  EXPECT_EQ(reinterpret_cast<void*>(table->easy_perform), dlsym(system, "curl_easy_perform"));
  EXPECT_EQ(reinterpret_cast<void*>(table->share_strerror), dlsym(system, "curl_share_strerror"));
  dlclose(system);
  // Calls through the table are the example client's (RealTransfer).
}

TEST(Binding, NameMissingInTheMiddleLeavesThePrefixBoundAndTheTablePublished) {
  tCURL curl;
  EXPECT_FALSE(curl.load());
  const CurlFunctions* table = curl.functions();
  ASSERT_NE(table, nullptr);
  for (size_t i = 0; i < CurlFunctions::kSize; ++i) {
    EXPECT_EQ(table->entry(i) != nullptr, i < kGapIndex) << i << " " << CurlFunctions::kSymbols[i];
  }
  EXPECT_TRUE(startsWith(curl.lastFailure(), "dlsym(kocurl_easy_getinfo) in ")) << curl.lastFailure();
  // Deliberately no second attempt: the published table stays as it is.
  EXPECT_FALSE(curl.load());
  EXPECT_EQ(curl.functions(), table);
  EXPECT_EQ(table->entry(kGapIndex), nullptr);
}

TEST(Binding, WithoutTheTlsLibraryThereIsNoTable) {
  tCURL curl;
  EXPECT_FALSE(curl.load());
  EXPECT_EQ(curl.functions(), nullptr);
  EXPECT_TRUE(startsWith(curl.lastFailure(), "dlopen(libkosslinit.so.13): ")) << curl.lastFailure();
  EXPECT_FALSE(transferLibraryLoaded());
}

TEST(Binding, RefusedTlsInitialisationNeverOpensTheTransferLibrary) {
  tCURL curl;
  EXPECT_FALSE(curl.load());
  EXPECT_EQ(curl.functions(), nullptr);
  EXPECT_EQ(curl.lastFailure(), "KOSSLINIT_Init answered 0: TLS initialisation failed");
  EXPECT_FALSE(transferLibraryLoaded());
}

TEST(Binding, BothTlsEntryPointsAreRequiredBeforeInitialising) {
  tCURL curl;
  EXPECT_FALSE(curl.load());
  EXPECT_EQ(curl.functions(), nullptr);
  EXPECT_TRUE(startsWith(curl.lastFailure(), "dlsym(KOSSLINIT_Uninit) in ")) << curl.lastFailure();
  EXPECT_EQ(initCalls(), 0);
  EXPECT_FALSE(transferLibraryLoaded());
}

TEST(Binding, ConcurrentFirstUseLoadsOnce) {
  constexpr int kThreads = 8;
  std::atomic<int> ready{0};
  std::vector<char> loaded(kThreads, 0);
  std::vector<const CurlFunctions*> tables(kThreads, nullptr);
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&, i] {
      ready.fetch_add(1);
      while (ready.load() < kThreads) {
        std::this_thread::yield();
      }
      tCURL curl;
      loaded[i] = curl.load();
      tables[i] = curl.functions();
    });
  }
  for (auto& t : threads) {
    t.join();
  }
  for (int i = 0; i < kThreads; ++i) {
    EXPECT_TRUE(loaded[i]) << i;
    EXPECT_EQ(tables[i], tables[0]) << i;
  }
  EXPECT_NE(tables[0], nullptr);
  EXPECT_EQ(initCalls(), 1);
}

}  // namespace
}  // namespace ko::chronos::shared
