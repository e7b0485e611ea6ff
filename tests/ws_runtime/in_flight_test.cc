// The host's count of requests in progress, which a stop waits on.
#include <chrono>
#include <future>
#include <thread>

#include <gtest/gtest.h>

#include "in_flight.h"

namespace {

using std::chrono::hours;
using std::chrono::milliseconds;

TEST(InFlight, CountsRequestsOnEveryThreadAndWakesTheWaiterAtTheLastLeave) {
  ws::host::InFlight inFlight;
  EXPECT_TRUE(inFlight.waitForNone(milliseconds(0)));

  // Two requests on two threads, each leaving only when told to.
  std::promise<void> leaveFirst, leaveSecond;
  std::promise<void> firstIn, secondIn;
  auto request = [&inFlight](std::promise<void>& in, std::future<void> leave) {
    inFlight.enter();
    in.set_value();
    leave.wait();
    inFlight.leave();
  };
  std::thread first(request, std::ref(firstIn), leaveFirst.get_future());
  std::thread second(request, std::ref(secondIn), leaveSecond.get_future());
  firstIn.get_future().wait();
  secondIn.get_future().wait();
  EXPECT_FALSE(inFlight.waitForNone(milliseconds(0)));

  leaveFirst.set_value();
  first.join();
  EXPECT_FALSE(inFlight.waitForNone(milliseconds(0)));

  // A waiter with all the time in the world returns once the last request
  // leaves: a lost wake-up would hang here until the test's time limit.
  auto waiter = std::async(std::launch::async, [&] { return inFlight.waitForNone(hours(1)); });
  leaveSecond.set_value();
  EXPECT_TRUE(waiter.get());
  second.join();
}

}  // namespace
