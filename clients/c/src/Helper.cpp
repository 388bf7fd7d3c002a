// SPDX-License-Identifier: Apache-2.0
// The helper thread: connects, says what is new, reads the replies, looks after writers that may not wake the service.
#include <poll.h>
#include <sys/types.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "clients/c/src/Client.h"

using namespace tarn::reporting;

namespace {

constexpr std::int64_t kMillisecond = 1000000;
// How often is looked at what no descriptor tells.
constexpr int kBusyMs = 5;
constexpr int kQuietWritersMs = 50;
// Until a ring that was refused is offered again.
constexpr std::int64_t kRetryRing = 200 * kMillisecond;
// Between attempts to connect: the first, and how often it doubles.
constexpr std::int64_t kFirstPause = 10 * kMillisecond;
constexpr std::uint32_t kMostDoublings = 8;

constexpr const char* kSystemSocket = "/run/tarnreporting/socket";

std::uint64_t loadAcquire(const std::uint64_t& word) noexcept {
  return __atomic_load_n(&word, __ATOMIC_ACQUIRE);
}

bool isTaken(const tarnreporting_writer& writer) noexcept {
  return loadAcquire(writer.header->taken) == loadAcquire(writer.header->head);
}

// The next writer in this place begins at 0.
void forgetWriter(tarnreporting_session& session, std::size_t slot) noexcept {
  session.end.at[slot] = 0;
  session.inside &= ~(1U << slot);
  for (tarnreporting_shape* shape = session.shapes; shape != nullptr; shape = shape->next) {
    if (shape->lastUse != nullptr) {
      shape->lastUse->at[slot] = 0;
    }
  }
}

}  // namespace

namespace tarn::reporting {

void addTo(Totals& totals, const tarnreporting_writer& writer) noexcept {
  const tarnring_header& header = *writer.header;
  // What another thread is just posting may be taken before it is counted.
  const std::uint64_t taken = loadAcquire(header.taken_messages);
  const std::uint64_t posted = loadAcquire(header.posted);
  totals.taken += taken;
  totals.posted += posted > taken ? posted : taken;
  totals.committed += loadAcquire(header.committed_messages);
  totals.refused += loadAcquire(header.refused);
  totals.dropped += loadAcquire(header.dropped);
}

}  // namespace tarn::reporting

void* tarnreporting_client::runHelper(void* self) {
  ::pthread_setname_np(::pthread_self(), "tarnreporting");
  static_cast<tarnreporting_client*>(self)->run();
  return nullptr;
}

void tarnreporting_client::run() noexcept {
  lock();
  while (!stopping_) {
    turn();
    tellRefusal();
    pollfd descriptors[2] = {{wake_, POLLIN, 0}, {link_.descriptor(), POLLIN, 0}};
    if (link_.hasUnsent()) {
      descriptors[1].events |= POLLOUT;
    }
    const int timeout = waitTime(monotonicNow());
    unlock();
    ::poll(descriptors, link_.isOpen() ? 2 : 1, timeout);
    if (descriptors[0].revents != 0) {
      std::uint64_t count = 0;
      [[maybe_unused]] const ssize_t read = ::read(wake_, &count, sizeof count);
    }
    lock();
  }
  link_.flush();
  unlock();
}

void tarnreporting_client::turn() noexcept {
  const std::int64_t now = monotonicNow();
  if (!link_.isOpen()) {
    if (linked_) {
      disconnected(now);
    }
    if (now >= nextConnect_) {
      connectAgain(now);
    }
  }
  if (link_.isOpen()) {
    link_.receive([this](const ReplyFront& reply) { take(reply); });
  }
  tendWriters(now);
  tendSessions();
  lookAfterQuietWriters();
  link_.flush();
  if (!link_.isOpen() && linked_) {
    disconnected(now);
  }
}

void tarnreporting_client::connectAgain(std::int64_t now) noexcept {
  if (connectSomewhere()) {
    failures_ = 0;
    ++connections_;
    linked_ = true;
    for (Session* session = sessions_; session != nullptr; session = session->next) {
      announce(*session);
    }
    return;
  }
  char text[sizeof lastError_];
  const int length = std::snprintf(text, sizeof text, "no service answers (error %d)", errno);
  noteError(text, static_cast<std::size_t>(length));
  // Doubled each time, and up to a half more, so that the clients of a service that comes back don't come at once.
  const std::int64_t pause = kFirstPause << (failures_ < kMostDoublings ? failures_++ : kMostDoublings);
  random_ ^= random_ << 13U;
  random_ ^= random_ >> 7U;
  random_ ^= random_ << 17U;
  nextConnect_ = now + pause + static_cast<std::int64_t>(random_ % static_cast<std::uint64_t>(pause / 2));
}

// To the path asked for, else to that of the environment, else to the user's and then the system's.
bool tarnreporting_client::connectSomewhere() noexcept {
  if (path_[0] != '\0') return link_.connect(path_);
  if (const char* const path = ::secure_getenv("TARNREPORTING_SOCKET")) return link_.connect(path);
  const char* const folder = ::secure_getenv("XDG_RUNTIME_DIR");
  char path[Link::kMostPath];
  if (folder != nullptr && folder[0] == '/') {
    const int length = std::snprintf(path, sizeof path, "%s/tarnreporting.sock", folder);
    if (length > 0 && static_cast<std::size_t>(length) < sizeof path && link_.connect(path)) return true;
  }
  return link_.connect(kSystemSocket);
}

