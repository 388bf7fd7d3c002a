#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>
#include <map>
#include <regex>
#include <thread>
#include <vector>

#include "host/log/FileLog.h"
#include "host/log/JournalLog.h"
#include "host/log/LogTarget.h"
#include "host/system/UniqueDescriptor.h"
#include "testing/ManualClock.h"
#include "tests/host/Eventually.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

using platform::LogLevel;
using testing::eventually;

constexpr platform::LogCategory kCategory{"sys.oxbow.tarnkit", "tarnss"};
constexpr const char* kTime = "1970-01-01T00:00:05.000000Z";

platform::LogEntry entry(std::string_view text) {
  return {kCategory, LogLevel::Default, {}, 0, text};
}
std::string line(std::string_view text) {
  return std::string(kTime) + " default tarnss " + std::string(text) + "\n";
}
// The text with the line numbers of the sink's own lines left out.
std::string withoutLineNumbers(const std::string& text) {
  return std::regex_replace(text, std::regex("LineLog:\\d+ +"), "LineLog: ");
}
std::string lostLine(std::string_view text) {
  return std::string(kTime) + " error tarnrs " + std::string(18, ' ') + "LineLog: " + std::string(text) + "\n";
}

class LogSinks : public ::testing::Test {
 protected:
  LogSinks() { clock_.setEpochSeconds(5); }

  TemporaryFolder folder_;
  testing::ManualClock clock_;
};

TEST_F(LogSinks, ThresholdIsTheOneAskedFor) {
  EXPECT_EQ(StreamLog(2, clock_, LogLevel::Error).threshold(), LogLevel::Error);
  EXPECT_EQ(JournalLog(LogLevel::Debug).threshold(), LogLevel::Debug);
}

TEST_F(LogSinks, StreamWritesALineAnEntry) {
  int ends[2];
  ASSERT_EQ(::pipe(ends), 0);
  const UniqueDescriptor reading(ends[0]);
  UniqueDescriptor writing(ends[1]);
  StreamLog log(writing.get(), clock_, LogLevel::Default);
  log.write(entry("one"));
  log.write(entry("two\nthree"));
  char buffer[512];
  const ssize_t length = ::read(reading.get(), buffer, sizeof buffer);
  ASSERT_GT(length, 0);
  EXPECT_EQ(std::string(buffer, static_cast<std::size_t>(length)), line("one") + line("two\nthree"));
}

TEST_F(LogSinks, StreamThatIsFullOfBytesSlowsItsWriterDownAndLosesNothing) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, O_NONBLOCK), 0);
  const UniqueDescriptor reading(ends[0]);
  UniqueDescriptor writing(ends[1]);
  StreamLog log(writing.get(), clock_, LogLevel::Default);
  const std::string text(1000, 'x');
  std::thread writer([&] {
    for (int count = 0; count < 300; ++count) {
      log.write(entry(text));
    }
  });
  const std::size_t wanted = 300 * line(text).size();
  std::size_t got = 0;
  EXPECT_TRUE(eventually([&] {
    char buffer[4096];
    const ssize_t length = ::read(reading.get(), buffer, sizeof buffer);
    got += length > 0 ? static_cast<std::size_t>(length) : 0;
    return got == wanted;
  }));
  writer.join();
}

TEST_F(LogSinks, StreamThatNobodyReadsHoldsItsWriterUpOnlyOnceAndTellsWhatItLost) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, 0), 0);  // the writing end blocks, as a standard error stream does
  const UniqueDescriptor reading(ends[0]);
  const UniqueDescriptor writing(ends[1]);
  StreamLog log(writing.get(), clock_, LogLevel::Default);
  const std::string text(10'000, 'x');
  const auto begin = std::chrono::steady_clock::now();
  for (int count = 0; count < 100; ++count) {
    log.write(entry(text));
  }
  EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(10));

  std::string seen;
  std::vector<char> buffer(std::size_t{1} << 20);
  seen.append(buffer.data(), static_cast<std::size_t>(::read(reading.get(), buffer.data(), buffer.size())));
  log.write(entry("again"));
  seen.append(buffer.data(), static_cast<std::size_t>(::read(reading.get(), buffer.data(), buffer.size())));
  std::smatch lost;
  ASSERT_TRUE(std::regex_search(seen, lost, std::regex("(\\d+) log lines were lost")));
  EXPECT_GT(std::stoi(lost[1].str()), 90);
  EXPECT_TRUE(seen.ends_with("\n" + line("again")));
}

