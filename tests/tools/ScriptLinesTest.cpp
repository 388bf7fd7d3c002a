// SPDX-License-Identifier: Apache-2.0
#include "tools/script/ScriptLines.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <string>
#include <thread>
#include <vector>

namespace tarn::script {
namespace {

// A pipe that is fed by hand.
class Pipe {
 public:
  Pipe() { EXPECT_EQ(::pipe2(ends_.data(), O_CLOEXEC), 0); }
  ~Pipe() {
    ::close(ends_[0]);
    end();
  }
  Pipe(const Pipe&) = delete;
  Pipe& operator=(const Pipe&) = delete;

  int fd() const { return ends_[0]; }
  void feed(std::string_view text) {
    while (!text.empty()) {
      const auto count = ::write(ends_[1], text.data(), text.size());
      if (count <= 0) return;
      text.remove_prefix(static_cast<std::size_t>(count));
    }
  }
  void end() {
    if (ends_[1] >= 0) {
      ::close(ends_[1]);
      ends_[1] = -1;
    }
  }

 private:
  std::array<int, 2> ends_{-1, -1};
};

std::vector<std::string> allLines(ScriptLines& lines) {
  std::vector<std::string> all;
  std::string_view line;
  while (true) {
    const auto next = lines.next(line);
    if (next == ScriptLines::Next::Line) {
      all.emplace_back(line);
    } else if (next != ScriptLines::Next::Incomplete || lines.fill().failed()) {
      return all;
    }
  }
}

TEST(ScriptLines, YieldsLinesWithTheirNumbers) {
  Pipe pipe;
  pipe.feed("one\n\nthree\n");
  pipe.end();
  ScriptLines lines(pipe.fd());
  EXPECT_EQ(allLines(lines), (std::vector<std::string>{"one", "", "three"}));
  EXPECT_EQ(lines.lineNumber(), 3U);
}

TEST(ScriptLines, TakesALastLineWithoutLineEnd) {
  Pipe pipe;
  pipe.feed("one\ntwo");
  pipe.end();
  ScriptLines lines(pipe.fd());
  EXPECT_EQ(allLines(lines), (std::vector<std::string>{"one", "two"}));
}

TEST(ScriptLines, YieldsALineBeforeTheNextOneComes) {
  Pipe pipe;
  pipe.feed("one\ntw");
  ScriptLines lines(pipe.fd());
  std::string_view line;
  EXPECT_EQ(lines.next(line), ScriptLines::Next::Incomplete);
  ASSERT_TRUE(lines.fill().ok());
  EXPECT_EQ(lines.next(line), ScriptLines::Next::Line);
  EXPECT_EQ(line, "one");
  EXPECT_EQ(lines.next(line), ScriptLines::Next::Incomplete);
}

TEST(ScriptLines, RefusesALineThatIsTooLongBeforeItHasAllCome) {
  Pipe pipe;
  std::thread feeder([&pipe] { pipe.feed("short\n" + std::string(ScriptLines::kMaxLineBytes + 1, 'x')); });
  ScriptLines lines(pipe.fd());
  std::string_view line;
  ScriptLines::Next next = ScriptLines::Next::Incomplete;
  while (next == ScriptLines::Next::Incomplete || next == ScriptLines::Next::Line) {
    next = lines.next(line);
    if (next == ScriptLines::Next::Incomplete && lines.fill().failed()) break;
  }
  feeder.join();
  EXPECT_EQ(next, ScriptLines::Next::TooLong);
  EXPECT_EQ(lines.lineNumber(), 2U);
}

TEST(ScriptLines, SaysWhyItCannotRead) {
  const int folder = ::open("/", O_RDONLY | O_CLOEXEC);
  ScriptLines lines(folder);
  EXPECT_EQ(lines.fill().text(), "Is a directory");
  ::close(folder);
}

}  // namespace
}  // namespace tarn::script
