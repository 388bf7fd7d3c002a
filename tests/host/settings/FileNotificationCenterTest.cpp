// SPDX-License-Identifier: Apache-2.0
#include "host/settings/FileNotificationCenter.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <thread>
#include <utility>
#include <vector>

#include "testing/ManualClock.h"
#include "testing/ManualWorkQueues.h"
#include "testing/RecordingLog.h"
#include "tests/host/Eventually.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

using platform::NotificationCenter;
using testing::eventually;

constexpr const char* kName = "sys.oxbow.ringer";

class FileNotifications : public ::testing::Test {
 protected:
  // Registers a handler that counts its calls.
  NotificationCenter::Registration listen(std::string_view name, int& calls) {
    return center_->registerFor(name, queue_, [&calls](std::int32_t) { ++calls; });
  }
  // One turn of the loop, with a short look at what it watches.
  void turn() {
    bool looked = false;
    loop_.waitUntil(clock_.monotonic() + std::chrono::milliseconds(1), [&] { return std::exchange(looked, true); });
    loop_.queue()->run(100);
  }
  bool eventuallyHandedOver() {
    return eventually([this] {
      turn();
      return queue_->waiting() > 0;
    });
  }
  bool eventuallyRun(const int& calls, int wanted) {
    return eventually([&] {
      turn();
      queues_.runUntilIdle();
      return calls >= wanted;
    });
  }
  std::string fault(std::string_view name) const {
    return NotificationFolder(folder_.path("notifications")).post(name, 1).text();
  }
  // Posts under another name and waits for it: whatever was posted before has then been handed over too.
  void settle() {
    int calls = 0;
    const NotificationCenter::Registration last = listen("settle", calls);
    ASSERT_TRUE(center_->post("settle", 1));
    ASSERT_TRUE(eventuallyRun(calls, 1));
    center_->cancel(last.token);
  }
  std::string file() const { return folder_.path("notifications/" + std::string(kName)); }

  TemporaryFolder folder_;
  testing::RecordingLog log_;
  testing::ManualClock clock_;
  testing::ManualWorkQueues queues_{clock_};
  std::shared_ptr<platform::WorkQueue> queue_ =
      queues_.makeSerialQueue("test", platform::QualityOfService::UserInteractive);
  MainLoop loop_{clock_};
  std::shared_ptr<FileNotificationCenter> center_ =
      std::make_shared<FileNotificationCenter>(folder_.path("notifications"), loop_, log_);
};

TEST_F(FileNotifications, PostOfThisProcessIsDeliveredOnTheQueueWithItsToken) {
  std::vector<std::int32_t> tokens;
  const NotificationCenter::Registration registration =
      center_->registerFor(kName, queue_, [&tokens](std::int32_t token) { tokens.push_back(token); });
  EXPECT_EQ(registration.status, NotificationCenter::kStatusOk);
  ASSERT_TRUE(center_->post(kName, 1));
  ASSERT_TRUE(eventuallyHandedOver());
  EXPECT_TRUE(tokens.empty());
  queues_.runUntilIdle();
  EXPECT_EQ(tokens, (std::vector<std::int32_t>{registration.token}));
}

TEST_F(FileNotifications, StateWordIsEightBytesLittleEndian) {
  int calls = 0;
  const std::int32_t token = listen(kName, calls).token;
  ASSERT_TRUE(center_->post(kName, 0x0102030405060708U));
  EXPECT_EQ(folder_.read("notifications/" + std::string(kName)), "\x08\x07\x06\x05\x04\x03\x02\x01");
  EXPECT_EQ(center_->state(token), 0x0102030405060708U);
}

TEST_F(FileNotifications, PostWithoutAStateKeepsTheWordAndIsDelivered) {
  int calls = 0;
  const std::int32_t token = listen(kName, calls).token;
  ASSERT_TRUE(center_->post(kName, 7));
  ASSERT_TRUE(eventuallyRun(calls, 1));
  settle();
  const int before = calls;
  ASSERT_TRUE(center_->post(kName, std::nullopt));
  EXPECT_TRUE(eventuallyRun(calls, before + 1));
  EXPECT_EQ(center_->state(token), 7U);
}

TEST_F(FileNotifications, PostWithoutAStateWritesZeroWhereNoWordWas) {
  int calls = 0;
  const std::int32_t token = listen(kName, calls).token;
  ASSERT_TRUE(center_->post(kName, std::nullopt));
  EXPECT_EQ(center_->state(token), 0U);
  EXPECT_TRUE(eventuallyRun(calls, 1));
  folder_.write("notifications/" + std::string(kName), "short");
  ASSERT_TRUE(center_->post(kName, std::nullopt));
  EXPECT_EQ(center_->state(token), 0U);
}

