#include "tests/support/Seeds.h"
#include "wire/FrameBuffer.h"

#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "tests/support/HeapUse.h"
#include "tests/wire/Bytes.h"

namespace tarn::wire {
namespace {

using testing::HeapGrowth;

constexpr std::ptrdiff_t kGulp = FrameBuffer::kGulpBytes;
constexpr std::ptrdiff_t kSlack = 16384;  // of the test's own small texts

std::string framed(std::string_view payload) {
  std::string bytes;
  for (unsigned i = 0; i < 4; ++i) {
    bytes += static_cast<char>(payload.size() >> (8 * i) & 0xFFU);
  }
  return bytes += payload;
}

// Hands over as much as the buffer has space for, and says how much that was.
std::size_t feed(FrameBuffer& buffer, std::string_view bytes) {
  const std::span<std::byte> space = buffer.space();
  const std::size_t count = std::min(space.size(), bytes.size());
  std::memcpy(space.data(), bytes.data(), count);
  buffer.received(count);
  return count;
}

std::string text(std::span<const std::byte> frame) {
  return {reinterpret_cast<const char*>(frame.data()), frame.size()};
}

std::vector<std::string> takeAll(FrameBuffer& buffer) {
  std::vector<std::string> frames;
  std::span<const std::byte> frame;
  while (buffer.next(frame) == FrameBuffer::Next::Frame) {
    frames.push_back(text(frame));
  }
  return frames;
}

TEST(FrameBuffer, HandsOutEachFrameOfOneRead) {
  FrameBuffer buffer;
  feed(buffer, framed("one") + framed("") + framed("three"));
  EXPECT_EQ(takeAll(buffer), (std::vector<std::string>{"one", "", "three"}));
  EXPECT_EQ(buffer.pendingBytes(), 0U);
}

TEST(FrameBuffer, JoinsAFrameThatComesByteByByte) {
  FrameBuffer buffer;
  const std::string bytes = framed("slowly");
  std::span<const std::byte> frame;
  for (std::size_t i = 0; i + 1 < bytes.size(); ++i) {
    feed(buffer, bytes.substr(i, 1));
    ASSERT_EQ(buffer.next(frame), FrameBuffer::Next::Incomplete);
  }
  feed(buffer, bytes.substr(bytes.size() - 1));
  ASSERT_EQ(buffer.next(frame), FrameBuffer::Next::Frame);
  EXPECT_EQ(text(frame), "slowly");
}

TEST(FrameBuffer, TheLengthIsLittleEndian) {
  FrameBuffer buffer;
  feed(buffer, testing::fromHex("02010000"));
  std::span<const std::byte> frame;
  EXPECT_EQ(buffer.next(frame), FrameBuffer::Next::Incomplete);
  EXPECT_EQ(buffer.announcedBytes(), 258U);
}

TEST(FrameBuffer, AFrameOfTheLimitPasses) {
  FrameBuffer buffer(100);
  feed(buffer, framed(std::string(100, 'x')));
  EXPECT_EQ(takeAll(buffer), std::vector<std::string>{std::string(100, 'x')});
}

TEST(FrameBuffer, AFrameOneOverTheLimitIsOversizeAsSoonAsItIsAnnounced) {
  FrameBuffer buffer(100);
  feed(buffer, framed(std::string(101, 'x')).substr(0, 4));
  std::span<const std::byte> frame;
  EXPECT_EQ(buffer.next(frame), FrameBuffer::Next::Oversize);
  EXPECT_EQ(buffer.announcedBytes(), 101U);
}

TEST(FrameBuffer, FramesBeforeAnOversizeOneAreHandedOut) {
  FrameBuffer buffer(10);
  feed(buffer, framed("good") + framed(std::string(11, 'x')));
  std::span<const std::byte> frame;
  ASSERT_EQ(buffer.next(frame), FrameBuffer::Next::Frame);
  EXPECT_EQ(text(frame), "good");
  EXPECT_EQ(buffer.next(frame), FrameBuffer::Next::Oversize);
}

TEST(FrameBuffer, AnAnnouncedFrameThatNeverComesCostsNoMemory) {
  const HeapGrowth heap;
  FrameBuffer buffer(std::size_t{1} << 30U);
  feed(buffer, testing::fromHex("00000040"));
  std::span<const std::byte> frame;
  ASSERT_EQ(buffer.next(frame), FrameBuffer::Next::Incomplete);
  EXPECT_FALSE(buffer.space().empty());
  EXPECT_LT(heap.bytes(), kGulp + kSlack);
}

TEST(FrameBuffer, MemoryStaysWithinTheLargestFrameAndAGulpAndShrinksBack) {
  const std::string bytes = framed(std::string(kDefaultMaxFrameBytes, 'x')) + framed("next");
  const HeapGrowth heap;
  FrameBuffer buffer(kDefaultMaxFrameBytes);
  std::size_t sent = 0;
  std::vector<std::size_t> frames;
  while (sent < bytes.size()) {
    const std::size_t count = feed(buffer, std::string_view(bytes).substr(sent));
    ASSERT_GT(count, 0U);
    sent += count;
    ASSERT_LT(heap.bytes(), static_cast<std::ptrdiff_t>(2 * sent) + 2 * kGulp + kSlack);
    ASSERT_LT(heap.bytes(), static_cast<std::ptrdiff_t>(kDefaultMaxFrameBytes) + kGulp + kSlack);
    for (const std::string& frame : takeAll(buffer)) frames.push_back(frame.size());
  }
  EXPECT_EQ(frames, (std::vector<std::size_t>{kDefaultMaxFrameBytes, 4}));
  buffer.space();
  EXPECT_LT(heap.bytes(), kGulp + kSlack);
}

TEST(FrameBuffer, ReleaseGivesMemoryBackOnlyWhenNothingIsPending) {
  const HeapGrowth heap;
  FrameBuffer buffer;
  feed(buffer, framed("whole") + "\x05");
  takeAll(buffer);
  buffer.release();
  EXPECT_GE(heap.bytes(), kGulp);
  feed(buffer, std::string("\0\0\0again", 8));
  EXPECT_EQ(takeAll(buffer), std::vector<std::string>{"again"});
  buffer.release();
  EXPECT_LT(heap.bytes(), kSlack);
  feed(buffer, framed("anew"));
  EXPECT_EQ(takeAll(buffer), std::vector<std::string>{"anew"});
}

TEST(FrameBuffer, RandomPiecesYieldTheFramesThatWereSent) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937 random(seed);
    FrameBuffer buffer(300000);
    std::vector<std::string> sent;
    std::string stream;
    for (int i = 0; i < 200; ++i) {
      const std::size_t size = i % 20 == 0 ? random() % 300000 : random() % 400;
      sent.emplace_back(size, static_cast<char>('a' + i % 26));
      stream += framed(sent.back());
    }
    std::vector<std::string> got;
    for (std::size_t at = 0; at < stream.size();) {
      at += feed(buffer, std::string_view(stream).substr(at, 1 + random() % 100000));
      for (std::string& frame : takeAll(buffer)) got.push_back(std::move(frame));
    }
    EXPECT_TRUE(got == sent);
  }
}

}  // namespace
}  // namespace tarn::wire
