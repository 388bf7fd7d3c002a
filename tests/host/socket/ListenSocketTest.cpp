// SPDX-License-Identifier: Apache-2.0
#include "host/socket/ListenSocket.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <thread>
#include <vector>

#include "tests/host/InChild.h"
#include "tests/host/ScratchFolder.h"
#include "tests/host/socket/BoundSocket.h"

namespace tarn::linux_host {
namespace {

using testing::bindTo;

sockaddr_un addressOf(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::memcpy(address.sun_path, path.data(), path.size());
  return address;
}

UniqueDescriptor boundSocket(const std::string& path, int type = SOCK_STREAM) {
  UniqueDescriptor socket(::socket(AF_UNIX, type | SOCK_CLOEXEC, 0));
  const auto address = addressOf(path);
  EXPECT_EQ(::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  return socket;
}

bool canConnect(const std::string& path) {
  const UniqueDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const auto address = addressOf(path);
  return ::connect(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
}

mode_t modeOf(const std::string& path) {
  struct stat file {};
  EXPECT_EQ(::lstat(path.c_str(), &file), 0);
  return file.st_mode & 07777;
}

class ListenSocketTest : public ::testing::Test {
 protected:
  testing::ScratchFolder folder_;
  const std::string path_ = folder_.file("socket");
};

TEST_F(ListenSocketTest, ListensAtAFreshPath) {
  const auto result = bindTo(path_);
  EXPECT_EQ(result.error.text(), "");
  EXPECT_TRUE(canConnect(path_));
  EXPECT_EQ(result.value.name(), path_);
}

TEST_F(ListenSocketTest, ClaimedPathHasNothingToConnectToBeforeItListens) {
  auto claimed = ListenSocket::claim(path_);
  EXPECT_EQ(claimed.error.text(), "");
  EXPECT_TRUE(claimed.value);
  EXPECT_FALSE(std::filesystem::exists(path_));
  EXPECT_EQ(ListenSocket::claim(path_).error.text(), "another service is listening on " + path_);
  EXPECT_EQ(claimed.value.listen().text(), "");
  EXPECT_TRUE(canConnect(path_));
}

TEST_F(ListenSocketTest, ClaimedPathThatSomethingElseTookIsToldWhenItListens) {
  auto claimed = ListenSocket::claim(path_);
  std::ofstream(path_) << "something else";
  EXPECT_EQ(claimed.value.listen().text(), "can't listen on " + path_ + ": Address already in use");
  claimed.value = ListenSocket();
  EXPECT_TRUE(std::filesystem::exists(path_));
}

TEST_F(ListenSocketTest, HasTheModeWhateverTheMaskAndLeavesTheMaskAlone) {
  const mode_t before = ::umask(0);
  const auto usual = bindTo(path_);
  const auto wide = bindTo(folder_.file("wide"), 0666);
  EXPECT_EQ(::umask(before), 0u);
  EXPECT_EQ(modeOf(path_), 0660u);
  EXPECT_EQ(modeOf(folder_.file("wide")), 0666u);
}

TEST_F(ListenSocketTest, ReplacesAStaleSocketFile) {
  boundSocket(path_).reset();
  ASSERT_FALSE(canConnect(path_));
  const auto result = bindTo(path_);
  EXPECT_EQ(result.error.text(), "");
  EXPECT_TRUE(canConnect(path_));
}

TEST_F(ListenSocketTest, RefusesThePathOfAnotherServiceOfItsKind) {
  const auto first = bindTo(path_);
  const auto second = bindTo(path_);
  EXPECT_FALSE(second.value);
  EXPECT_EQ(second.error.text(), "another service is listening on " + path_);
  EXPECT_TRUE(canConnect(path_));
}

TEST_F(ListenSocketTest, RefusesASocketThatAnybodyListensOn) {
  const auto live = boundSocket(path_);
  ASSERT_EQ(::listen(live.get(), 5), 0);
  const auto result = bindTo(path_);
  EXPECT_EQ(result.error.text(), "another service is listening on " + path_);
  EXPECT_TRUE(canConnect(path_));
}

TEST_F(ListenSocketTest, RefusesASocketOfAnotherKindThatIsInUse) {
  const auto live = boundSocket(path_, SOCK_DGRAM);
  EXPECT_EQ(bindTo(path_).error.text(), "another service is listening on " + path_);
  EXPECT_TRUE(std::filesystem::exists(path_));
}

TEST_F(ListenSocketTest, NeverRemovesAFileThatIsNoSocket) {
  std::ofstream(path_) << "precious";
  EXPECT_EQ(bindTo(path_).error.text(), path_ + " exists and is not a socket");
  EXPECT_EQ(std::filesystem::file_size(path_), 8u);
}

TEST_F(ListenSocketTest, SaysWhichPathItCanNotUse) {
  const std::string missing = folder_.file("no/such/folder/socket");
  EXPECT_NE(bindTo(missing).error.text().find(missing), std::string::npos);
  EXPECT_NE(bindTo(std::string(200, 'x')).error.text().find("a path of 1 to 107 bytes"), std::string::npos);
  EXPECT_NE(bindTo("").error.text(), "");
}

TEST_F(ListenSocketTest, RemovesItsFilesAtTheEnd) {
  { const auto result = bindTo(path_); }
  EXPECT_FALSE(std::filesystem::exists(path_));
  EXPECT_FALSE(std::filesystem::exists(path_ + ".lock"));
}

TEST_F(ListenSocketTest, LeavesAFileThatIsNoLongerItsOwn) {
  {
    const auto result = bindTo(path_);
    ASSERT_TRUE(std::filesystem::remove(path_));
    std::ofstream(path_) << "another's";
  }
  EXPECT_TRUE(std::filesystem::exists(path_));
}

TEST_F(ListenSocketTest, ALockFileThatNobodyHoldsIsNoObstacle) {
  std::ofstream(path_ + ".lock") << "";
  EXPECT_EQ(bindTo(path_).error.text(), "");
}

TEST_F(ListenSocketTest, OfManyThatStartAtOnceOneWins) {
  for (int round = 0; round < 30; ++round) {
    boundSocket(path_).reset();
    std::vector<Result<ListenSocket>> results(6);
    std::vector<std::thread> threads;
    for (auto& result : results) {
      threads.emplace_back([&result, this] { result = bindTo(path_); });
    }
    for (auto& thread : threads) {
      thread.join();
    }
    const auto winners = std::count_if(results.begin(), results.end(),
                                       [](const auto& result) { return static_cast<bool>(result.value); });
    EXPECT_EQ(winners, 1);
    EXPECT_TRUE(canConnect(path_));
  }
}

// A child process that is started the way a service manager starts it: the first socket is descriptor 3.
enum ExitStatus { kTaken = 10, kNone = 11, kRefused = 12 };

int takeInChild(int descriptor, const char* count) {
  return testing::inChild([descriptor, count] {
    ::dup2(descriptor, 3);
    ::setenv("LISTEN_FDS", count, 1);
    ::setenv("LISTEN_PID", std::to_string(::getpid()).c_str(), 1);
    const auto result = ListenSocket::takeHandedOver();
    if (::getenv("LISTEN_FDS") != nullptr) {
      return 1;  // a child of the service would take the socket for its own
    }
    if (result.value.admin) return 3;
    if (result.value.ordinary) {
      const bool blocks = (::fcntl(3, F_GETFL) & O_NONBLOCK) == 0;
      const bool inherited = (::fcntl(3, F_GETFD) & FD_CLOEXEC) == 0;
      return blocks || inherited ? 2 : static_cast<int>(kTaken);
    }
    return result.ok() ? static_cast<int>(kNone) : static_cast<int>(kRefused);
  });
}

TEST_F(ListenSocketTest, TakesTheSocketThatWasHandedOver) {
  const auto socket = boundSocket(path_);
  ASSERT_EQ(::listen(socket.get(), 5), 0);
  EXPECT_EQ(takeInChild(socket.get(), "1"), kTaken);
}

TEST_F(ListenSocketTest, LeavesTheFileOfAHandedOverSocketToItsOwner) {
  const auto socket = boundSocket(path_);
  ASSERT_EQ(::listen(socket.get(), 5), 0);
  takeInChild(socket.get(), "1");
  EXPECT_TRUE(std::filesystem::exists(path_));
}

TEST_F(ListenSocketTest, TakesNothingWhenNothingWasHandedOver) {
  EXPECT_EQ(testing::inChild([] {
              ::unsetenv("LISTEN_FDS");
              const auto result = ListenSocket::takeHandedOver();
              return !result.value.ordinary && !result.value.admin && result.ok() ? 0 : 1;
            }),
            0);
}

// What comes of sockets of these names, which listen at "NUMBER" in the folder, from 0 on: "error", or the places of
// the ordinary and of the admin socket.
std::string handedOver(const testing::ScratchFolder& folder, const std::string& names, int count) {
  int tell[2];
  EXPECT_EQ(::pipe(tell), 0);
  EXPECT_EQ(testing::inChild([&] {
              ::dup2(tell[1], 30);
              std::vector<UniqueDescriptor> sockets;
              for (int index = 0; index < count; ++index) {
                sockets.push_back(boundSocket(folder.file(std::to_string(index))));
                ::listen(sockets.back().get(), 5);
                ::dup2(sockets.back().get(), 20 + index);
              }
              for (int index = 0; index < count; ++index) {
                ::dup2(20 + index, 3 + index);
              }
              ::setenv("LISTEN_FDS", std::to_string(count).c_str(), 1);
              ::setenv("LISTEN_PID", std::to_string(::getpid()).c_str(), 1);
              ::unsetenv("LISTEN_FDNAMES");
              if (!names.empty()) {
                ::setenv("LISTEN_FDNAMES", names.c_str(), 1);
              }
              const auto taken = ListenSocket::takeHandedOver();
              const auto placeOf = [](const ListenSocket& socket) {
                return socket ? socket.path().substr(socket.path().rfind('/') + 1) : std::string("none");
              };
              const std::string text =
                  taken.failed() ? taken.error->text : placeOf(taken.value.ordinary) + " " + placeOf(taken.value.admin);
              return ::write(30, text.data(), text.size()) > 0 && ::getenv("LISTEN_FDNAMES") == nullptr ? 0 : 1;
            }),
            0);
  std::string text(200, '\0');
  text.resize(static_cast<std::size_t>(std::max<ssize_t>(::read(tell[0], text.data(), text.size()), 0)));
  ::close(tell[0]);
  ::close(tell[1]);
  return text;
}

TEST_F(ListenSocketTest, TheAdminSocketIsTheOneOfThatName) {
  EXPECT_EQ(handedOver(folder_, "socket:admin", 2), "0 1");
}

TEST_F(ListenSocketTest, TheAdminSocketMayComeFirst) {
  EXPECT_EQ(handedOver(folder_, "admin:tarnreportingd.socket", 2), "1 0");
}

TEST_F(ListenSocketTest, TheAdminSocketMayComeAlone) {
  EXPECT_EQ(handedOver(folder_, "admin", 1), "none 0");
}

TEST_F(ListenSocketTest, ASocketWithoutANameIsTheOrdinaryOne) {
  EXPECT_EQ(handedOver(folder_, "", 1), "0 none");
}

TEST_F(ListenSocketTest, ANameThatOnlyBeginsSoIsNotTheAdmins) {
  EXPECT_EQ(handedOver(folder_, "administration", 1), "0 none");
}

TEST_F(ListenSocketTest, RefusesTwoOfAKind) {
  EXPECT_EQ(handedOver(folder_, "", 2), "2 sockets were handed over, one is expected");
}

TEST_F(ListenSocketTest, RefusesTwoOrdinaryOnesBesideAnAdminSocket) {
  EXPECT_EQ(handedOver(folder_, "one:admin:two", 3), "2 sockets were handed over, one is expected");
}

TEST_F(ListenSocketTest, RefusesTwoAdminSockets) {
  EXPECT_EQ(handedOver(folder_, "admin:socket:admin", 3), "2 admin sockets were handed over, one is expected");
}

TEST_F(ListenSocketTest, RefusesNamesThatAreNotAsMany) {
  EXPECT_NE(handedOver(folder_, "admin", 2).find("can't take the socket that was handed over"), std::string::npos);
}

TEST_F(ListenSocketTest, RefusesAHandedOverSocketThatDoesNotListen) {
  EXPECT_EQ(takeInChild(boundSocket(path_).get(), "1"), kRefused);
}

TEST_F(ListenSocketTest, RefusesAHandedOverSocketOfAnotherKind) {
  EXPECT_EQ(takeInChild(boundSocket(path_, SOCK_DGRAM).get(), "1"), kRefused);
}

}  // namespace
}  // namespace tarn::linux_host
