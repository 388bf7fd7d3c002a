// SPDX-License-Identifier: Apache-2.0
#include "host/ring/ReceivedDescriptors.h"

#include <sys/socket.h>

#include <array>
#include <cstring>

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMost = 2;

void take(const cmsghdr& header, std::vector<UniqueDescriptor>& descriptors) {
  std::array<int, kMost> numbers{};
  const std::size_t count = (header.cmsg_len - CMSG_LEN(0)) / sizeof(int);
  std::memcpy(numbers.data(), CMSG_DATA(&header), count * sizeof(int));
  descriptors.clear();
  for (std::size_t i = 0; i < count; ++i) {
    descriptors.emplace_back(numbers[i]);
  }
}

}  // namespace

ssize_t receiveWithDescriptors(int socket, std::span<std::byte> space, std::vector<UniqueDescriptor>& descriptors) {
  // Room for no more than are kept: the system closes the others.
  alignas(cmsghdr) std::array<char, CMSG_SPACE(kMost * sizeof(int))> control;
  iovec part{space.data(), space.size()};
  msghdr message{};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  const ssize_t bytes = ::recvmsg(socket, &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
  if (bytes < 0 || message.msg_controllen == 0) [[likely]] {
    return bytes;
  }
  for (cmsghdr* header = CMSG_FIRSTHDR(&message); header != nullptr; header = CMSG_NXTHDR(&message, header)) {
    if (header->cmsg_level == SOL_SOCKET && header->cmsg_type == SCM_RIGHTS) {
      take(*header, descriptors);
    }
  }
  if ((message.msg_flags & MSG_CTRUNC) != 0) {
    descriptors.clear();
  }
  return bytes;
}

}  // namespace tarn::linux_host