// The sessions ended with their connection, the rings are without a reader.
void tarnreporting_client::disconnected(std::int64_t now) noexcept {
  linked_ = false;
  forgotten(0);
  constexpr char kEnded[] = "the connection to the service ended";
  noteError(kEnded, sizeof kEnded - 1);
  nextConnect_ = now + kFirstPause;
  for (Session* session = sessions_; session != nullptr; session = session->next) {
    session->announced = false;
  }
  for (Writer* const writer : writers_) {
    if (writer != nullptr) {
      writer->link = Writer::Link::None;
      writer->retryAt = 0;
    }
  }
}

void tarnreporting_client::take(const ReplyFront& reply) noexcept {
  for (Writer* const writer : writers_) {
    if (writer == nullptr || writer->link != Writer::Link::Asked || writer->openRequest != reply.id) continue;
    writer->link = reply.isError ? Writer::Link::None : Writer::Link::Open;
    writer->retryAt = monotonicNow() + kRetryRing;
  }
  forgotten(reply.id);
  if (reply.isError) {
    ++requestsRefused_;
    refusalToTell_ = true;
    noteError(reply.text, reply.textLength);
  }
}

void tarnreporting_client::noteError(const char* text, std::size_t length) noexcept {
  const std::size_t kept = length < sizeof lastError_ ? length : sizeof lastError_ - 1;
  std::memcpy(lastError_, text, kept);
  lastError_[kept] = '\0';
}

// Without the lock, so that the program's function may take its time.
void tarnreporting_client::tellRefusal() noexcept {
  if (!refusalToTell_ || onRefusal_ == nullptr) return;
  refusalToTell_ = false;
  char text[sizeof lastError_];
  std::memcpy(text, lastError_, sizeof text);
  unlock();
  onRefusal_(context_, text);
  lock();
}

void tarnreporting_client::tendWriters(std::int64_t now) noexcept {
  for (std::size_t slot = 0; slot < kMostWriters; ++slot) {
    Writer*& writer = writers_[slot];
    if (writer == nullptr) continue;
    const bool safe = loadAcquire(writer->header->committed_messages) == loadAcquire(writer->header->taken_messages);
    if (writer->closing && isTaken(*writer) && (safe || writer->link != Writer::Link::Open)) {
      retire(*writer);
      writer = nullptr;
      for (Session* session = sessions_; session != nullptr; session = session->next) {
        forgetWriter(*session, slot);
      }
    } else if (linked_ && writer->link == Writer::Link::None && now >= writer->retryAt) {
      openRing(*writer);
    }
  }
}

void tarnreporting_client::openRing(Writer& writer) noexcept {
  writer.openRequest = link_.begin(Operation::OpenRing, 0);
  writer.link = Writer::Link::Asked;
  link_.attach(writer.memoryDescriptor, writer.wakeDescriptor);
  link_.end();
}

void tarnreporting_client::retire(Writer& writer) noexcept {
  addTo(gone_, writer);
  freeRing(writer);
  std::free(&writer);
}

void tarnreporting_client::lookAfterQuietWriters() noexcept {
  for (Writer* const writer : writers_) {
    if (writer != nullptr && !writer->mayWake && loadAcquire(writer->header->asleep) != 0 && !isTaken(*writer)) {
      wakeReader(*writer);
    }
  }
}

// In milliseconds; -1 stands for ever.
int tarnreporting_client::waitTime(std::int64_t now) noexcept {
  int wait = -1;
  const auto atMost = [&wait](int time) { wait = wait < 0 || time < wait ? time : wait; };
  if (!link_.isOpen()) {
    const std::int64_t left = (nextConnect_ - now) / kMillisecond + 1;
    atMost(left > 0 ? static_cast<int>(left) : 0);
  }
  for (const Session* session = sessions_; session != nullptr && linked_; session = session->next) {
    if (session->ending) {
      atMost(kBusyMs);
    }
  }
  for (const Writer* const writer : writers_) {
    if (writer == nullptr) continue;
    if (writer->closing && linked_) {
      atMost(kBusyMs);
    }
    if (linked_ && writer->link == Writer::Link::None) {
      atMost(kQuietWritersMs);
    }
    if (!writer->mayWake && writer->link == Writer::Link::Open) {
      atMost(kQuietWritersMs);
    }
  }
  return wait;
}

void tarnreporting_client::wakeHelper() noexcept {
  const std::uint64_t one = 1;
  [[maybe_unused]] const ssize_t written = ::write(wake_, &one, sizeof one);
}

bool tarnreporting_client::anybodyInside() const noexcept {
  for (const Writer* const writer : writers_) {
    if (writer != nullptr && isInside(*writer)) return true;
  }
  return false;
}

bool tarnreporting_client::isAllTaken() const noexcept {
  for (const Writer* const writer : writers_) {
    if (writer != nullptr && !isTaken(*writer)) return false;
  }
  return true;
}

std::uint64_t tarnreporting_client::untaken() const noexcept {
  Totals totals;
  for (const Writer* const writer : writers_) {
    if (writer != nullptr) {
      addTo(totals, *writer);
    }
  }
  return totals.posted > totals.taken ? totals.posted - totals.taken : 0;
}

// Whether a close need not wait any longer.
bool tarnreporting_client::isDone() const noexcept {
  if (!isAllTaken()) return false;
  if (!link_.isOpen()) return !linked_ && connections_ + failures_ != 0;
  return sessions_ == nullptr && !link_.hasUnsent() && link_.outstanding() == 0;
}
