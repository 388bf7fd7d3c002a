// SPDX-License-Identifier: Apache-2.0
// What becomes of replies that a client reads late, in parts or never.
#include "host/socket/ReplyOutput.h"

#include <gtest/gtest.h>
#include <sys/socket.h>

#include <array>
#include <string>

#include "host/socket/Ledger.h"
#include "host/socket/NumbersReply.h"
#include "host/system/UniqueDescriptor.h"
#include "plist/Dictionary.h"
#include "tests/support/HeapUse.h"
#include "wire/ReplyDecoder.h"

namespace tarn::linux_host {
namespace {

using testing::HeapGrowth;

constexpr std::size_t kMegabyte = std::size_t{1} << 20;
constexpr std::size_t kPadding = 10'000;

class ReplyOutputTest : public ::testing::Test {
 protected:
  ReplyOutputTest() {
    std::array<int, 2> ends{};
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
    near_ = UniqueDescriptor(ends[0]);
    far_ = UniqueDescriptor(ends[1]);
  }
  // Replies with IDs from 1 on until so many bytes wait.
  std::uint64_t fill(std::size_t bytes) {
    const plist::Dictionary result{{"padding", std::string(kPadding, 'x')}};
    std::uint64_t id = 0;
    while (output_.unsentBytes() < bytes) {
      output_.append(++id, {result});
    }
    return id;
  }
  bool send(std::size_t most = ReplyOutput::kEverything) { return output_.sendSome(near_.get(), most); }
  // All that has come.
  std::string received() {
    std::string bytes;
    std::array<char, 65536> piece{};
    for (;;) {
      const ssize_t got = ::recv(far_.get(), piece.data(), piece.size(), MSG_DONTWAIT);
      if (got <= 0) return bytes;
      bytes.append(piece.data(), static_cast<std::size_t>(got));
    }
  }
  // Sends and receives until nothing waits.
  std::string everything() {
    std::string bytes;
    while (output_.unsentBytes() != 0 && send()) {
      bytes += received();
    }
    return bytes += received();
  }

  UniqueDescriptor near_;
  UniqueDescriptor far_;
  Ledger ledger_;
  ReplyOutput output_{ledger_};
};

// The IDs of the replies that these bytes are, one after the other.
std::vector<std::uint64_t> idsIn(const std::string& bytes) {
  std::vector<std::uint64_t> ids;
  wire::ReplyDecoder decoder;
  for (std::size_t at = 0; at + 4 <= bytes.size();) {
    std::size_t size = 0;
    for (std::size_t i = 4; i > 0; --i) {
      size = size << 8U | static_cast<unsigned char>(bytes[at + i - 1]);
    }
    wire::DecodedReply reply;
    if (decoder.decode(std::as_bytes(std::span(bytes)).subspan(at + 4, size), reply).failed()) break;
    ids.push_back(reply.id);
    at += 4 + size;
  }
  return ids;
}

TEST_F(ReplyOutputTest, RepliesOfMegabytesArriveInTheirOrderAndCountOnceAllAreSent) {
  const std::uint64_t last = fill(kMegabyte);
  ASSERT_TRUE(send());
  EXPECT_TRUE(output_.stalled());
  EXPECT_EQ(ledger_.repliesSent, 0U);
  const auto ids = idsIn(everything());
  ASSERT_EQ(ids.size(), last);
  for (std::uint64_t id = 1; id <= last; ++id) {
    EXPECT_EQ(ids[id - 1], id);
  }
  EXPECT_FALSE(output_.stalled());
  EXPECT_EQ(ledger_.repliesSent, last);
}

TEST_F(ReplyOutputTest, SendsNoMoreAtOnceThanItMay) {
  fill(100'000);
  const std::size_t all = output_.unsentBytes();
  for (const std::size_t most : {std::size_t{1}, std::size_t{40'000}}) {
    const std::size_t before = output_.unsentBytes();
    ASSERT_TRUE(send(most));
    EXPECT_EQ(output_.unsentBytes(), before - most);
    EXPECT_EQ(output_.takeSentBytes(), most);
    EXPECT_EQ(received().size(), most);
    EXPECT_FALSE(output_.stalled());
  }
  EXPECT_EQ(output_.takeSentBytes(), 0U);
  EXPECT_EQ(everything().size(), all - 40'001);
}

TEST_F(ReplyOutputTest, WhatNobodyReadsTakesHardlyMoreMemoryThanItsBytes) {
  const HeapGrowth heap;
  fill(4 * kMegabyte + 1);
  EXPECT_LT(heap.bytes(), static_cast<std::ptrdiff_t>(6 * kMegabyte));
}

TEST_F(ReplyOutputTest, WhatIsSentGivesItsMemoryBackBeforeTheRestIsSent) {
  fill(4 * kMegabyte);
  const HeapGrowth heap;
  while (output_.unsentBytes() > kMegabyte && send(kMegabyte)) {
    received();
  }
  EXPECT_LT(heap.bytes(), -static_cast<std::ptrdiff_t>(2 * kMegabyte));
}

TEST_F(ReplyOutputTest, NumbersAreOneFrameBetweenTheOthersWhateverTheyWereEncodedIn) {
  output_.append(1, {true});
  NumbersReply numbers(2, {1, -2, 300, 70'000, -5'000'000'000});
  while (!numbers.whole()) {
    numbers.encode(2);
  }
  output_.append(2, numbers);
  output_.append(3, {true});
  const std::string bytes = everything();
  EXPECT_EQ(idsIn(bytes), (std::vector<std::uint64_t>{1, 2, 3}));
  EXPECT_EQ(ledger_.repliesSent, 3U);
}

TEST_F(ReplyOutputTest, ManyNumbersAreNotCopiedIntoTheOutput) {
  NumbersReply numbers(1, std::vector<std::int64_t>(200'000, 1'000'000));
  while (!numbers.whole()) {
    numbers.encode(2048);
  }
  const HeapGrowth heap;
  output_.append(1, numbers);
  EXPECT_EQ(output_.unsentBytes(), 4U + 8U + 1'000'000U);
  EXPECT_LT(heap.bytes(), static_cast<std::ptrdiff_t>(kMegabyte / 4));
  EXPECT_EQ(idsIn(everything()), std::vector<std::uint64_t>{1});
}

TEST_F(ReplyOutputTest, DroppedRepliesAreCountedAndTheirMemoryIsGivenBack) {
  const HeapGrowth heap;
  const std::uint64_t last = fill(kMegabyte);
  output_.drop();
  EXPECT_EQ(ledger_.repliesDropped, last);
  EXPECT_EQ(output_.unsentBytes(), 0U);
  EXPECT_LT(heap.bytes(), static_cast<std::ptrdiff_t>(kMegabyte / 4));
  output_.append(9, {true});
  EXPECT_EQ(idsIn(everything()), std::vector<std::uint64_t>{9});
}

TEST_F(ReplyOutputTest, APeerThatIsGoneBreaksIt) {
  fill(1000);
  far_.reset();
  EXPECT_FALSE(send());
  EXPECT_TRUE(output_.broken());
  EXPECT_EQ(output_.unsentBytes(), 0U);
  EXPECT_EQ(ledger_.repliesDropped, 1U);
}

}  // namespace
}  // namespace tarn::linux_host
