// SPDX-License-Identifier: Apache-2.0
// Where tarnreportingctl finds the service, and what it says when it doesn't.
#include "tools/ctl/ServiceConnection.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstring>

#include "host/system/UniqueDescriptor.h"
#include "tests/host/InChild.h"
#include "tests/host/TemporaryFolder.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {
namespace {

using namespace std::chrono_literals;
using linux_host::UniqueDescriptor;

class ServiceConnectionTest : public ::testing::Test {
 protected:
  // A socket that somebody listens on and never answers.
  UniqueDescriptor listenOn(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path.data(), path.size());
    UniqueDescriptor listener(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    EXPECT_EQ(::bind(listener.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    EXPECT_EQ(::listen(listener.get(), 8), 0);
    return listener;
  }

  linux_host::TemporaryFolder folder_;
  const std::string own_ = folder_.path("own");
  const std::string systems_ = folder_.path("systems");
};

TEST_F(ServiceConnectionTest, FirstSocketWithAListenerIsTaken) {
  const UniqueDescriptor systems = listenOn(systems_);
  EXPECT_EQ(reachService({{own_, systems_}}).socket, systems_);
  listenOn(own_);  // gone again: a stale file, which is as good as none
  EXPECT_EQ(reachService({{own_, systems_}}).socket, systems_);
  ASSERT_EQ(::unlink(own_.c_str()), 0);
  const UniqueDescriptor own = listenOn(own_);
  EXPECT_EQ(reachService({{own_, systems_}}).socket, own_);
}

TEST_F(ServiceConnectionTest, AbsentServiceIsToldWithEveryPlaceThatWasTried) {
  const Reached reached = reachService({{own_, systems_}});
  EXPECT_EQ(reached.client, nullptr);
  EXPECT_TRUE(reached.isAbsent);
  EXPECT_EQ(reached.complaint, "the service can't be reached: cannot connect to " + own_ +
                                   ": No such file or directory; cannot connect to " + systems_ +
                                   ": No such file or directory");
}

TEST_F(ServiceConnectionTest, ARefusalIsNoAbsence) {
  const UniqueDescriptor own = listenOn(own_);
  const UniqueDescriptor systems = listenOn(systems_);
  ASSERT_EQ(::chmod(own_.c_str(), 0), 0);
  ASSERT_EQ(::chmod(folder_.path().c_str(), 0755), 0);
  EXPECT_EQ(testing::inChild([this] {
              constexpr uid_t kNobody = 65534;
              if (::geteuid() == 0 && ::setuid(kNobody) != 0) return 1;  // root is never refused
              const Reached reached = reachService({{own_, systems_}});
              return reached.complaint ==
                             "the service can't be reached: " + own_ + " refuses this user: Permission denied"
                         ? 0
                         : 2;
            }),
            0);
}

TEST_F(ServiceConnectionTest, ARefusalIsToldWithWhatWasTriedBefore) {
  const UniqueDescriptor systems = listenOn(systems_);
  ASSERT_EQ(::chmod(systems_.c_str(), 0), 0);
  ASSERT_EQ(::chmod(folder_.path().c_str(), 0755), 0);
  EXPECT_EQ(testing::inChild([this] {
              constexpr uid_t kNobody = 65534;
              if (::geteuid() == 0 && ::setuid(kNobody) != 0) return 1;
              const Reached reached = reachService({{own_, systems_}});
              return reached.complaint == "the service can't be reached: cannot connect to " + own_ +
                                              ": No such file or directory; " + systems_ +
                                              " refuses this user: Permission denied" &&
                             !reached.isAbsent
                         ? 0
                         : 2;
            }),
            0);
}

TEST_F(ServiceConnectionTest, AServiceThatRefusesThisUserIsNotSettled) {
  const UniqueDescriptor own = listenOn(own_);
  ASSERT_EQ(::chmod(own_.c_str(), 0), 0);
  ASSERT_EQ(::chmod(folder_.path().c_str(), 0755), 0);
  EXPECT_EQ(testing::inChild([this] {
              constexpr uid_t kNobody = 65534;
              if (::geteuid() == 0 && ::setuid(kNobody) != 0) return 1;
              return settleService({{own_}}) == kUnreachable ? 0 : 2;
            }),
            0);
}

TEST_F(ServiceConnectionTest, ServiceThatDoesNotAnswerIsUnreachable) {
  const UniqueDescriptor own = listenOn(own_);
  ::testing::internal::CaptureStderr();
  EXPECT_EQ(askService({{own_}, 20ms}, client::status()).status, 69);
  EXPECT_EQ(::testing::internal::GetCapturedStderr(),
            "tarnreportingctl: the service at " + own_ + " does not answer within 0.02 s\n");
}

TEST_F(ServiceConnectionTest, WaitingEndsWhenItsTimeIsUp) {
  ::testing::internal::CaptureStderr();
  EXPECT_EQ(waitForService({{own_}}, 50ms), 69);
  EXPECT_EQ(::testing::internal::GetCapturedStderr(),
            "tarnreportingctl: the service can't be reached: cannot connect to " + own_ +
                ": No such file or directory (waited 0.05 s)\n");
  const UniqueDescriptor own = listenOn(own_);
  ::testing::internal::CaptureStderr();
  EXPECT_EQ(waitForService({{own_}}, 50ms), 69);
  EXPECT_EQ(::testing::internal::GetCapturedStderr(),
            "tarnreportingctl: the service at " + own_ + " does not answer within 0.05 s\n");
}

TEST_F(ServiceConnectionTest, AServiceThatIsNotThereIsSettled) {
  EXPECT_EQ(settleService({{own_}}), 0);
}

TEST(OutputTest, LinesMayWaitForOneAnother) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, O_NONBLOCK), 0);
  const UniqueDescriptor reading(ends[0]);
  const UniqueDescriptor writing(ends[1]);
  ASSERT_GE(::fcntl(writing.get(), F_SETPIPE_SZ, 1 << 17), 1 << 17);
  Output output(writing.get(), Output::Pace::Together);
  EXPECT_TRUE(output.line("one"));
  EXPECT_TRUE(output.paintedLine("two"));
  char text[256];
  EXPECT_EQ(::read(reading.get(), text, sizeof text), -1);
  EXPECT_TRUE(output.flush());
  EXPECT_EQ(std::string(text, static_cast<std::size_t>(::read(reading.get(), text, sizeof text))), "one\ntwo\n");
  for (std::size_t size = 0; size < std::size_t{64} << 10; size += 1001) {
    EXPECT_TRUE(output.line(std::string(1000, 'x')));
  }
  EXPECT_EQ(::read(reading.get(), text, sizeof text), 256);
}

