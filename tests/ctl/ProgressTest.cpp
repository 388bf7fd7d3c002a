// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/Progress.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <optional>
#include <string>

namespace tarn::ctl {
namespace {

// A pipe in place of a terminal.
class ProgressTest : public ::testing::Test {
 protected:
  ProgressTest() { EXPECT_EQ(::pipe2(ends_.data(), O_CLOEXEC), 0); }
  ~ProgressTest() override {
    ::close(ends_[0]);
    closeEnd();
  }

  ProgressPlace place(bool isTold, std::chrono::milliseconds after) const { return {isTold, ends_[1], after}; }
  // Waits for the text; everything that was written up to then.
  const std::string& waitFor(const std::string& text) {
    while (written_.find(text) == std::string::npos && readSome()) {
    }
    return written_;
  }
  // All that was written; nobody may write any more.
  const std::string& all() {
    closeEnd();
    while (readSome()) {
    }
    return written_;
  }

 private:
  bool readSome() {
    std::array<char, 256> bytes{};
    const ssize_t count = ::read(ends_[0], bytes.data(), bytes.size());
    if (count <= 0) return false;
    written_.append(bytes.data(), static_cast<std::size_t>(count));
    return true;
  }
  void closeEnd() {
    if (ends_[1] >= 0) {
      ::close(ends_[1]);
    }
    ends_[1] = -1;
  }

  std::array<int, 2> ends_{-1, -1};
  std::string written_;
};

TEST_F(ProgressTest, TellsOfLongWorkAndTakesItsLineAway) {
  std::optional<Progress> progress(std::in_place, place(true, std::chrono::milliseconds(0)), "reading");
  EXPECT_TRUE(waitFor(", 0 s").starts_with("\r\x1b[Kreading, 0 s"));
  progress->at(0.456);
  EXPECT_NE(waitFor("%").find("\r\x1b[Kreading, 46%, "), std::string::npos);
  progress->at(7);
  EXPECT_NE(waitFor("100%").find("\r\x1b[Kreading, 100%, "), std::string::npos);
  progress.reset();
  EXPECT_TRUE(all().ends_with(" s\r\x1b[K"));
}

TEST_F(ProgressTest, SaysNothingOfWorkThatIsSoonOver) {
  withProgress(place(true, std::chrono::hours(1)), "reading", [](const ProgressHandler& progress) {
    progress(0.5);
    return 0;
  });
  EXPECT_EQ(all(), "");
}

TEST_F(ProgressTest, SaysNothingWhereNobodyWantsIt) {
  std::optional<Progress> unwanted(std::in_place, place(false, std::chrono::milliseconds(0)), "unwanted");
  std::optional<Progress> wanted(std::in_place, place(true, std::chrono::milliseconds(0)), "wanted");
  waitFor("wanted");
  unwanted.reset();
  wanted.reset();
  EXPECT_EQ(all().find("unwanted"), std::string::npos);
}

TEST_F(ProgressTest, AnswersWhatTheWorkAnswers) {
  EXPECT_EQ(withProgress({}, "reading", [](const ProgressHandler&) { return 7; }), 7);
}

}  // namespace
}  // namespace tarn::ctl