TEST_F(FileNotifications, WriteByAnotherIsOnePostEachTime) {
  int calls = 0;
  const std::int32_t token = listen(kName, calls).token;
  std::ofstream other(file(), std::ios::binary);
  for (int round = 1; round <= 3; ++round) {
    other.seekp(0);
    other << std::string("\1\0\0\0\0\0\0\0", 8) << std::flush;  // the same word again and again
    ASSERT_TRUE(eventuallyRun(calls, round));
  }
  EXPECT_EQ(center_->state(token), 1U);
  settle();
  EXPECT_EQ(calls, 3);
}

TEST_F(FileNotifications, FileThatTakesTheNameIsAPost) {
  int calls = 0;
  const std::int32_t token = listen(kName, calls).token;
  folder_.write("elsewhere", std::string("\5\0\0\0\0\0\0\0", 8));
  std::filesystem::rename(folder_.path("elsewhere"), file());
  EXPECT_TRUE(eventuallyRun(calls, 1));
  EXPECT_EQ(center_->state(token), 5U);
}

TEST_F(FileNotifications, MissingShortAndForeignFilesAreFailedReads) {
  int calls = 0;
  const std::int32_t token = listen(kName, calls).token;
  EXPECT_FALSE(center_->state(token));
  folder_.write("notifications/" + std::string(kName), "1234567");
  EXPECT_FALSE(center_->state(token));
  std::filesystem::remove(file());
  ASSERT_EQ(::mkfifo(file().c_str(), 0600), 0);
  EXPECT_FALSE(center_->state(token));
  EXPECT_FALSE(center_->state(token + 1));
}

TEST_F(FileNotifications, OtherNamesAreNotDelivered) {
  int calls = 0;
  listen(kName, calls);
  ASSERT_TRUE(center_->post("sys.oxbow.other", 1));
  settle();
  EXPECT_EQ(calls, 0);
}

TEST_F(FileNotifications, EveryRegistrationOfANameIsCalled) {
  int first = 0;
  int second = 0;
  EXPECT_NE(listen(kName, first).token, listen(kName, second).token);
  ASSERT_TRUE(center_->post(kName, 1));
  EXPECT_TRUE(eventuallyRun(first, 1));
  EXPECT_TRUE(eventuallyRun(second, 1));
}

TEST_F(FileNotifications, NoCallBeginsAfterCancelThoughADeliveryWaits) {
  int calls = 0;
  const std::int32_t token = listen(kName, calls).token;
  ASSERT_TRUE(center_->post(kName, 1));
  ASSERT_TRUE(eventuallyHandedOver());
  center_->cancel(token);
  queues_.runUntilIdle();
  EXPECT_EQ(calls, 0);
  EXPECT_FALSE(center_->state(token));
  center_->cancel(token);  // a second time is nothing
}

TEST_F(FileNotifications, FloodOfPostsCostsOnePieceOfWork) {
  int calls = 0;
  listen(kName, calls);
  for (int post = 0; post < 1000; ++post) {
    ASSERT_TRUE(center_->post(kName, 1));
  }
  ASSERT_TRUE(eventuallyHandedOver());
  EXPECT_EQ(queue_->waiting(), 1U);
}

TEST_F(FileNotifications, NamesThatAreNoPlainFileNamesAreRefused) {
  int calls = 0;
  for (const char* name : {"", ".hidden", "a/b", ".."}) {
    EXPECT_EQ(listen(name, calls).status, EINVAL);
    EXPECT_EQ(listen(name, calls).token, -1);
    EXPECT_EQ(fault(name), "\"" + std::string(name) + "\" can't name a notification");
    EXPECT_FALSE(center_->post(name, 1));
  }
  EXPECT_EQ(log_.messages().back(), "notification not posted: \"..\" can't name a notification");
}

TEST_F(FileNotifications, FolderThatCannotBeMadeFailsRegistrationAndPost) {
  folder_.write("notifications", "a file");
  int calls = 0;
  EXPECT_EQ(listen(kName, calls).status, ENOTDIR);
  EXPECT_EQ(fault(kName), folder_.path("notifications") + ": Not a directory");
  std::filesystem::remove(folder_.path("notifications"));
  EXPECT_EQ(listen(kName, calls).status, NotificationCenter::kStatusOk);
}

