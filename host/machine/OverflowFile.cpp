// SPDX-License-Identifier: Apache-2.0
#include "host/machine/OverflowFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <functional>
#include <utility>

#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

constexpr mode_t kMode = 0600;
// Where the disk knows no files without a name, and for that moment alone.
constexpr const char* kName = "/log-overflow";

off_t offsetOf(std::uint32_t slot) {
  return static_cast<off_t>(slot) * static_cast<off_t>(OverflowFile::kSlotBytes);
}

Status writeAt(int descriptor, std::string_view bytes, off_t offset) {
  while (!bytes.empty()) {
    const ssize_t written = ::pwrite(descriptor, bytes.data(), bytes.size(), offset);
    if (written >= 0) {
      bytes.remove_prefix(static_cast<std::size_t>(written));
      offset += written;
    } else if (errno != EINTR) {
      return lastSystemError();
    }
  }
  return {};
}

Status readAt(int descriptor, char* bytes, std::size_t size, off_t offset) {
  while (size > 0) {
    const ssize_t got = ::pread(descriptor, bytes, size, offset);
    if (got == 0) return Error{0, "the file is cut"};
    if (got > 0) {
      bytes += got;
      size -= static_cast<std::size_t>(got);
      offset += got;
    } else if (errno != EINTR) {
      return lastSystemError();
    }
  }
  return {};
}

}  // namespace

OverflowFile::OverflowFile(std::string folder, const Bounds& bounds, std::size_t share)
    : folder_(std::move(folder)), bounds_(bounds), share_(share) {
  ::unlink((folder_ + kName).c_str());
}

Status OverflowFile::open() {
  if (file_) return {};
  UniqueDescriptor file(::open(folder_.c_str(), O_TMPFILE | O_RDWR | O_CLOEXEC, kMode));
  if (!file && (errno == EOPNOTSUPP || errno == EISDIR || errno == EINVAL)) {
    const std::string path = folder_ + kName;
    ::unlink(path.c_str());
    file = UniqueDescriptor(::open(path.c_str(), O_CREAT | O_EXCL | O_NOFOLLOW | O_RDWR | O_CLOEXEC, kMode));
    if (file && ::unlink(path.c_str()) != 0) return errorOf(path, errno);
  }
  if (!file) return errorOf(folder_, errno);
  file_ = std::move(file);
  return {};
}

Status OverflowFile::take(std::size_t count, Slots& slots, int& descriptor) {
  const MutexLock guard(mutex_);
  if (static_cast<std::size_t>(*size_) + count * kSlotBytes > share_) {
    return Error{ENOSPC, "the share of the disk for messages is used up"};
  }
  if (Status opened = open(); opened.failed()) return opened;
  slots.reserve(count);
  free_.reserve(end_ + count);
  while (slots.size() < count) {
    if (free_.empty()) {
      slots.push_back(end_++);
    } else {
      slots.push_back(free_.front());
      std::pop_heap(free_.begin(), free_.end(), std::greater<>());
      free_.pop_back();
    }
  }
  *size_ += static_cast<std::int64_t>(count * kSlotBytes);
  descriptor = file_.get();
  return {};
}

OverflowFile::Run OverflowFile::runAt(const Slots& slots, std::size_t index) noexcept {
  std::uint32_t count = 1;
  while (index + count < slots.size() && slots[index + count] == slots[index] + count) {
    ++count;
  }
  return {slots[index], count};
}

Result<platform::OverflowStore::Place> OverflowFile::write(std::string_view bytes) {
  Place place = 0;
  Slots* slots = nullptr;
  {
    const MutexLock guard(mutex_);
    place = ++last_;
    slots = &blocks_.emplace(place, Block{{}, bytes.size()}).first->second.slots;
  }
  Status filled;
  try {
    filled = fill(*slots, bytes);
  } catch (...) {
    remove(place);
    throw;
  }
  if (filled.failed()) {
    remove(place);
    return {0, std::move(filled)};
  }
  return {place, {}};
}

Status OverflowFile::fill(Slots& slots, std::string_view bytes) {
  int descriptor = -1;
  if (Status taken = take((bytes.size() + kSlotBytes - 1) / kSlotBytes, slots, descriptor); taken.failed()) {
    return taken;
  }
  for (std::size_t index = 0; index < slots.size();) {
    const Run run = runAt(slots, index);
    if (Status written =
            writeAt(descriptor, bytes.substr(index * kSlotBytes, run.count * kSlotBytes), offsetOf(run.first));
        written.failed()) {
      return written;
    }
    index += run.count;
  }
  return {};
}

Result<std::string> OverflowFile::read(Place place) {
  Block block;
  int descriptor = -1;
  {
    const MutexLock guard(mutex_);
    const auto found = blocks_.find(place);
    if (found == blocks_.end()) return {{}, Error{ENOENT, "nothing is kept there"}};
    block = found->second;
    descriptor = file_.get();
  }
  std::string bytes(block.bytes, '\0');
  for (std::size_t index = 0; index < block.slots.size();) {
    const Run run = runAt(block.slots, index);
    const std::size_t begin = index * kSlotBytes;
    const std::size_t size = std::min(run.count * kSlotBytes, bytes.size() - begin);
    if (Status read = readAt(descriptor, bytes.data() + begin, size, offsetOf(run.first)); read.failed()) {
      return {{}, std::move(read)};
    }
    index += run.count;
  }
  return {std::move(bytes), {}};
}

void OverflowFile::remove(Place place) noexcept {
  Slots slots;
  {
    const MutexLock guard(mutex_);
    const auto found = blocks_.find(place);
    if (found == blocks_.end()) return;
    slots = std::move(found->second.slots);
    blocks_.erase(found);
  }
  giveBack(slots);
}

// Gives the room back to the disk while the slots are still nobody else's, where the disk can take it, then the slots.
void OverflowFile::giveBack(const Slots& slots) noexcept {
  int descriptor = -1;
  {
    const MutexLock guard(mutex_);
    descriptor = file_.get();
  }
  for (std::size_t index = 0; index < slots.size();) {
    const Run run = runAt(slots, index);
    static_cast<void>(
        ::fallocate(descriptor, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, offsetOf(run.first), offsetOf(run.count)));
    index += run.count;
  }
  const MutexLock guard(mutex_);
  for (const std::uint32_t slot : slots) {
    free_.push_back(slot);
    std::push_heap(free_.begin(), free_.end(), std::greater<>());
  }
  *size_ -= static_cast<std::int64_t>(slots.size() * kSlotBytes);
  if (free_.size() == end_ && ::ftruncate(descriptor, 0) == 0) {
    free_.clear();
    end_ = 0;
  }
}

}  // namespace tarn::linux_host