TEST_F(LogSinks, EntriesOfSeveralThreadsStayWhole) {
  FileLog log(folder_.path("log"), clock_, LogLevel::Default);
  ASSERT_TRUE(log.open().ok());
  std::vector<std::thread> threads;
  for (char name = 'a'; name < 'e'; ++name) {
    threads.emplace_back([&log, name] {
      const std::string text(5000, name);
      for (int count = 0; count < 100; ++count) {
        log.write(entry(text));
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  std::istringstream lines(folder_.read("log"));
  std::map<std::string, int> counts;
  for (std::string read; std::getline(lines, read);) {
    ++counts[read + "\n"];
  }
  EXPECT_EQ(counts.size(), 4U);
  for (char name = 'a'; name < 'e'; ++name) {
    EXPECT_EQ(counts[line(std::string(5000, name))], 100) << name;
  }
}

TEST_F(LogSinks, FileIsAppendedTo) {
  folder_.write("log", "before\n");
  FileLog log(folder_.path("log"), clock_, LogLevel::Default);
  ASSERT_TRUE(log.open().ok());
  log.write(entry("one"));
  EXPECT_EQ(folder_.read("log"), "before\n" + line("one"));
}

TEST_F(LogSinks, FileThatWasRenamedIsBegunAnew) {
  FileLog log(folder_.path("log"), clock_, LogLevel::Default);
  ASSERT_TRUE(log.open().ok());
  log.write(entry("one"));
  std::filesystem::rename(folder_.path("log"), folder_.path("log.1"));
  log.write(entry("two"));
  EXPECT_EQ(folder_.read("log.1"), line("one"));
  EXPECT_EQ(folder_.read("log"), line("two"));
}

TEST_F(LogSinks, FileThatWasRemovedIsBegunAnew) {
  FileLog log(folder_.path("log"), clock_, LogLevel::Default);
  ASSERT_TRUE(log.open().ok());
  log.write(entry("one"));
  std::filesystem::remove(folder_.path("log"));
  log.write(entry("two"));
  EXPECT_EQ(folder_.read("log"), line("two"));
}

TEST_F(LogSinks, FileThatWasRenamedAndCannotBeBegunAnewTakesTheLines) {
  std::filesystem::create_directory(folder_.path("logs"));
  FileLog log(folder_.path("logs/log"), clock_, LogLevel::Default);
  ASSERT_TRUE(log.open().ok());
  std::filesystem::rename(folder_.path("logs"), folder_.path("old"));
  log.write(entry("one"));
  log.write(entry("two"));
  EXPECT_EQ(folder_.read("old/log"), line("one") + line("two"));
}

TEST_F(LogSinks, FullDiskCountsLostLinesAndSaysSoWhenItRecovers) {
  std::filesystem::create_symlink("/dev/full", folder_.path("log"));
  FileLog log(folder_.path("log"), clock_, LogLevel::Default);
  ASSERT_TRUE(log.open().ok());
  log.write(entry("one"));
  log.write(entry("two"));
  std::filesystem::remove(folder_.path("log"));
  log.write(entry("three"));
  log.write(entry("four"));  // what was told is not told again
  EXPECT_EQ(withoutLineNumbers(folder_.read("log")),
            lostLine("2 log lines were lost: No space left on device") + line("three") + line("four"));
}

TEST_F(LogSinks, LineThatWasCutOffIsLostAndTheNextOneBeginsALine) {
  FileLog log(folder_.path("log"), clock_, LogLevel::Default);
  ASSERT_TRUE(log.open().ok());
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  const rlimit small{10, before.rlim_max};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &small), 0);
  log.write(entry("one"));
  ::setrlimit(RLIMIT_FSIZE, &before);
  std::signal(SIGXFSZ, handler);
  log.write(entry("two"));
  EXPECT_EQ(withoutLineNumbers(folder_.read("log")),
            "1970-01-01\n" + lostLine("1 log lines were lost: File too large") + line("two"));
}

TEST_F(LogSinks, ClosedStreamCountsLostLinesAndSaysSoWhenItRecovers) {
  const UniqueDescriptor closed(::open("/dev/null", O_RDONLY | O_CLOEXEC));  // writing is refused as on a closed one
  StreamLog log(closed.get(), clock_, LogLevel::Default);
  log.write(entry("one"));
  const UniqueDescriptor file(::open(folder_.path("log").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  ASSERT_EQ(::dup2(file.get(), closed.get()), closed.get());
  log.write(entry("two"));
  EXPECT_EQ(withoutLineNumbers(folder_.read("log")),
            lostLine("1 log lines were lost: Bad file descriptor") + line("two"));
}

TEST_F(LogSinks, TargetThatCannotBeOpenedNamesThePathAndTheReason) {
  const OpenedLog opened = openLog(folder_.path("missing/log"), LogLevel::Default, clock_);
  EXPECT_EQ(opened.log, nullptr);
  EXPECT_EQ(opened.error, "cannot open log file " + folder_.path("missing/log") + ": No such file or directory");
}

TEST_F(LogSinks, TargetsAreStderrAndFiles) {
  EXPECT_NE(dynamic_cast<StreamLog*>(openLog("stderr", LogLevel::Info, clock_).log.get()), nullptr);
  const OpenedLog file = openLog(folder_.path("log"), LogLevel::Info, clock_);
  ASSERT_NE(file.log, nullptr);
  file.log->write(entry("one"));
  EXPECT_EQ(folder_.read("log"), line("one"));
}

TEST_F(LogSinks, JournalTargetIsTakenOnlyWhereThereIsAJournal) {
  const OpenedLog opened = openLog("journal", LogLevel::Info, clock_);
  struct stat facts {};
  if (::stat("/run/systemd/journal/socket", &facts) == 0) {
    EXPECT_NE(dynamic_cast<JournalLog*>(opened.log.get()), nullptr);
  } else {
    EXPECT_EQ(opened.log, nullptr);
    EXPECT_EQ(opened.error, "no journal on this machine: /run/systemd/journal/socket: No such file or directory");
  }
}

// The journal's stand-in keeps what it is sent and refuses while it is told to.
std::vector<std::vector<std::string>> sent;
int refusal = 0;

int keep(const struct iovec* fields, int count) {
  if (refusal != 0) return -refusal;
  std::vector<std::string>& texts = sent.emplace_back();
  for (int index = 0; index < count; ++index) {
    texts.emplace_back(static_cast<const char*>(fields[index].iov_base), fields[index].iov_len);
  }
  return 0;
}

class Journal : public ::testing::Test {
 protected:
  Journal() : log_(LogLevel::Debug, &keep) {
    sent.clear();
    refusal = 0;
  }
  JournalLog log_;
};

TEST_F(Journal, EntryBecomesFields) {
  log_.write({kCategory, LogLevel::Error, "Session", 42, "                  Session:42    one\ntwo"});
  ASSERT_EQ(sent.size(), 1U);
  EXPECT_EQ(sent[0],
            (std::vector<std::string>{"MESSAGE=                  Session:42    one\ntwo", "PRIORITY=3",
                                      "TARN_CATEGORY=tarnss", "TARN_SUBSYSTEM=sys.oxbow.tarnkit", "CODE_FILE=Session",
                                      "CODE_LINE=42", "SYSLOG_IDENTIFIER=tarnreportingd"}));
}

TEST_F(Journal, EntryWithoutAModuleHasNoPlace) {
  log_.write({kCategory, LogLevel::Info, {}, 42, "text"});
  ASSERT_EQ(sent.size(), 1U);
  EXPECT_EQ(sent[0].size(), 5U);
}

TEST_F(Journal, LevelsBecomePriorities) {
  for (const LogLevel level : {LogLevel::Debug, LogLevel::Info, LogLevel::Default, LogLevel::Error}) {
    log_.write({kCategory, level, {}, 0, "text"});
  }
  ASSERT_EQ(sent.size(), 4U);
  EXPECT_EQ(sent[0][1], "PRIORITY=7");
  EXPECT_EQ(sent[1][1], "PRIORITY=6");
  EXPECT_EQ(sent[2][1], "PRIORITY=5");
  EXPECT_EQ(sent[3][1], "PRIORITY=3");
}

TEST_F(Journal, RefusedEntriesAreCountedAndToldWhenItRecovers) {
  refusal = ENOBUFS;
  log_.write({kCategory, LogLevel::Info, {}, 0, "one"});
  log_.write({kCategory, LogLevel::Info, {}, 0, "two"});
  refusal = 0;
  log_.write({kCategory, LogLevel::Info, {}, 0, "three"});
  log_.write({kCategory, LogLevel::Info, {}, 0, "four"});  // what was told is not told again
  ASSERT_EQ(sent.size(), 3U);
  EXPECT_TRUE(sent[0][0].starts_with("MESSAGE=" + std::string(15, ' ') + "JournalLog:"));
  EXPECT_TRUE(sent[0][0].ends_with(" 2 log entries were lost: No buffer space available"));
  EXPECT_EQ(sent[0][4], "CODE_FILE=JournalLog");
  EXPECT_EQ(sent[0][1], "PRIORITY=3");
  EXPECT_EQ(sent[1][0], "MESSAGE=three");
  EXPECT_EQ(sent[2][0], "MESSAGE=four");
}

}  // namespace
}  // namespace tarn::linux_host
