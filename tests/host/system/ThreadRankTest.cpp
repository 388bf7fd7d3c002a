// SPDX-License-Identifier: Apache-2.0
#include "host/system/ThreadRank.h"

#include <gtest/gtest.h>
#include <sched.h>
#include <sys/resource.h>

#include <thread>

namespace tarn::linux_host {
namespace {

int niceness() {
  return ::getpriority(PRIO_PROCESS, 0);
}

int rank() {
  sched_param rank{};
  EXPECT_EQ(::sched_getparam(0, &rank), 0);
  return rank.sched_priority;
}

bool comeAhead(int rank) {
  const sched_param wanted{.sched_priority = rank};
  return ::sched_setscheduler(0, SCHED_RR, &wanted) == 0;
}

TEST(ThreadRank, WhoStandsBackIsBehindWhoMadeItAndNobodyElseIs) {
  const int before = niceness();
  int after = before;
  std::thread([&] {
    standBack();
    after = niceness();
  }).join();
  EXPECT_GT(after, before);
  EXPECT_EQ(niceness(), before);
}

// Only root may come ahead; the others' threads have no rank.
TEST(ThreadRank, AmongThreadsThatComeFirstItIsARankAndTheLowestStays) {
  std::thread([] {
    const int lowest = comeAhead(2) ? 1 : 0;
    standBack();
    EXPECT_EQ(rank(), lowest);
    standBack();
    EXPECT_EQ(rank(), lowest);
  }).join();
}

}  // namespace
}  // namespace tarn::linux_host
