// SPDX-License-Identifier: Apache-2.0
// Disks that fail: full, broken, read-only; each is logged once when it begins and once when it is over.
#include <fcntl.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <atomic>
#include <cerrno>
#include <string_view>

#include "tests/recorder/RecorderFixture.h"
#include "tests/recorder/faults/ChildProcess.h"

namespace tarn::recorder {
namespace {

// SQLite lets its system calls be replaced: every write of the process goes through here.
std::atomic<int> writeError{0};          // what writes fail with; 0: they work
std::atomic<bool> logsStillWork{false};  // then only writes into databases fail, not those into logs and their indexes

bool isLog(int file) {
  char path[4096];
  const ssize_t size = ::readlink(("/proc/self/fd/" + std::to_string(file)).c_str(), path, sizeof path);
  if (size <= 0) return false;
  const std::string_view name(path, static_cast<std::size_t>(size));
  return name.ends_with("-wal") || name.ends_with("-shm");
}

bool shouldFail(int file) {
  if (writeError == 0 || (logsStillWork && isLog(file))) return false;
  errno = writeError;
  return true;
}

ssize_t writeAt(int file, const void* bytes, std::size_t size, off_t at) {
  return shouldFail(file) ? -1 : ::pwrite(file, bytes, size, at);
}

ssize_t writeHere(int file, const void* bytes, std::size_t size) {
  return shouldFail(file) ? -1 : ::write(file, bytes, size);
}

class RecorderFault : public RecorderFixture {
 protected:
  static void SetUpTestSuite() {
    sqlite3_initialize();
    sqlite3_vfs* const files = sqlite3_vfs_find("unix");
    for (const char* const name : {"pwrite", "pwrite64"}) {
      files->xSetSystemCall(files, name, reinterpret_cast<sqlite3_syscall_ptr>(writeAt));
    }
    files->xSetSystemCall(files, "write", reinterpret_cast<sqlite3_syscall_ptr>(writeHere));
  }
  static void TearDownTestSuite() {
    sqlite3_vfs* const files = sqlite3_vfs_find("unix");
    for (const char* const name : {"pwrite", "pwrite64", "write"}) {
      files->xSetSystemCall(files, name, nullptr);
    }
  }
  void TearDown() override {
    heal();
    stop();
  }
  static void fail(int error) { writeError = error; }
  static void heal() {
    writeError = 0;
    logsStillWork = false;
  }
  void expectLoggedOnceAndOver() {
    EXPECT_EQ(errors(), 1U);
    EXPECT_TRUE(eventually([&] { return log_.count("recorder writes to ") == 1; }));
    EXPECT_EQ(log_.entries(platform::LogLevel::Default).size(), 1U);
  }
};

TEST_F(RecorderFault, AFullDiskKeepsWhatWaitsAndWritesItLater) {
  start();
  recordMany(100);
  ASSERT_TRUE(flush());
  fail(ENOSPC);
  recordMany(100);
  ASSERT_TRUE(eventually([&] { return errors() == 1; }));
  EXPECT_FALSE(recorder_->flush(std::chrono::milliseconds(300)));
  EXPECT_EQ(recorder_->counters().waiting, 100U);
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "100");
  heal();
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "200|200");
  expectLoggedOnceAndOver();
}

TEST_F(RecorderFault, AnInputOutputErrorIsTheSame) {
  start();
  recordMany(100);
  ASSERT_TRUE(flush());
  fail(EIO);
  recordMany(100);
  ASSERT_TRUE(eventually([&] { return errors() == 1; }));
  EXPECT_FALSE(recorder_->flush(std::chrono::milliseconds(300)));
  heal();
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "200|200");
  expectLoggedOnceAndOver();
}

TEST_F(RecorderFault, ADiskThatFailsFromTheStartIsTheSame) {
  fail(ENOSPC);
  start();
  recordMany(10);
  ASSERT_TRUE(eventually([&] { return errors() == 1; }));
  EXPECT_FALSE(recorder_->flush(std::chrono::milliseconds(200)));
  heal();
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "10|10");
  expectLoggedOnceAndOver();
}

TEST_F(RecorderFault, ADiskThatFailsTwiceIsLoggedTwice) {
  start();
  for (int round = 0; round < 2; ++round) {
    log_.clear();
    fail(ENOSPC);
    recordMany(10);
    ASSERT_TRUE(eventually([&] { return errors() == 1; }));
    heal();
    ASSERT_TRUE(flush());
    expectLoggedOnceAndOver();
  }
}