TEST(OutputTest, WhatWaitsAtTheEndIsWritten) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, O_NONBLOCK), 0);
  const UniqueDescriptor reading(ends[0]);
  UniqueDescriptor writing(ends[1]);
  char text[256];
  {
    Output output(writing.get(), Output::Pace::Together);
    output.line("one");
    EXPECT_EQ(output.status(), kSuccess);
    EXPECT_EQ(::read(reading.get(), text, sizeof text), 4);
    output.line("two");
  }
  EXPECT_EQ(::read(reading.get(), text, sizeof text), 4);
  const UniqueDescriptor full(::open("/dev/full", O_WRONLY | O_CLOEXEC));
  Output refused(full.get(), Output::Pace::Together);
  EXPECT_TRUE(refused.line("three"));
  ::testing::internal::CaptureStderr();
  EXPECT_EQ(refused.status(), kFailure);
  EXPECT_NE(::testing::internal::GetCapturedStderr().find("No space left on device"), std::string::npos);
}

TEST(OutputTest, WhatATerminalWouldObeyIsWrittenOut) {
  int ends[2];
  ASSERT_EQ(::pipe2(ends, 0), 0);
  const UniqueDescriptor reading(ends[0]);
  const UniqueDescriptor writing(ends[1]);
  Output output(writing.get());
  EXPECT_TRUE(output.line("{\"a\":\"\u202e\x1b[2J\u0085\n\"}"));
  char text[256];
  const ssize_t size = ::read(reading.get(), text, sizeof text);
  EXPECT_EQ(std::string(text, static_cast<std::size_t>(size)), "{\"a\":\"\\u202e\\u001b[2J\\u0085\\u000a\"}\n");
  ::testing::internal::CaptureStderr();
  complain("\x1b[31mno\nline");
  EXPECT_EQ(::testing::internal::GetCapturedStderr(), "tarnreportingctl: \\u001b[31mno\\u000aline\n");
}

}  // namespace
}  // namespace tarn::ctl
