// SPDX-License-Identifier: Apache-2.0
// Where log lines go: descriptors, files, the journal.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <csignal>
#include <cstring>
#include <filesystem>

#include "host/log/FileOutput.h"
#include "host/log/JournalOutput.h"
#include "host/log/LogClient.h"
#include "host/log/LogTarget.h"
#include "host/system/UniqueDescriptor.h"
#include "platform/LogCondition.h"
#include "tests/host/log/LogFixture.h"

namespace tarn::linux_host {
namespace {

using namespace std::string_literals;
using platform::LogLevel;

class FileOutputTest : public LogFixture {
 protected:
  FileOutput output_{folder_.path("log")};
};

TEST_F(FileOutputTest, IsAppendedTo) {
  folder_.write("log", "before\n");
  ASSERT_TRUE(output_.open().ok());
  EXPECT_EQ(output_.write(output_.formed(5, entry("one"))), 0);
  EXPECT_EQ(folder_.read("log"), "before\n" + line("one"));
}

TEST_F(FileOutputTest, ThatWasRenamedIsBegunAnew) {
  ASSERT_TRUE(output_.open().ok());
  EXPECT_EQ(output_.write("one\n"), 0);
  std::filesystem::rename(folder_.path("log"), folder_.path("log.1"));
  EXPECT_EQ(output_.write("two\n"), 0);
  EXPECT_EQ(folder_.read("log.1"), "one\n");
  EXPECT_EQ(folder_.read("log"), "two\n");
}

TEST_F(FileOutputTest, ThatWasRemovedIsBegunAnew) {
  ASSERT_TRUE(output_.open().ok());
  EXPECT_EQ(output_.write("one\n"), 0);
  std::filesystem::remove(folder_.path("log"));
  EXPECT_EQ(output_.write("two\n"), 0);
  EXPECT_EQ(folder_.read("log"), "two\n");
}

TEST_F(FileOutputTest, ThatWasRenamedAndCannotBeBegunAnewTakesTheLines) {
  std::filesystem::create_directory(folder_.path("logs"));
  FileOutput output(folder_.path("logs/log"));
  ASSERT_TRUE(output.open().ok());
  std::filesystem::rename(folder_.path("logs"), folder_.path("old"));
  EXPECT_EQ(output.write("one\n"), 0);
  EXPECT_EQ(output.write("two\n"), 0);
  EXPECT_EQ(folder_.read("old/log"), "one\ntwo\n");
}

TEST_F(FileOutputTest, OnAFullDiskSaysSo) {
  std::filesystem::create_symlink("/dev/full", folder_.path("log"));
  ASSERT_TRUE(output_.open().ok());
  EXPECT_EQ(output_.write("one\n"), ENOSPC);
}

TEST_F(FileOutputTest, LineThatWasCutOffIsCarriedOnWhereItStopped) {
  ASSERT_TRUE(output_.open().ok());
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  const rlimit small{3, before.rlim_max};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &small), 0);
  EXPECT_EQ(output_.write("one line\n"), EFBIG);
  ::setrlimit(RLIMIT_FSIZE, &before);
  std::signal(SIGXFSZ, handler);
  EXPECT_EQ(folder_.read("log"), "one");
  EXPECT_EQ(output_.write("one line\n"), 0);
  EXPECT_EQ(output_.write("two\n"), 0);
  EXPECT_EQ(folder_.read("log"), "one line\ntwo\n");
}

TEST_F(FileOutputTest, PipeThatNobodyReadsIsRefusedAtOnce) {
  ASSERT_EQ(::mkfifo(folder_.path("log").c_str(), 0600), 0);
  const auto error = output_.open();
  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, ENXIO);
}