TEST_F(FileNotifications, RegistrationsAreBounded) {
  int calls = 0;
  for (std::size_t count = 0; count < FileNotificationCenter::kMaximumRegistrations; ++count) {
    ASSERT_EQ(listen(kName, calls).status, NotificationCenter::kStatusOk);
  }
  EXPECT_EQ(listen(kName, calls).status, ENOSPC);
}

TEST_F(FileNotifications, WordWhoseLockIsNeverFreedIsNotPosted) {
  std::filesystem::create_directory(folder_.path("notifications"));
  folder_.write("notifications/" + std::string(kName), std::string(8, '\0'));
  const UniqueDescriptor holder(::open(file().c_str(), O_RDONLY | O_CLOEXEC));
  ASSERT_EQ(::flock(holder.get(), LOCK_EX), 0);
  EXPECT_EQ(fault(kName), file() + ": Connection timed out");
}

TEST_F(FileNotifications, FolderThatVanishesIsMadeAnewAndEveryRegistrationIsCalled) {
  int calls = 0;
  listen(kName, calls);
  std::filesystem::remove_all(folder_.path("notifications"));
  ASSERT_TRUE(eventuallyRun(calls, 1));
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, folder_.path("notifications") + " went away; it is made anew"));
  settle();
  const int before = calls;
  ASSERT_TRUE(center_->post(kName, 1));
  EXPECT_TRUE(eventuallyRun(calls, before + 1));
}

TEST_F(FileNotifications, FolderThatIsMovedAwayIsMadeAnew) {
  int calls = 0;
  listen(kName, calls);
  std::filesystem::rename(folder_.path("notifications"), folder_.path("moved"));
  ASSERT_TRUE(eventuallyRun(calls, 1));
  settle();
  const int before = calls;
  ASSERT_TRUE(center_->post(kName, 1));
  EXPECT_TRUE(eventuallyRun(calls, before + 1));
}

TEST_F(FileNotifications, FolderThatCannotBeMadeAnewIsTriedAgainASecondLater) {
  int calls = 0;
  listen(kName, calls);
  std::filesystem::remove_all(folder_.path("notifications"));
  folder_.write("notifications", "in the way");
  ASSERT_TRUE(eventually([this] {
    turn();
    return log_.contains(platform::LogLevel::Error, folder_.path("notifications") + " went away; it is made anew");
  }));
  std::filesystem::remove(folder_.path("notifications"));
  clock_.advance(std::chrono::milliseconds(999));
  turn();
  EXPECT_FALSE(std::filesystem::exists(folder_.path("notifications")));
  clock_.advance(std::chrono::milliseconds(1));
  EXPECT_TRUE(eventuallyRun(calls, 1));
  EXPECT_TRUE(std::filesystem::is_directory(folder_.path("notifications")));
}

TEST_F(FileNotifications, LostCountOfChangesCallsEveryRegistration) {
  std::ifstream limitFile("/proc/sys/fs/inotify/max_queued_events");
  int limit = 0;
  ASSERT_TRUE(limitFile >> limit);
  int calls = 0;
  listen(kName, calls);
  // Nobody reads the changes yet. Two names in turn, because the kernel folds equal neighbours.
  std::ofstream one(folder_.path("notifications/one"));
  std::ofstream two(folder_.path("notifications/two"));
  for (int change = 0; change <= limit; change += 2) {
    one << 'x' << std::flush;
    two << 'x' << std::flush;
  }
  EXPECT_TRUE(eventuallyRun(calls, 1));
}

TEST_F(FileNotifications, PostersOnSeveralThreadsMeetNoRace) {
  int steady = 0;
  listen(kName, steady);
  std::vector<std::thread> threads;
  for (int poster = 0; poster < 3; ++poster) {
    threads.emplace_back([this] {
      for (std::uint64_t post = 0; post < 300; ++post) {
        EXPECT_TRUE(center_->post(kName, post));
      }
    });
  }
  for (int round = 0; round < 300; ++round) {
    const NotificationCenter::Registration registration = center_->registerFor(kName, queue_, [](std::int32_t) {});
    center_->state(registration.token);
    center_->cancel(registration.token);
  }
  EXPECT_TRUE(eventuallyRun(steady, 1));
  for (std::thread& thread : threads) {
    thread.join();
  }
  const int before = steady;
  ASSERT_TRUE(center_->post(kName, 1));
  EXPECT_TRUE(eventuallyRun(steady, before + 1));
}

}  // namespace
}  // namespace tarn::linux_host
