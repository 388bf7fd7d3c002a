// SPDX-License-Identifier: Apache-2.0
#include "fleet/cursor/ArrivedFile.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <iterator>

#include "tests/recorder/RecorderFixture.h"

namespace tarn::fleet {
namespace {

class FleetArrived : public ::testing::Test {
 protected:
  std::string path() const { return (directory_.path() / "arrived").string(); }
  std::string content() const {
    std::ifstream file(path(), std::ios::binary);
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  }

  recorder::TemporaryDirectory directory_;
};

TEST_F(FleetArrived, IsTheIdAndNothingElse) {
  ArrivedFile file(path());
  ASSERT_TRUE(file.write(0).ok());
  EXPECT_EQ(content(), "0\n");
  ASSERT_TRUE(file.write(9'223'372'036'854'775'807).ok());
  EXPECT_EQ(content(), "9223372036854775807\n");
  ASSERT_TRUE(file.write(12).ok());
  EXPECT_EQ(content(), "12\n");
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(directory_.path()), {}), 1);
}

TEST_F(FleetArrived, AnybodyMayReadItWhateverTheMaskIs) {
  const mode_t before = ::umask(0077);
  ArrivedFile file(path());
  EXPECT_TRUE(file.write(1).ok());
  ::umask(before);
  struct stat facts {};
  ASSERT_EQ(::stat(path().c_str(), &facts), 0);
  EXPECT_EQ(facts.st_mode & 07777U, 0644U);
}

TEST_F(FleetArrived, TheSameIdIsNotWrittenAgain) {
  ArrivedFile file(path());
  ASSERT_TRUE(file.write(5).ok());
  std::filesystem::remove(path());
  ASSERT_TRUE(file.write(5).ok());
  EXPECT_FALSE(std::filesystem::exists(path()));
  ASSERT_TRUE(file.write(6).ok());
  EXPECT_EQ(content(), "6\n");
}

TEST_F(FleetArrived, AFolderThatIsNotThereIsAnErrorAndTheNextTryMayDo) {
  const std::string folder = (directory_.path() / "none").string();
  ArrivedFile file(folder + "/arrived");
  const Status written = file.write(3);
  ASSERT_TRUE(written.failed());
  EXPECT_EQ(written->text, folder + "/arrived: No such file or directory");
  std::filesystem::create_directory(folder);
  EXPECT_TRUE(file.write(3).ok());
  EXPECT_TRUE(std::filesystem::exists(folder + "/arrived"));
}

TEST_F(FleetArrived, WhatStandsInTheWayIsNotFollowed) {
  std::ofstream(directory_.path() / "other") << "untouched";
  std::filesystem::create_symlink(directory_.path() / "other", path() + ".new");
  ArrivedFile file(path());
  EXPECT_TRUE(file.write(3).failed());
  std::ifstream other(directory_.path() / "other");
  EXPECT_EQ(std::string(std::istreambuf_iterator<char>(other), {}), "untouched");
}

}  // namespace
}  // namespace tarn::fleet
