// SPDX-License-Identifier: Apache-2.0
// The two sides of a ring on real threads. Earns its keep under ThreadSanitizer.
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cstring>
#include <memory>
#include <thread>
#include <vector>

#include "clients/ring/RingConsumer.h"
#include "clients/ring/RingProducer.h"

namespace tarn::ring {
namespace {

constexpr std::uint32_t kDataBytes = TARNRING_LEAST_DATA_BYTES;
constexpr std::uint64_t kPosts = 100000;

struct Memory {
  alignas(64) tarnring_header header{};
  alignas(64) std::array<std::byte, kDataBytes> data{};
};

TEST(RingStress, EachMessageIsReadOrToldAsDropped) {
  const auto memory = std::make_unique<Memory>();
  std::atomic<bool> over{false};
  std::uint64_t posted = 0;
  std::uint64_t dropped = 0;
  std::thread writer([&] {
    RingProducer<> producer(&memory->header, memory->data.data(), kDataBytes);
    for (std::uint64_t number = 1; number <= kPosts; ++number) {
      const auto length = static_cast<std::uint32_t>(8 + number % 40 * 8);
      const bool fits = producer.post(TARNRING_MESSAGE, length, [&](RecordContent<SharedWords>& content) {
        for (std::uint32_t at = 0; at < length; at += 8) {
          content.put(number);
        }
      });
      ++(fits ? posted : dropped);
      if (!fits) {
        std::this_thread::yield();
      }
    }
    over = true;
  });
  RingConsumer<> consumer(&memory->header, memory->data.data(), kDataBytes, 1);
  std::vector<std::byte> buffer(consumer.mostContent());
  std::uint64_t last = 0;
  std::uint64_t read = 0;
  Record record;
  while (true) {
    const bool lastLook = over;
    const Look look = consumer.next(buffer.data(), record);
    ASSERT_NE(look, Look::Broken);
    if (look == Look::Empty) {
      if (lastLook) break;
      std::this_thread::yield();
      continue;
    }
    std::uint64_t first = 0;
    std::memcpy(&first, buffer.data(), sizeof first);
    if (record.kind == TARNRING_MESSAGE) {
      std::uint64_t end = 0;
      std::memcpy(&end, buffer.data() + record.length - 8, sizeof end);
      ASSERT_EQ(first, end);
      ASSERT_GT(first, last);
      last = first;
      ++read;
    }
    consumer.take(record);
  }
  writer.join();
  EXPECT_EQ(read, posted);
  EXPECT_EQ(posted + dropped, kPosts);
  EXPECT_EQ(consumer.takenMessages(), posted);
  EXPECT_EQ(consumer.dropped(), dropped);
}

}  // namespace
}  // namespace tarn::ring
