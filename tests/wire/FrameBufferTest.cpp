// SPDX-License-Identifier: Apache-2.0
#include "wire/FrameBuffer.h"

#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "tests/support/HeapUse.h"
#include "tests/support/Seeds.h"
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
  EXPECT_EQ(buffer.announcedBytes(), std::size_t{1} << 30U);
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
    for (const std::string& frame : takeAll(buffer)) {
      frames.push_back(frame.size());
    }
  }
  EXPECT_EQ(frames, (std::vector<std::size_t>{kDefaultMaxFrameBytes, 4}));
  buffer.space();
  EXPECT_LT(heap.bytes(), kGulp + kSlack);
}

// A buffer whose memory is told in gulps. What it is fed must be made before it.
struct WatchedBuffer {
  const HeapGrowth heap{};
  FrameBuffer buffer;

  std::ptrdiff_t gulps() const { return (heap.bytes() + kGulp / 2) / kGulp; }
};

TEST(FrameBuffer, HoldsNoMemoryAndKnowsNoLengthBeforeBytesCome) {
  const HeapGrowth heap;
  FrameBuffer buffer;
  EXPECT_LT(heap.bytes(), kSlack);
  feed(buffer, testing::fromHex("020100"));
  EXPECT_EQ(buffer.announcedBytes(), 0U);
}

constexpr std::size_t kHalf = FrameBuffer::kGulpBytes / 2;

// Feeds a frame and so much of the next that `bytes` are received, and takes the first.
void feedAFrameAndAPart(FrameBuffer& buffer, std::size_t bytes) {
  const std::string stream = framed("first") + framed(std::string(bytes, 'x'));
  ASSERT_EQ(feed(buffer, std::string_view(stream).substr(0, bytes)), bytes);
  ASSERT_EQ(takeAll(buffer), std::vector<std::string>{"first"});
}

TEST(FrameBuffer, PendingBytesStayInPlaceWhileHalfAGulpIsFree) {
  for (const std::size_t bytes : {std::size_t{20}, kHalf}) {
    FrameBuffer buffer;
    feedAFrameAndAPart(buffer, bytes);
    EXPECT_EQ(buffer.space().size(), FrameBuffer::kGulpBytes - bytes);
  }
}

TEST(FrameBuffer, PendingBytesMoveToTheFrontWhenLessThanHalfAGulpIsFree) {
  FrameBuffer buffer;
  feedAFrameAndAPart(buffer, kHalf + 1);
  const std::size_t pending = buffer.pendingBytes();
  EXPECT_EQ(buffer.space().size(), FrameBuffer::kGulpBytes - pending);
  EXPECT_EQ(buffer.pendingBytes(), pending);
}

TEST(FrameBuffer, SpaceIsWholeAgainOnceEverythingIsTaken) {
  FrameBuffer buffer;
  feed(buffer, framed("whole"));
  takeAll(buffer);
  EXPECT_EQ(buffer.space().size(), FrameBuffer::kGulpBytes);
}

TEST(FrameBuffer, GrowsWhenMoreThanHalfAGulpIsPending) {
  const std::string stream = framed(std::string(100000, 'x'));
  for (const std::size_t bytes : {kHalf, kHalf + 1}) {
    WatchedBuffer watched;
    feed(watched.buffer, std::string_view(stream).substr(0, bytes));
    takeAll(watched.buffer);
    watched.buffer.space();
    EXPECT_EQ(watched.gulps(), bytes > kHalf ? 2 : 1);
  }
}

// Feeds the whole stream, dropping frames on the way; the gulps that were held when the last byte came.
std::ptrdiff_t feedAll(WatchedBuffer& watched, std::string_view stream) {
  std::ptrdiff_t gulps = 0;
  for (std::size_t at = 0; at < stream.size();) {
    at += feed(watched.buffer, stream.substr(at));
    gulps = watched.gulps();
    takeAll(watched.buffer);
  }
  return gulps;
}

TEST(FrameBuffer, TwiceTheMemoryIsKeptAndFourTimesIsGivenBack) {
  const std::string twice = framed(std::string(80000, 'x'));
  const std::string fourTimes = framed(std::string(200000, 'x'));
  WatchedBuffer watched;
  EXPECT_EQ(feedAll(watched, twice), 2);
  watched.buffer.space();
  EXPECT_EQ(watched.gulps(), 2);
  EXPECT_EQ(feedAll(watched, fourTimes), 4);
  watched.buffer.space();
  EXPECT_EQ(watched.gulps(), 1);
}

TEST(FrameBuffer, ASinglePendingByteSurvivesTheShrinking) {
  const std::string next = framed("next!");
  const std::string stream = framed(std::string(200000, 'x')) + next[0];
  WatchedBuffer watched;
  feedAll(watched, stream);
  ASSERT_EQ(watched.buffer.pendingBytes(), 1U);
  watched.buffer.space();
  ASSERT_EQ(watched.gulps(), 1);
  feed(watched.buffer, std::string_view(next).substr(1));
  EXPECT_EQ(takeAll(watched.buffer), std::vector<std::string>{"next!"});
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
      for (std::string& frame : takeAll(buffer)) {
        got.push_back(std::move(frame));
      }
    }
    EXPECT_TRUE(got == sent);
  }
}

}  // namespace
}  // namespace tarn::wire
