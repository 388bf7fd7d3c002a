// SPDX-License-Identifier: Apache-2.0
#include "wire/Operation.h"

#include <gtest/gtest.h>

namespace tarn::wire {
namespace {

constexpr std::string_view kNames[] = {"createReportingSession",
                                       "setServiceType",
                                       "getServiceNameForReporterID",
                                       "setConfiguration",
                                       "startReportingSessionForID",
                                       "sendMessage",
                                       "stopReportingSessionForID",
                                       "destroyReportingSession",
                                       "reporterID",
                                       "getAllReporters",
                                       "killService"};

TEST(Operation, NumbersAndNamesStandInTheOrderOfTheRemoteInterface) {
  for (std::uint64_t number = 1; number <= std::size(kNames); ++number) {
    const std::optional<Operation> operation = operationFromNumber(number);
    ASSERT_TRUE(operation.has_value()) << number;
    EXPECT_EQ(operationName(*operation), kNames[number - 1]);
    EXPECT_EQ(operationFromName(kNames[number - 1]), operation);
  }
}

TEST(Operation, StatusIsNumber100) {
  EXPECT_EQ(operationFromNumber(100), Operation::Status);
  EXPECT_EQ(operationName(Operation::Status), "status");
  EXPECT_EQ(operationFromName("status"), Operation::Status);
}

TEST(Operation, SettleIsNumber101AndTheHostsOwn) {
  EXPECT_EQ(operationFromNumber(101), Operation::Settle);
  EXPECT_EQ(operationFromName("settle"), Operation::Settle);
  EXPECT_EQ(rowOf(Operation::Settle).servedBy, ServedBy::Host);
  EXPECT_EQ(rowOf(Operation::Settle).arguments.size(), 0U);
}

TEST(Operation, TheRingsOperationsAreNumbers102And103) {
  EXPECT_EQ(operationFromNumber(102), Operation::OpenRing);
  EXPECT_EQ(operationFromNumber(103), Operation::DeclareShape);
  EXPECT_EQ(operationFromName("openRing"), Operation::OpenRing);
  EXPECT_EQ(operationFromName("declareShape"), Operation::DeclareShape);
}

TEST(Operation, NumbersBesideTheListAreNoOperation) {
  for (const std::uint64_t number : {0ULL, 12ULL, 99ULL, 104ULL, 256ULL + 1, 0xFFFFFFFFFFFFFFFFULL}) {
    EXPECT_FALSE(operationFromNumber(number).has_value()) << number;
  }
}

TEST(Operation, NamesOfOtherCaseAreNoOperation) {
  EXPECT_FALSE(operationFromName("SendMessage").has_value());
  EXPECT_FALSE(operationFromName("").has_value());
}

TEST(Operation, ErrorDomainAndCodesAreFixed) {
  EXPECT_EQ(kErrorDomain, "sys.oxbow.audio.reporting.ipc");
  EXPECT_EQ(static_cast<int>(ErrorCode::UnknownOperation), 1);
  EXPECT_EQ(static_cast<int>(ErrorCode::BadArguments), 2);
  EXPECT_EQ(static_cast<int>(ErrorCode::NotPropertyList), 3);
  EXPECT_EQ(static_cast<int>(ErrorCode::OverQuota), 4);
  EXPECT_EQ(static_cast<int>(ErrorCode::OutOfMemory), 5);
  EXPECT_EQ(static_cast<int>(ErrorCode::AdminOnly), 6);
}

}  // namespace
}  // namespace tarn::wire
