// SPDX-License-Identifier: Apache-2.0
// When the C library tells of a session's end: not before all is taken that was posted to it, also what a call
// publishes that was inside when the session was ended. The service here accepts, listens and says nothing.
#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <thread>

#include "clients/c/src/Client.h"
#include "clients/c/src/Writer.h"
#include "tests/clients/LibraryFixture.h"
#include "tests/host/ScratchFolder.h"

namespace tarn::reporting {
namespace {

class Ending : public LibraryFixture {
 protected:
  Ending() {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path_.copy(address.sun_path, sizeof address.sun_path - 1);
    EXPECT_EQ(::bind(listener_, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    EXPECT_EQ(::listen(listener_, 1), 0);
    openAll(path_);
    connection_ = ::accept(listener_, nullptr, nullptr);
    EXPECT_GE(connection_, 0);
  }
  ~Ending() override {
    ::close(connection_);
    ::close(listener_);
  }

  // The bytes that come until none did for so long.
  std::size_t heard(int quietMs) {
    std::size_t bytes = 0;
    std::array<char, 4096> buffer{};
    for (pollfd ready{connection_, POLLIN, 0}; ::poll(&ready, 1, quietMs) > 0;) {
      const ssize_t count = ::read(connection_, buffer.data(), buffer.size());
      if (count <= 0) break;
      bytes += static_cast<std::size_t>(count);
    }
    return bytes;
  }
  void stand(std::uint32_t inside) { __atomic_store_n(&writer_->hot->inside, inside, __ATOMIC_SEQ_CST); }
  // Whoever stands inside publishes and is out before the helper looks again.
  void publishAndLeave() {
    client_->lock();
    stand(0);
    EXPECT_EQ(post(2), TARNREPORTING_OK);
    client_->unlock();
  }
  std::uint64_t head() const { return __atomic_load_n(&writer_->header->head, __ATOMIC_ACQUIRE); }
  void take(std::uint64_t position) { __atomic_store_n(&writer_->header->taken, position, __ATOMIC_RELEASE); }

  static constexpr int kQuietMs = 100;  // many looks of the helper
  testing::ScratchFolder folder_;
  const std::string path_ = folder_.file("socket");
  int listener_ = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  int connection_ = -1;
};

TEST_F(Ending, IsToldOnceAllIsTaken) {
  ASSERT_EQ(post(1), TARNREPORTING_OK);
  ASSERT_GT(heard(kQuietMs), 0U);
  ASSERT_EQ(tarnreporting_session_end(session_), TARNREPORTING_OK);
  EXPECT_EQ(heard(kQuietMs), 0U);
  take(head());
  EXPECT_GT(heard(kQuietMs), 0U);
}

TEST_F(Ending, IsNotToldBeforeACallThatIsInsideHasPublished) {
  ASSERT_EQ(post(1), TARNREPORTING_OK);
  ASSERT_GT(heard(kQuietMs), 0U);
  take(head());
  stand(1);
  ASSERT_EQ(tarnreporting_session_end(session_), TARNREPORTING_OK);
  EXPECT_EQ(heard(kQuietMs), 0U) << "it may still publish";
  publishAndLeave();
  EXPECT_EQ(heard(kQuietMs), 0U) << "what it published isn't taken";
  take(head());
  EXPECT_GT(heard(kQuietMs), 0U);
}

TEST_F(Ending, OfACloseIsNotToldBeforeACallThatIsInsideHasPublished) {
  ASSERT_EQ(post(1), TARNREPORTING_OK);
  ASSERT_GT(heard(kQuietMs), 0U);
  take(head());
  stand(1);
  std::uint64_t left = 99;
  std::thread closing([&] { tarnreporting_client_close(client_, 2000, &left); });
  EXPECT_EQ(heard(kQuietMs), 0U) << "it may still publish";
  client_->lock();
  stand(0);
  // As who looked whether the writer is shut before it was.
  const std::uint32_t shut = __atomic_exchange_n(&writer_->hot->closed, 0U, __ATOMIC_SEQ_CST);
  EXPECT_EQ(shut, 1U);
  EXPECT_EQ(post(2), TARNREPORTING_OK);
  __atomic_store_n(&writer_->hot->closed, 1U, __ATOMIC_SEQ_CST);
  client_->unlock();
  EXPECT_EQ(heard(kQuietMs), 0U) << "what it published isn't taken";
  take(head());
  EXPECT_GT(heard(kQuietMs), 0U);
  ::shutdown(connection_, SHUT_RDWR);  // no answers will come
  closing.join();
  client_ = nullptr;
}

TEST_F(Ending, WaitsForNobodyWhoIsInsideForAnotherSession) {
  ASSERT_EQ(post(1), TARNREPORTING_OK);
  ASSERT_GT(heard(kQuietMs), 0U);
  ASSERT_EQ(tarnreporting_session_end(session_), TARNREPORTING_OK);
  EXPECT_EQ(heard(kQuietMs), 0U);
  stand(1);  // who came in afterwards
  take(head());
  EXPECT_GT(heard(kQuietMs), 0U);
  stand(0);
}

}  // namespace
}  // namespace tarn::reporting
