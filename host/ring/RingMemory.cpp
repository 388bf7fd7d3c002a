// SPDX-License-Identifier: Apache-2.0
#include "host/ring/RingMemory.h"

#include <fcntl.h>
#include <linux/magic.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <array>
#include <bit>
#include <string>
#include <string_view>
#include <utility>

#include "clients/ring/SharedWords.h"

namespace tarn::linux_host {

namespace {

constexpr int kSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL;

// Memory of ordinary pages: large ones may be missing when they are first touched.
bool isOrdinaryMemory(int descriptor) {
  struct statfs system {};
  return ::fstatfs(descriptor, &system) == 0 && system.f_type == TMPFS_MAGIC;
}

bool isSize(off_t bytes) {
  const auto data = static_cast<std::uint64_t>(bytes) - TARNRING_HEADER_BYTES;
  return std::cmp_greater_equal(bytes, TARNRING_HEADER_BYTES + TARNRING_LEAST_DATA_BYTES) &&
         data <= TARNRING_MOST_DATA_BYTES && std::has_single_bit(data);
}

}  // namespace

RingMemory::~RingMemory() {
  unmap();
}

void RingMemory::swap(RingMemory& other) noexcept {
  std::swap(mapping_, other.mapping_);
  std::swap(dataBytes_, other.dataBytes_);
  std::swap(identity_, other.identity_);
}

void RingMemory::unmap() noexcept {
  if (mapping_ != nullptr) {
    ::munmap(std::exchange(mapping_, nullptr), TARNRING_HEADER_BYTES + dataBytes_);
  }
}

std::optional<RingFault> RingMemory::map(int descriptor) {
  const int seals = ::fcntl(descriptor, F_GET_SEALS);
  if (seals < 0 || !isOrdinaryMemory(descriptor)) return RingFault::Descriptors;
  if (seals != kSeals) return RingFault::NotSealed;
  // From here on the size can't change any more.
  struct stat file {};
  if (::fstat(descriptor, &file) != 0) return RingFault::System;
  if (!isSize(file.st_size)) return RingFault::BadSize;
  void* const mapping = ::mmap(nullptr, static_cast<std::size_t>(file.st_size), PROT_READ | PROT_WRITE,
                               MAP_SHARED | MAP_POPULATE, descriptor, 0);
  if (mapping == MAP_FAILED) return RingFault::System;
  unmap();
  mapping_ = mapping;
  dataBytes_ = static_cast<std::uint32_t>(file.st_size) - TARNRING_HEADER_BYTES;
  identity_ = {file.st_dev, file.st_ino};
  using ring::SharedWords;
  const bool ours = SharedWords::load(&header()->magic) == TARNRING_MAGIC &&
                    SharedWords::load(&header()->version) == TARNRING_VERSION &&
                    SharedWords::load(&header()->data_bytes) == dataBytes_;
  return ours ? std::nullopt : std::optional(RingFault::BadHeader);
}

bool isEventDescriptor(int descriptor) {
  std::array<char, 64> target{};
  const std::string path = "/proc/self/fd/" + std::to_string(descriptor);
  const ssize_t length = ::readlink(path.c_str(), target.data(), target.size());
  return length > 0 && std::string_view(target.data(), static_cast<std::size_t>(length)) == "anon_inode:[eventfd]";
}

}  // namespace tarn::linux_host
