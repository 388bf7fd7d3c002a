// SPDX-License-Identifier: Apache-2.0
#include "host/system/StartWithoutMemory.h"

#include <gtest/gtest.h>

#include <csignal>
#include <cstdlib>
#include <exception>
#include <new>
#include <stdexcept>

namespace tarn::linux_host {
namespace {

constexpr const char* kLine = "^tarnreportingd: out of memory\n$";

[[noreturn]] void end(void (*act)()) noexcept {
  act();
  std::abort();
}

// Each in a process of its own, as it is before over() was called.
TEST(StartWithoutMemoryDeathTest, MissingMemoryThatNobodyCatchesEndsWithALine) {
  EXPECT_EXIT(end([] { throw std::bad_alloc(); }), ::testing::ExitedWithCode(EXIT_FAILURE), kLine);
}

TEST(StartWithoutMemoryDeathTest, NoMemoryForAnExceptionEndsWithTheSameLine) {
  EXPECT_EXIT(std::terminate(), ::testing::ExitedWithCode(EXIT_FAILURE), kLine);
}

TEST(StartWithoutMemoryDeathTest, OtherExceptionsEndAsEver) {
  EXPECT_EXIT(end([] { throw std::logic_error("another reason"); }), ::testing::KilledBySignal(SIGABRT),
              "another reason");
}

TEST(StartWithoutMemoryDeathTest, ServingItIsAsEver) {
  const auto act = [] {
    StartWithoutMemory::over();
    std::terminate();
  };
  EXPECT_EXIT(act(), ::testing::KilledBySignal(SIGABRT), "");
}

TEST(StartWithoutMemory, WhatIsMissingIsToldInAFewWords) {
  EXPECT_EQ(StartWithoutMemory::textOf(std::bad_alloc()), "out of memory");
  EXPECT_EQ(StartWithoutMemory::textOf(std::runtime_error("no more threads")), "no more threads");
}

}  // namespace
}  // namespace tarn::linux_host
