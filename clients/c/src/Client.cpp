// SPDX-License-Identifier: Apache-2.0
#include "clients/c/src/Client.h"

#include <sys/eventfd.h>
#include <sys/mman.h>
#include <sys/random.h>
#include <unistd.h>

#include <csignal>
#include <cstring>
#include <ctime>
#include <new>

namespace tarn::reporting {

namespace {

constexpr std::int64_t kNanosecondsPerSecond = 1000000000;
constexpr std::int64_t kNanosecondsPerMillisecond = 1000000;
constexpr std::size_t kPageBytes = 4096;

void pause(std::int64_t nanoseconds) noexcept {
  const timespec time{0, static_cast<long>(nanoseconds)};
  ::nanosleep(&time, nullptr);
}

// Asks every few milliseconds whether it holds; whether it did in time.
template <class Condition>
bool waitFor(std::uint32_t timeoutMs, Condition holds) noexcept {
  const std::int64_t deadline = monotonicNow() + std::int64_t{timeoutMs} * kNanosecondsPerMillisecond;
  std::int64_t rest = kNanosecondsPerMillisecond / 5;
  while (!holds()) {
    const std::int64_t left = deadline - monotonicNow();
    if (left <= 0) return false;
    pause(rest < left ? rest : left);
    rest = rest < 4 * kNanosecondsPerMillisecond ? 2 * rest : rest;
  }
  return true;
}

std::uint32_t* makeAlivePage() noexcept {
  void* const page =
      ::mmap(nullptr, kPageBytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_POPULATE, -1, 0);
  if (page == MAP_FAILED) return nullptr;
  if (::madvise(page, kPageBytes, MADV_WIPEONFORK) != 0) {
    ::munmap(page, kPageBytes);
    return nullptr;
  }
  auto* const alive = static_cast<std::uint32_t*>(page);
  *alive = 1;
  return alive;
}

}  // namespace

std::int64_t monotonicNow() noexcept {
  timespec time{};
  ::clock_gettime(CLOCK_MONOTONIC, &time);
  return std::int64_t{time.tv_sec} * kNanosecondsPerSecond + time.tv_nsec;
}

}  // namespace tarn::reporting

using namespace tarn::reporting;

int tarnreporting_client::open(const tarnreporting_client_options* options) noexcept {
  if (options != nullptr && options->socket_path != nullptr) {
    if (std::strlen(options->socket_path) >= sizeof path_) return TARNREPORTING_TOO_LARGE;
    std::memcpy(path_, options->socket_path, std::strlen(options->socket_path));
  }
  if (options != nullptr) {
    onRefusal_ = options->on_refusal;
    context_ = options->context;
  }
  std::uint64_t random = 0;
  if (::getrandom(&random, sizeof random, 0) != static_cast<ssize_t>(sizeof random)) {
    random = static_cast<std::uint64_t>(monotonicNow());
  }
  random_ = random | 1U;
  nextReporterID_ = static_cast<std::int64_t>(random >> 2U) + 1;
  wake_ = ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
  alive_ = makeAlivePage();
  if (wake_ < 0 || alive_ == nullptr || !startHelper()) {
    freeAll();
    return TARNREPORTING_SYSTEM;
  }
  enlist(*this);
  return TARNREPORTING_OK;
}

// The thread takes no signal of the program's.
bool tarnreporting_client::startHelper() noexcept {
  sigset_t all;
  sigset_t before;
  ::sigfillset(&all);
  ::pthread_sigmask(SIG_SETMASK, &all, &before);
  const bool started = ::pthread_create(&helper_, nullptr, &runHelper, this) == 0;
  ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
  return started;
}

