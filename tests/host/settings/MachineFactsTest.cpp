// SPDX-License-Identifier: Apache-2.0
#include "host/settings/MachineFacts.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <string>

#include "plist/formats/Json.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

class MachineFactsTest : public ::testing::Test {
 protected:
  std::string facts() const {
    std::string text;
    plist::appendJson(text, readMachineFacts(folder_.path()));
    return text;
  }

  TemporaryFolder folder_;
};

TEST_F(MachineFactsTest, AMachineWithAllOfThemTellsThemInTheirOrder) {
  folder_.write("etc/os-release", "ID=debian\nVERSION_ID=\"12\"\nPRETTY_NAME=\"Debian GNU/Linux 12\"\n");
  folder_.write("sys/class/dmi/id/sys_vendor", "ACME\n");
  folder_.write("sys/class/dmi/id/product_name", " Player 3 \n");
  folder_.write("sys/class/dmi/id/chassis_type", "10\n");
  EXPECT_EQ(facts(), R"({"os":"Debian GNU/Linux 12","os_id":"debian","os_version":"12","vendor":"ACME",)"
                     R"("model":"Player 3","chassis":"laptop"})");
}

TEST_F(MachineFactsTest, AMachineWithoutFilesTellsNothing) {
  EXPECT_EQ(facts(), "{}");
}

TEST_F(MachineFactsTest, TheVendorsReleaseFileCountsWhereThereIsNoOther) {
  folder_.write("usr/lib/os-release", "ID=vendor\n");
  EXPECT_EQ(facts(), R"({"os_id":"vendor"})");
  folder_.write("etc/os-release", "ID=ours\n");
  EXPECT_EQ(facts(), R"({"os_id":"ours"})");
}

TEST_F(MachineFactsTest, QuotationIsTakenOffAsTheShellDoes) {
  folder_.write("etc/os-release", "PRETTY_NAME=\"A \\\"B\\\" \\$C\"\nID='it\\s'\nVERSION_ID=\"open\n");
  EXPECT_EQ(facts(), R"({"os":"A \"B\" $C","os_id":"it\\s","os_version":"open"})");
}

TEST_F(MachineFactsTest, CommentsOtherNamesAndLinesWithoutValueArePassedOver) {
  folder_.write("etc/os-release", "# ID=no\nID\nIDX=no\n\nID_LIKE=no\n  ID=first\nID=last");
  EXPECT_EQ(facts(), R"({"os_id":"last"})");
}

TEST_F(MachineFactsTest, TheDeviceTreesModelCountsWhereThereIsNoFirmwareTable) {
  folder_.write("proc/device-tree/model", std::string("Board 4 Rev 1.1\0", 16));
  EXPECT_EQ(facts(), R"({"model":"Board 4 Rev 1.1"})");
  folder_.write("sys/class/dmi/id/product_name", "Table\n");
  EXPECT_EQ(facts(), R"({"model":"Table"})");
}

TEST_F(MachineFactsTest, WhatTheAdministratorSaysOfTheChassisGoesFirst) {
  folder_.write("sys/class/dmi/id/chassis_type", "3\n");
  EXPECT_EQ(facts(), R"({"chassis":"desktop"})");
  folder_.write("etc/machine-info", "PRETTY_HOSTNAME=\"Kitchen\"\nCHASSIS=embedded\n");
  EXPECT_EQ(facts(), R"({"chassis":"embedded"})");
}

TEST_F(MachineFactsTest, AKindOfChassisThatTellsNothingIsNone) {
  for (const char* const kind : {"1", "2", "0", "99", "x", ""}) {
    folder_.write("sys/class/dmi/id/chassis_type", kind);
    EXPECT_EQ(facts(), "{}") << kind;
  }
  folder_.write("sys/class/dmi/id/chassis_type", "131");  // 3 with a lock
  EXPECT_EQ(facts(), R"({"chassis":"desktop"})");
}

TEST_F(MachineFactsTest, AHugeFileIsLeftOut) {
  folder_.write("etc/os-release", "ID=huge\n" + std::string(std::size_t{64} << 10U, '#'));
  folder_.write("sys/class/dmi/id/sys_vendor", std::string(257, 'v'));
  folder_.write("sys/class/dmi/id/product_name", std::string(256, 'm'));
  EXPECT_EQ(facts(), R"({"model":")" + std::string(256, 'm') + "\"}");
}

TEST_F(MachineFactsTest, TextThatIsNotUtf8IsLeftOut) {
  folder_.write("etc/os-release", "ID=\xFF\nVERSION_ID=12\n");
  folder_.write("sys/class/dmi/id/sys_vendor", "\xC3");
  EXPECT_EQ(facts(), R"({"os_version":"12"})");
}

TEST_F(MachineFactsTest, NobodyIsWaitedForWhereAFifoOrAFolderLies) {
  std::filesystem::create_directories(folder_.path() + "/etc/machine-info");
  ASSERT_EQ(::mkfifo((folder_.path() + "/etc/os-release").c_str(), 0600), 0);
  EXPECT_EQ(facts(), "{}");
}

}  // namespace
}  // namespace tarn::linux_host