TEST(StreamOutputTest, FullPipeIsToldAndItsLineIsCarriedOn) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, 0), 0);  // the writing end blocks, as a standard error stream does
  const UniqueDescriptor reading(ends[0]);
  const UniqueDescriptor writing(ends[1]);
  StreamOutput output(writing.get());
  const std::string text(100'000, 'x');
  EXPECT_EQ(output.write(text), EAGAIN);
  std::string seen(text.size(), '\0');
  const ssize_t first = ::read(reading.get(), seen.data(), seen.size());
  ASSERT_GT(first, 0);
  EXPECT_EQ(output.write(text), 0);
  const ssize_t second = ::read(reading.get(), seen.data(), seen.size());
  EXPECT_EQ(static_cast<std::size_t>(first + second), text.size());
}

TEST(StreamOutputTest, ClosedPipeSaysSo) {
  std::signal(SIGPIPE, SIG_IGN);
  int ends[2];
  ASSERT_EQ(::pipe2(ends, 0), 0);
  const UniqueDescriptor writing(ends[1]);
  UniqueDescriptor(ends[0]).reset();
  EXPECT_EQ(StreamOutput(writing.get()).write("one\n"), EPIPE);
}

// A journal that can be left unread.
class JournalOutputTest : public LogFixture {
 protected:
  void SetUp() override { listen(); }
  void listen() {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path_.data(), path_.size());
    journal_ = UniqueDescriptor(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    ASSERT_EQ(::bind(journal_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  }
  std::string received() const {
    std::string text(100'000, '\0');
    const ssize_t size = ::recv(journal_.get(), text.data(), text.size(), 0);
    return size < 0 ? "nothing" : text.substr(0, static_cast<std::size_t>(size));
  }

  const std::string path_ = folder_.path("journal");
  UniqueDescriptor journal_;
  JournalOutput output_{path_};
};

TEST_F(JournalOutputTest, EntryBecomesFields) {
  ASSERT_TRUE(output_.open().ok());
  EXPECT_EQ(output_.write(output_.formed(
                5, {kTestCategory, LogLevel::Error, "Session", 42, "                  Session:42    one"})),
            0);
  EXPECT_EQ(received(),
            "MESSAGE=                  Session:42    one\nPRIORITY=3\nTARN_CATEGORY=tarnss\n"
            "TARN_SUBSYSTEM=sys.oxbow.tarnkit\nCODE_FILE=Session\nCODE_LINE=42\nSYSLOG_IDENTIFIER=tarnreportingd\n");
}

TEST_F(JournalOutputTest, EntryOfAConditionHasItsIdentifier) {
  const platform::LogConditionScope scope(platform::LogCondition::StoreSetAside);
  EXPECT_TRUE(output_.formed(5, entry("text")).ends_with("\nMESSAGE_ID=f1ba60a9267a4415a8d4d183ae0e2eb1\n"));
  {
    const platform::LogConditionScope none(platform::LogCondition::None);
    EXPECT_EQ(output_.formed(5, entry("text")).find("MESSAGE_ID"), std::string::npos);
  }
  EXPECT_NE(output_.formed(5, entry("text")).find("MESSAGE_ID"), std::string::npos);
}

TEST_F(JournalOutputTest, EntryOnBehalfOfAClientNamesItAndTheSession) {
  const JournalOutput output(path_, [] { return 12; });
  const LogClientScope scope({.connection = 3, .process = 812, .user = 1000});
  EXPECT_TRUE(output.formed(5, entry("text")).ends_with("\nTARN_PID=812\nTARN_UID=1000\nTARN_SESSION=12\n"));
  EXPECT_TRUE(output_.formed(5, entry("text")).ends_with("\nTARN_PID=812\nTARN_UID=1000\n"));
}

TEST_F(JournalOutputTest, SeveralLinesAreOneFieldWithItsLength) {
  EXPECT_TRUE(output_.formed(5, entry("one\ntwo")).starts_with("MESSAGE\n\x07\0\0\0\0\0\0\0one\ntwo\nPRIORITY=5\n"s));
}

TEST_F(JournalOutputTest, NoFieldCanBeForged) {
  const std::string fields = output_.formed(5, entry("one\r\x1b[2J\nPRIORITY=0"));
  EXPECT_TRUE(fields.starts_with("MESSAGE\n\x1d\0\0\0\0\0\0\0one\\u000d\\u001b[2J\nPRIORITY=0\nPRIORITY=5\n"s))
      << fields;
}

TEST_F(JournalOutputTest, EntryWithoutAModuleHasNoPlace) {
  EXPECT_EQ(output_.formed(5, entry("text")).find("CODE_"), std::string::npos);
}

TEST_F(JournalOutputTest, LevelsBecomePriorities) {
  const std::pair<LogLevel, const char*> rows[] = {
      {LogLevel::Debug, "7"}, {LogLevel::Info, "6"}, {LogLevel::Default, "5"}, {LogLevel::Error, "3"}};
  for (const auto& [level, priority] : rows) {
    EXPECT_NE(output_.formed(5, {kTestCategory, level, {}, 0, "text"}).find("\nPRIORITY="s + priority + "\n"),
              std::string::npos);
  }
}

TEST_F(JournalOutputTest, ThatNobodyReadsTakesNoMoreAndDoesNotWait) {
  ASSERT_TRUE(output_.open().ok());
  int error = 0;
  for (int count = 0; count < 100'000 && error == 0; ++count) {
    error = output_.write("MESSAGE=text\n");
  }
  EXPECT_EQ(error, EAGAIN);
  EXPECT_EQ(received(), "MESSAGE=text\n");
  EXPECT_EQ(output_.write("MESSAGE=again\n"), 0);
}

TEST_F(JournalOutputTest, ThatWasStartedAnewIsFoundAgain) {
  ASSERT_TRUE(output_.open().ok());
  journal_.reset();
  EXPECT_EQ(output_.write("MESSAGE=one\n"), ECONNREFUSED);
  std::filesystem::remove(path_);
  EXPECT_EQ(output_.write("MESSAGE=one\n"), ENOENT);
  listen();
  EXPECT_EQ(output_.write("MESSAGE=one\n"), 0);
  EXPECT_EQ(received(), "MESSAGE=one\n");
}

TEST_F(JournalOutputTest, AbsentOneIsToldWithItsPath) {
  JournalOutput absent(folder_.path("none"));
  const auto error = absent.open();
  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->text, folder_.path("none") + ": No such file or directory");
}

class LogTargetTest : public LogFixture {};

TEST_F(LogTargetTest, FileThatCannotBeOpenedNamesThePathAndTheReason) {
  const auto opened = openLog(folder_.path("missing/log"), LogLevel::Default, clock_);
  EXPECT_EQ(opened.value, nullptr);
  ASSERT_TRUE(opened.failed());
  EXPECT_EQ(opened.error->text, "cannot open log file " + folder_.path("missing/log") + ": No such file or directory");
}

TEST_F(LogTargetTest, FileTakesTheLines) {
  const auto opened = openLog(folder_.path("log"), LogLevel::Info, clock_);
  ASSERT_NE(opened.value, nullptr);
  EXPECT_EQ(opened.value->threshold(), LogLevel::Info);
  opened.value->write(entry("one"));
  EXPECT_TRUE(opened.value->settle(std::chrono::seconds(20)));
  EXPECT_EQ(folder_.read("log"), line("one"));
}

TEST_F(LogTargetTest, WithoutAJournalTheErrorStreamTakesItsPlaceAndSaysSo) {
  const UniqueDescriptor file(::open(folder_.path("stderr").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  const UniqueDescriptor before(::dup(STDERR_FILENO));
  ASSERT_EQ(::dup2(file.get(), STDERR_FILENO), STDERR_FILENO);
  const auto opened = openLog("journal", LogLevel::Error, clock_, folder_.path("none"));
  const bool written = opened.value && opened.value->settle(std::chrono::seconds(20));
  ::dup2(before.get(), STDERR_FILENO);
  EXPECT_TRUE(written);
  EXPECT_NE(folder_.read("stderr").find("no journal on this machine, the log goes to the standard error stream: " +
                                        folder_.path("none") + ": No such file or directory\n"),
            std::string::npos)
      << folder_.read("stderr");
}

}  // namespace
}  // namespace tarn::linux_host