int tarnreporting_client::close(std::uint32_t timeoutMs, std::uint64_t* left, bool& empty) noexcept {
  {
    const Locked locked(*this);
    for (Writer* const writer : writers_) {
      if (writer != nullptr) {
        shut(*writer);
      }
    }
    for (Session* session = sessions_; session != nullptr; session = session->next) {
      markEnding(*session);
    }
  }
  wakeHelper();
  const bool done = waitFor(timeoutMs, [this] {
    const Locked locked(*this);
    return isDone();
  });
  // A call that is inside is a matter of microseconds, unless its thread doesn't run.
  empty = waitFor(1000, [this] { return !anybodyInside(); });
  {
    const Locked locked(*this);
    stopping_ = true;
    if (left != nullptr) {
      *left = untaken();
    }
  }
  wakeHelper();
  ::pthread_join(helper_, nullptr);
  strike(*this);
  if (empty) {
    freeAll();
  }
  return done ? TARNREPORTING_OK : TARNREPORTING_TIMEOUT;
}

void tarnreporting_client::freeAll() noexcept {
  link_.close();
  linked_ = false;
  while (sessions_ != nullptr) {
    remove(*sessions_);
  }
  for (Writer*& writer : writers_) {
    if (writer != nullptr) {
      freeRing(*writer);
      std::free(writer);
      writer = nullptr;
    }
  }
  if (wake_ >= 0) {
    ::close(wake_);
  }
  if (alive_ != nullptr) {
    ::munmap(alive_, kPageBytes);
  }
  wake_ = -1;
  alive_ = nullptr;
}

void tarnreporting_client::closeInChild() noexcept {
  link_.close();
  if (wake_ >= 0) {
    ::close(wake_);
  }
  wake_ = -1;
  for (Writer* const writer : writers_) {
    if (writer != nullptr) {
      closeDescriptors(*writer);
    }
  }
}

int tarnreporting_client::flush(std::uint32_t timeoutMs) noexcept {
  wakeHelper();
  const bool taken = waitFor(timeoutMs, [this] {
    const Locked locked(*this);
    return isAllTaken();
  });
  return taken ? TARNREPORTING_OK : TARNREPORTING_TIMEOUT;
}

int tarnreporting_client::openWriter(std::uint32_t ringBytes, std::uint32_t flags, Writer** made) noexcept {
  void* const memory = std::malloc(sizeof(Writer));
  if (memory == nullptr) return TARNREPORTING_MEMORY;
  auto* const writer = ::new (memory) Writer;
  writer->alive = alive_;
  writer->client = this;
  writer->mayWake = (flags & TARNREPORTING_NO_SYSTEM_CALL) == 0;
  int result = makeRing(*writer, ringBytes);
  if (result == TARNREPORTING_OK) {
    const Locked locked(*this);
    result = TARNREPORTING_TOO_LARGE;
    for (Writer*& slot : writers_) {
      if (slot == nullptr) {
        slot = writer;
        result = TARNREPORTING_OK;
        break;
      }
    }
  }
  if (result != TARNREPORTING_OK) {
    freeRing(*writer);
    std::free(writer);
    return result;
  }
  wakeHelper();
  *made = writer;
  return TARNREPORTING_OK;
}

int tarnreporting_client::closeWriter(Writer& writer) noexcept {
  shut(writer);
  const bool empty = waitFor(1000, [&] { return !isInside(writer); });
  const Locked locked(*this);
  if (!empty) return TARNREPORTING_BUSY;
  writer.closing = true;
  __atomic_store_n(&writer.header->ended, 1U, __ATOMIC_RELEASE);
  wakeReader(writer);
  wakeHelper();
  return TARNREPORTING_OK;
}

void tarnreporting_client::readState(tarnreporting_state& state) noexcept {
  const Locked locked(*this);
  Totals totals = gone_;
  for (const Writer* const writer : writers_) {
    if (writer == nullptr) continue;
    addTo(totals, *writer);
    state.unlocked += writer->locked ? 0 : 1;
  }
  state.connection = link_.isOpen() ? TARNREPORTING_CONNECTED : TARNREPORTING_CONNECTING;
  state.connections = connections_;
  state.posted = totals.posted;
  state.taken = totals.taken;
  state.committed = totals.committed;
  state.dropped = totals.dropped;
  state.refused = totals.refused + requestsRefused_;
  std::memcpy(state.last_error, lastError_, sizeof lastError_);
}
