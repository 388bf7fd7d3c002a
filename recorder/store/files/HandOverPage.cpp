// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/HandOverPage.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <system_error>

#include "recorder/store/files/MappedGuard.h"
#include "recorder/store/files/RowHash.h"

namespace tarn::recorder {

namespace {

constexpr std::size_t kPageBytes = 4096;

Error errorOf(const std::filesystem::path& file, int error) {
  return {error, file.string() + ": " + std::generic_category().message(error)};
}

}  // namespace

// The count that changes with every event, and two places for what each commit left, written by turns: whoever is ended
// in the middle of one leaves the other.
struct HandOverPage::Page {
  struct Commit {
    std::uint64_t sequence;
    std::uint64_t committed;
    std::uint64_t failed;
    std::int64_t lastId;
    std::uint64_t hash;

    std::uint64_t ownHash() const noexcept {
      RowHash own;
      own.add(sequence);
      own.add(committed);
      own.add(failed);
      own.add(static_cast<std::uint64_t>(lastId));
      return own.value();
    }
    bool isWhole() const noexcept { return sequence > 0 && hash == ownHash(); }
  };

  volatile std::uint64_t handedOver;
  std::array<Commit, 2> commits;

  // The last whole one, or null.
  const Commit* last() const noexcept {
    const Commit* found = nullptr;
    for (const Commit& commit : commits) {
      if (commit.isWhole() && (found == nullptr || commit.sequence > found->sequence)) {
        found = &commit;
      }
    }
    return found;
  }
};

Result<std::optional<HandOverCounts>> HandOverPage::open(const std::filesystem::path& file) {
  unmap();
  const int descriptor = ::open(file.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0640);
  if (descriptor < 0) return {{}, errorOf(file, errno)};
  struct stat status {};
  int error = ::fstat(descriptor, &status) != 0 ? errno : 0;
  if (error == 0 && !S_ISREG(status.st_mode)) {
    error = EINVAL;
  }
  // All of it is there before it is touched: a full disk would be a signal then.
  if (error == 0) {
    error = ::posix_fallocate(descriptor, 0, kPageBytes);
  }
  void* memory = MAP_FAILED;
  if (error == 0) {
    memory = ::mmap(nullptr, kPageBytes, PROT_READ | PROT_WRITE, MAP_SHARED, descriptor, 0);
    if (memory == MAP_FAILED) {
      error = errno;
    }
  }
  ::close(descriptor);
  if (error != 0) return {{}, errorOf(file, error)};
  static_cast<void>(MappedGuard::guard(memory, kPageBytes));
  tornBefore_ = MappedGuard::torn();
  page_ = static_cast<Page*>(memory);
  const Page::Commit* const last = page_->last();
  if (last == nullptr) return {std::nullopt};
  return {HandOverCounts{page_->handedOver, last->committed, last->failed, last->lastId}};
}

void HandOverPage::handOver(std::uint64_t handedOver) noexcept {
  if (page_ != nullptr) {
    page_->handedOver = handedOver;
  }
}

void HandOverPage::keep(const HandOverCounts& counts) noexcept {
  if (page_ == nullptr) return;
  page_->handedOver = counts.handedOver;
  const Page::Commit* const last = page_->last();
  const std::uint64_t sequence = last == nullptr ? 1 : last->sequence + 1;
  Page::Commit& next = page_->commits[sequence % 2];
  next = {sequence, counts.committed, counts.failed, counts.lastId, 0};
  next.hash = next.ownHash();
}

bool HandOverPage::isTorn() const noexcept {
  return page_ != nullptr && MappedGuard::torn() != tornBefore_;
}

void HandOverPage::unmap() noexcept {
  if (page_ == nullptr) return;
  MappedGuard::forget(page_);
  ::munmap(page_, kPageBytes);
  page_ = nullptr;
}

}  // namespace tarn::recorder
