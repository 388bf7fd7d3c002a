// SPDX-License-Identifier: Apache-2.0
#include "clients/c/src/Writer.h"

#include <fcntl.h>
#include <sys/eventfd.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <new>

#include "clients/c/src/Utf8.h"

namespace tarn::reporting {

namespace {

using ring::RecordContent;
using ring::SharedWords;

constexpr std::uint64_t kNanosecondsPerSecond = 1000000000;
constexpr std::size_t kHotBytes = 4096;
static_assert(sizeof(Hot) <= kHotBytes);

std::uint64_t now() noexcept {
  timespec time{};
  ::clock_gettime(CLOCK_REALTIME, &time);
  return static_cast<std::uint64_t>(time.tv_sec) * kNanosecondsPerSecond + static_cast<std::uint64_t>(time.tv_nsec);
}

// The length of the message's content; a result other than OK when the values don't fit the shape.
int measure(const tarnreporting_shape& shape, const tarnreporting_value* values, std::size_t count,
            std::uint32_t& length) noexcept {
  if (count != shape.count) return TARNREPORTING_KIND;
  length = sizeof(tarnring_message);
  for (std::size_t i = 0; i < count; ++i) {
    const tarnreporting_value& value = values[i];
    if (value.kind != shape.kinds[i]) return TARNREPORTING_KIND;
    length += 8;
    if (value.kind != TARNREPORTING_TEXT_VALUE || value.length == 0) continue;
    if (value.length > TARNREPORTING_MOST_TEXT_BYTES) return TARNREPORTING_TOO_LARGE;
    if (value.as.text == nullptr) return TARNREPORTING_ARGUMENT;
    if (!isUtf8(value.as.text, value.length)) return TARNREPORTING_TEXT;
    length += tarnring_padded(value.length);
  }
  return TARNREPORTING_OK;
}

void pack(RecordContent<SharedWords>& content, const tarnreporting_value& value) noexcept {
  switch (value.kind) {
    case TARNREPORTING_TEXT_VALUE:
      content.put(std::uint64_t{value.length});
      content.put(value.as.text, value.length);
      break;
    case TARNREPORTING_BOOLEAN:
      content.put(std::uint64_t{value.as.boolean != 0 ? 1U : 0U});
      break;
    default:
      content.put(value.as.unsigned_integer);  // the bits, whatever they stand for
      break;
  }
}

int postInside(tarnreporting_writer& writer, const tarnreporting_shape& shape, const std::uint64_t* stamp,
               const tarnreporting_value* values, std::size_t count) noexcept {
  Hot& hot = *writer.hot;
  if (__atomic_load_n(&hot.closed, __ATOMIC_SEQ_CST) != 0) return TARNREPORTING_CLOSED;
  std::uint32_t length = 0;
  if (const int result = measure(shape, values, count, length); result != TARNREPORTING_OK) return result;
  if (length > hot.producer.mostContent()) return TARNREPORTING_TOO_LARGE;
  const std::uint64_t moment = stamp != nullptr ? *stamp : now();
  const bool fits = hot.producer.post(TARNRING_MESSAGE, length, [&](RecordContent<SharedWords>& content) {
    content.put(moment);
    content.put(std::uint64_t{shape.count} << 32U | shape.number);
    for (std::size_t i = 0; i < count; ++i) {
      pack(content, values[i]);
    }
  });
  if (!fits) return TARNREPORTING_DROPPED;
  if (writer.mayWake && hot.producer.mustWake()) {
    wakeReader(writer);
  }
  return TARNREPORTING_OK;
}

void* mapped(std::size_t bytes, int flags, int descriptor) noexcept {
  void* const memory = ::mmap(nullptr, bytes, PROT_READ | PROT_WRITE, flags | MAP_POPULATE, descriptor, 0);
  return memory == MAP_FAILED ? nullptr : memory;
}

// A sealed memory file of so many bytes, as the service wants it.
int makeMemoryFile(std::size_t bytes) noexcept {
  const int file = ::memfd_create("tarnreporting", MFD_CLOEXEC | MFD_ALLOW_SEALING);
  if (file >= 0 && (::ftruncate(file, static_cast<off_t>(bytes)) != 0 ||
                    ::fcntl(file, F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL) != 0)) {
    ::close(file);
    return -1;
  }
  return file;
}

}  // namespace

int makeRing(tarnreporting_writer& writer, std::uint32_t dataBytes) noexcept {
  const std::size_t bytes = TARNRING_HEADER_BYTES + std::size_t{dataBytes};
  writer.dataBytes = dataBytes;
  writer.memoryDescriptor = makeMemoryFile(bytes);
  writer.wakeDescriptor = ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
  if (writer.memoryDescriptor >= 0 && writer.wakeDescriptor >= 0) {
    writer.header = static_cast<tarnring_header*>(mapped(bytes, MAP_SHARED, writer.memoryDescriptor));
    writer.hot = static_cast<Hot*>(mapped(kHotBytes, MAP_PRIVATE | MAP_ANONYMOUS, -1));
  }
  if (writer.header == nullptr || writer.hot == nullptr || ::madvise(writer.header, bytes, MADV_DONTFORK) != 0 ||
      ::madvise(writer.hot, kHotBytes, MADV_DONTFORK) != 0) {
    freeRing(writer);
    return TARNREPORTING_SYSTEM;
  }
  // Each page is written to once, so that posting meets none for the first time.
  std::memset(static_cast<void*>(writer.header), 0, bytes);
  writer.locked = ::mlock(writer.header, bytes) == 0 && ::mlock(writer.hot, kHotBytes) == 0;
  writer.header->magic = TARNRING_MAGIC;
  writer.header->version = TARNRING_VERSION;
  writer.header->data_bytes = dataBytes;
  ::new (static_cast<void*>(writer.hot)) Hot;
  auto* const data = reinterpret_cast<std::byte*>(writer.header) + TARNRING_HEADER_BYTES;
  writer.hot->producer = ring::RingProducer<>(writer.header, data, dataBytes);
  now();  // so does its page
  return TARNREPORTING_OK;
}

void freeRing(tarnreporting_writer& writer) noexcept {
  if (writer.header != nullptr) {
    ::munmap(writer.header, TARNRING_HEADER_BYTES + std::size_t{writer.dataBytes});
  }
  if (writer.hot != nullptr) {
    ::munmap(writer.hot, kHotBytes);
  }
  writer.header = nullptr;
  writer.hot = nullptr;
  closeDescriptors(writer);
}

void closeDescriptors(tarnreporting_writer& writer) noexcept {
  if (writer.memoryDescriptor >= 0) {
    ::close(writer.memoryDescriptor);
  }
  if (writer.wakeDescriptor >= 0) {
    ::close(writer.wakeDescriptor);
  }
  writer.memoryDescriptor = writer.wakeDescriptor = -1;
}

void shut(tarnreporting_writer& writer) noexcept {
  __atomic_store_n(&writer.hot->closed, 1U, __ATOMIC_SEQ_CST);
}

bool isInside(const tarnreporting_writer& writer) noexcept {
  return __atomic_load_n(&writer.hot->inside, __ATOMIC_SEQ_CST) != 0;
}

void wakeReader(tarnreporting_writer& writer) noexcept {
  const int before = errno;
  const std::uint64_t one = 1;
  // It fails only when the counter is full, and then the reader is long awake.
  [[maybe_unused]] const ssize_t written = ::write(writer.wakeDescriptor, &one, sizeof one);
  errno = before;
}

int post(tarnreporting_writer& writer, const tarnreporting_shape& shape, const std::uint64_t* stamp,
         const tarnreporting_value* values, std::size_t count) noexcept {
  if (__atomic_load_n(writer.alive, __ATOMIC_RELAXED) == 0) return TARNREPORTING_FORKED;
  if (shape.client != writer.client) return TARNREPORTING_ARGUMENT;
  if (__atomic_exchange_n(&writer.hot->inside, 1U, __ATOMIC_SEQ_CST) != 0) return TARNREPORTING_BUSY;
  const int result = postInside(writer, shape, stamp, values, count);
  __atomic_store_n(&writer.hot->inside, 0U, __ATOMIC_RELEASE);
  return result;
}

}  // namespace tarn::reporting
