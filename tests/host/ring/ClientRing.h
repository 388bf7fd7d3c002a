// SPDX-License-Identifier: Apache-2.0
// ClientRing: a client's side of a ring, which can do everything wrong. Threads: one at a time.
#pragma once

#include <fcntl.h>
#include <sys/eventfd.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "clients/ring/RingProducer.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::testing {

class ClientRing {
 public:
  static constexpr int kSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL;

  explicit ClientRing(std::uint32_t dataBytes = 4096, int seals = kSeals, std::size_t fileBytes = 0)
      : dataBytes_(dataBytes),
        bytes_(fileBytes != 0 ? fileBytes : TARNRING_HEADER_BYTES + dataBytes),
        memory_(::memfd_create("ring", MFD_CLOEXEC | MFD_ALLOW_SEALING)),
        wake_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    if (::ftruncate(memory_.get(), static_cast<off_t>(bytes_)) == 0) {
      mapping_ = ::mmap(nullptr, bytes_, PROT_READ | PROT_WRITE, MAP_SHARED, memory_.get(), 0);
    }
    header()->magic = TARNRING_MAGIC;
    header()->version = TARNRING_VERSION;
    header()->data_bytes = dataBytes;
    ::fcntl(memory_.get(), F_ADD_SEALS, seals);
    producer = ring::RingProducer<>(header(), data(), dataBytes);
  }
  ClientRing(const ClientRing&) = delete;
  ClientRing& operator=(const ClientRing&) = delete;
  ~ClientRing() { ::munmap(mapping_, bytes_); }

  tarnring_header* header() const { return static_cast<tarnring_header*>(mapping_); }
  std::byte* data() const { return static_cast<std::byte*>(mapping_) + TARNRING_HEADER_BYTES; }
  std::uint32_t dataBytes() const { return dataBytes_; }
  int memory() const { return memory_.get(); }
  int wake() const { return wake_.get(); }

  // Both descriptors, as a connection would have received them.
  std::vector<linux_host::UniqueDescriptor> descriptors() const {
    std::vector<linux_host::UniqueDescriptor> both;
    both.emplace_back(::fcntl(memory_.get(), F_DUPFD_CLOEXEC, 0));
    both.emplace_back(::fcntl(wake_.get(), F_DUPFD_CLOEXEC, 0));
    return both;
  }

  bool post(tarnring_kind kind, std::string_view content) {
    return producer.post(kind, static_cast<std::uint32_t>(content.size()),
                         [&](auto& out) { out.put(content.data(), static_cast<std::uint32_t>(content.size())); });
  }
  // A message of a shape with these eight-byte values.
  bool message(std::uint32_t shape, const std::vector<std::uint64_t>& values, std::uint64_t stamp = 1) {
    return post(TARNRING_MESSAGE, contentOf(shape, values, stamp));
  }
  static std::string contentOf(std::uint32_t shape, const std::vector<std::uint64_t>& values, std::uint64_t stamp = 1) {
    const tarnring_message head{stamp, shape, static_cast<std::uint32_t>(values.size())};
    std::string content(reinterpret_cast<const char*>(&head), sizeof head);
    content.append(reinterpret_cast<const char*>(values.data()), values.size() * 8);
    return content;
  }
  // As the client's library wakes its reader.
  bool wakeIfAsleep() {
    const bool must = producer.mustWake();
    const std::uint64_t one = 1;
    return must && ::write(wake_.get(), &one, sizeof one) == sizeof one;
  }

  ring::RingProducer<> producer;

 private:
  std::uint32_t dataBytes_;
  std::size_t bytes_;
  linux_host::UniqueDescriptor memory_;
  linux_host::UniqueDescriptor wake_;
  void* mapping_ = nullptr;
};

}  // namespace tarn::testing
