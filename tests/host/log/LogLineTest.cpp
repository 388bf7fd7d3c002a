// SPDX-License-Identifier: Apache-2.0
#include "host/log/LogLine.h"

#include <gtest/gtest.h>

#include "platform/LogPrefix.h"

namespace tarn::linux_host {
namespace {

using platform::LogLevel;

constexpr platform::LogCategory kCategory{"sys.oxbow.tarnkit", "tarnss"};

TEST(LogLine, TimeIsUtcWithMicroseconds) {
  EXPECT_EQ(logTime(1795168800.123456), "2026-11-20T10:00:00.123456Z");
  EXPECT_EQ(logTime(0), "1970-01-01T00:00:00.000000Z");
}

TEST(LogLine, TimeRoundsIntoTheNextSecond) {
  EXPECT_EQ(logTime(0.9999999), "1970-01-01T00:00:01.000000Z");
}

TEST(LogLine, TimeBeforeTheEpochCountsBackwards) {
  EXPECT_EQ(logTime(-0.25), "1969-12-31T23:59:59.750000Z");
}

TEST(LogPrefix, ModuleIsFlushRightAndItsLineFlushLeft) {
  const auto prefix = [](std::string_view module, int line) {
    std::string text;
    platform::appendLogPrefix(text, module, line);
    return text;
  };
  EXPECT_EQ(prefix("Recorder", 7), "                 Recorder:7     ");
  EXPECT_EQ(prefix("ANameOfTwentyFiveLetters_", 12345), "ANameOfTwentyFiveLetters_:12345 ");
  EXPECT_EQ(prefix("ANameOfTwentySixLetters___", 123456), "ANameOfTwentySixLetters___:123456 ");
}

TEST(LogLine, HoldsTimeLevelCategoryAndText) {
  EXPECT_EQ(logLine(0, {kCategory, LogLevel::Error, "Module", 7, "                   Module:7     text"}),
            "1970-01-01T00:00:00.000000Z error tarnss                    Module:7     text\n");
}

TEST(LogLine, FurtherLinesFollowEachAfterATab) {
  EXPECT_EQ(
      logLine(0, {kCategory, LogLevel::Info, {}, 0, "one\n  two\n1970-01-01T00:00:00.000000Z error tarnss forged"}),
      "1970-01-01T00:00:00.000000Z info tarnss one\n\t  two\n\t1970-01-01T00:00:00.000000Z error tarnss forged\n");
}

TEST(LogLine, WhatATerminalWouldObeyIsWrittenOut) {
  EXPECT_EQ(logLine(0, {kCategory, LogLevel::Debug, {}, 0, "a\tb\r\x1b[2J\x7f \u0085\u009b\u202e\u2066"}),
            "1970-01-01T00:00:00.000000Z debug tarnss a\\u0009b\\u000d\\u001b[2J\\u007f "
            "\\u0085\\u009b\\u202e\\u2066\n");
}

TEST(LogLine, LevelsHaveNamesBothWays) {
  for (const LogLevel level : {LogLevel::Debug, LogLevel::Info, LogLevel::Default, LogLevel::Error}) {
    EXPECT_EQ(logLevelFromName(logLevelName(level)), level);
  }
  EXPECT_EQ(logLevelName(LogLevel::Default), "default");
  EXPECT_FALSE(logLevelFromName("warning"));
  EXPECT_FALSE(logLevelFromName(""));
}

}  // namespace
}  // namespace tarn::linux_host