TEST_F(RecorderFault, ACheckpointThatFailsKeepsCommitsAndIsLoggedOnce) {
  start();
  record("first");
  ASSERT_TRUE(flush());
  logsStillWork = true;
  fail(EIO);
  recordMany(20'000, 1000);
  ASSERT_TRUE(flush());
  EXPECT_EQ(recorder_->counters().committed, 20'001U);
  ASSERT_TRUE(eventually([&] { return errors() == 1; }));
  heal();
  record("last");
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT count(*), max(id) FROM events"), "20002|20002");
  expectLoggedOnceAndOver();
}

TEST_F(RecorderFault, WhatWaitsBehindAFullDiskFillsTheRecorder) {
  options_.highWaterEvents = 50;
  options_.lowWaterEvents = 25;
  start();
  fail(ENOSPC);
  recordMany(50);
  EXPECT_TRUE(recorder_->isFull());
  heal();
  ASSERT_TRUE(flush());
  EXPECT_TRUE(eventually([&] { return !recorder_->isFull(); }));
}

TEST_F(RecorderFault, AShutdownOnADeadDiskGivesUpAfterAFewTries) {
  start();
  recordMany(3);
  ASSERT_TRUE(flush());
  fail(ENOSPC);
  recordMany(7);
  recorder_->shutdown();
  const RecorderCounters counters = recorder_->counters();
  EXPECT_EQ(counters.committed, 3U);
  EXPECT_EQ(counters.failed, 7U);
  EXPECT_EQ(counters.waiting, 0U);
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "recorder gives up 7 events"));
  EXPECT_EQ(errors(), 2U);
  heal();
  EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "3");
}

TEST_F(RecorderFault, AFlushThatWaitsLearnsOfWhatWasGivenUp) {
  start();
  fail(ENOSPC);
  recordMany(5);
  std::atomic<bool> flushed{true};
  std::thread waiter([&] { flushed = flush(); });
  ASSERT_TRUE(eventually([&] { return errors() == 1; }));
  recorder_->shutdown();
  waiter.join();
  EXPECT_FALSE(flushed);
  EXPECT_EQ(recorder_->counters().failed, 5U);
}

TEST_F(RecorderFault, AnotherWriterIsWaitedFor) {
  start();
  record("first");
  ASSERT_TRUE(flush());
  sqlite3* other = nullptr;
  ASSERT_EQ(sqlite3_open(file().c_str(), &other), SQLITE_OK);
  sqlite3_busy_timeout(other, 5000);  // the recorder may still be tidying up after its commit
  ASSERT_EQ(sqlite3_exec(other, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
  record("second");
  ASSERT_TRUE(eventually([&] { return errors() == 1; }));
  ASSERT_EQ(sqlite3_exec(other, "ROLLBACK", nullptr, nullptr, nullptr), SQLITE_OK);
  sqlite3_close(other);
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT name FROM events ORDER BY id"), (std::vector<std::string>{"first", "second"}));
  expectLoggedOnceAndOver();
}

// The kernel's own limit on the size of files: real writes fail in the middle of a file.
TEST_F(RecorderFault, AFileThatMayNotGrowIsWrittenOnWhenItMay) {
  ChildProcess child([this] {
    ::signal(SIGXFSZ, SIG_IGN);
    rlimit limit{};
    ::getrlimit(RLIMIT_FSIZE, &limit);
    const rlim_t before = limit.rlim_cur;
    limit.rlim_cur = 512 * 1024;
    ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &limit), 0);
    start();
    recordMany(4000, 1000);
    ASSERT_TRUE(eventually([&] { return errors() >= 1; }));
    EXPECT_FALSE(recorder_->flush(std::chrono::milliseconds(200)));
    limit.rlim_cur = before;
    ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &limit), 0);
    ASSERT_TRUE(flush());
    stop();
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(askOne(file(), "SELECT count(*), min(id), max(id) FROM events"), "4000|1|4000");
  EXPECT_EQ(askOne(file(), "PRAGMA integrity_check"), "ok");
}

TEST_F(RecorderFault, AReadOnlyFileIsWrittenWhenItMayBeWritten) {
  ChildProcess child([this] {
    becomeOrdinaryUser(directory_.path());
    start();
    record("first");
    stop();
    ASSERT_EQ(::chmod(file().c_str(), 0444), 0);
    start();
    record("second");
    ASSERT_TRUE(eventually([&] { return errors() == 1; }));
    EXPECT_FALSE(recorder_->flush(std::chrono::milliseconds(200)));
    EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "read-only"));
    ASSERT_EQ(::chmod(file().c_str(), 0644), 0);
    ASSERT_TRUE(flush());
    EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "2");
    expectLoggedOnceAndOver();
    stop();
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST_F(RecorderFault, ADirectoryWithoutTheRightToWriteIsWaitedFor) {
  ChildProcess child([this] {
    becomeOrdinaryUser(directory_.path());
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0555), 0);
    start();
    record("first");
    ASSERT_TRUE(eventually([&] { return errors() == 1; }));
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0755), 0);
    ASSERT_TRUE(flush());
    EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "1");
    expectLoggedOnceAndOver();
    stop();
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST_F(RecorderFault, ADamagedFileThatCanNotBeSetAsideIsWaitedFor) {
  ChildProcess child([this] {
    becomeOrdinaryUser(directory_.path());
    std::ofstream(file()) << std::string(10'000, 'g');
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0555), 0);
    start();
    record("first");
    ASSERT_TRUE(eventually([&] { return errors() == 1; }));
    EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "can't be set aside"));
    ASSERT_EQ(::chmod(directory_.path().c_str(), 0755), 0);
    ASSERT_TRUE(flush());
    EXPECT_EQ(askOne(file(), "SELECT count(*) FROM events"), "1");
    EXPECT_EQ(filesSetAside().size(), 1U);
    stop();
  });
  EXPECT_EQ(child.wait(), 0);
}

}  // namespace
}  // namespace tarn::recorder
