// SPDX-License-Identifier: Apache-2.0
// The two sides of a ring under every order of their steps that a random schedule finds, the writer's death included.
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <memory>
#include <optional>
#include <vector>

#include "clients/ring/RingConsumer.h"
#include "clients/ring/RingProducer.h"
#include "tests/clients/SteppedWords.h"
#include "tests/support/Seeds.h"

namespace tarn::ring {
namespace {

constexpr std::uint32_t kDataBytes = TARNRING_LEAST_DATA_BYTES;
constexpr std::uint64_t kPosts = 60;

struct Memory {
  alignas(64) tarnring_header header{};
  alignas(64) std::array<std::byte, kDataBytes> data{};
};

// The content of a message: its number in each word, of a length that goes by the number.
std::uint32_t lengthOf(std::uint64_t number) {
  return static_cast<std::uint32_t>(8 + number * 131 % 1000 / 8 * 8);
}

struct Played {
  std::vector<std::uint64_t> posted;
  std::vector<std::uint64_t> dropped;
  std::vector<std::uint64_t> read;
  std::uint64_t toldAsDropped = 0;  // by gaps
  bool torn = false;
  bool broken = false;
  bool wakeLost = false;
};

class Play {
 public:
  explicit Play(std::uint64_t seed)
      : schedule_(seed), slowness_(schedule_.random(60)), memory_(std::make_unique<Memory>()) {}

  Played run(std::uint64_t crashStep) {
    schedule_.run([this] { write(); }, [this] { read(); }, crashStep);
    return std::move(played_);
  }

 private:
  void write() {
    RingProducer<SteppedWords> producer(&memory_->header, memory_->data.data(), kDataBytes);
    for (std::uint64_t number = 1; number <= kPosts; ++number) {
      const std::vector<std::uint64_t> words(lengthOf(number) / 8, number);
      posting_ = true;
      const bool fits = producer.post(TARNRING_MESSAGE, lengthOf(number), [&](RecordContent<SteppedWords>& content) {
        content.put(words.data(), lengthOf(number) / 2 / 8 * 8);
        content.put(words.data(), lengthOf(number) - lengthOf(number) / 2 / 8 * 8);
      });
      if (schedule_.firstIsOver()) return;  // died meanwhile
      (fits ? played_.posted : played_.dropped).push_back(number);
      if (fits && producer.mustWake()) {
        wake_ = true;
      }
      posting_ = false;
      schedule_.step();
      if (schedule_.firstIsOver()) return;
    }
  }

  void read() {
    RingConsumer<SteppedWords> consumer(&memory_->header, memory_->data.data(), kDataBytes, 1);
    while (true) {
      const bool over = schedule_.firstIsOver();
      const bool any = readSome(consumer);
      for (std::uint64_t rest = slowness_; rest > 0 && !over; --rest) {
        schedule_.step();
      }
      if (played_.broken || (over && !any)) return;
      if (!any && schedule_.random(2) == 0 && consumer.prepareToSleep()) {
        sleep(consumer);
      }
    }
  }

  bool readSome(RingConsumer<SteppedWords>& consumer) {
    Record record;
    bool any = false;
    for (std::uint64_t left = schedule_.random(8) + 1; left > 0; --left) {
      const Look look = consumer.next(buffer_.data(), record);
      played_.broken = look == Look::Broken;
      if (look != Look::Record) break;
      any = true;
      take(record);
      consumer.take(record);
    }
    return any;
  }

  void take(const Record& record) {
    std::vector<std::uint64_t> words(record.length / 8);
    std::memcpy(words.data(), buffer_.data(), record.length);
    if (record.kind == TARNRING_GAP) {
      played_.toldAsDropped += words[0];
      return;
    }
    played_.read.push_back(words[0]);
    for (const std::uint64_t word : words) {
      played_.torn |= word != words[0];
    }
    played_.torn |= record.length != lengthOf(words[0]);
  }

  void sleep(RingConsumer<SteppedWords>& consumer) {
    while (!wake_ && !schedule_.firstIsOver()) {
      // The writer has published and asked whether it must wake, so everything it stored is seen: we were forgotten.
      played_.wakeLost |= !posting_ && memory_->header.head != consumer.taken();
      schedule_.step();
    }
    wake_ = false;
    consumer.awake();
  }

  Schedule schedule_;
  const std::uint64_t slowness_;  // of the reader: a slow one meets a full ring
  std::unique_ptr<Memory> memory_;
  std::array<std::byte, kDataBytes> buffer_{};
  bool wake_ = false;
  bool posting_ = false;  // between the begin of a post and the answer whether to wake
  Played played_;
};

TEST(RingModel, WhatIsPostedIsReadOnceWholeAndInOrder) {
  for (const std::uint64_t seed : testing::testSeeds(4711)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937_64 random(seed);
    std::size_t drops = 0;
    for (int round = 0; round < 60; ++round) {
      const Played played = Play(random()).run(0);
      ASSERT_FALSE(played.broken || played.torn || played.wakeLost)
          << "round " << round << " broken " << played.broken << " torn " << played.torn << " woken "
          << !played.wakeLost;
      ASSERT_EQ(played.read, played.posted) << "round " << round;
      const std::uint64_t untold = !played.dropped.empty() && played.dropped.back() == kPosts ? 1 : 0;
      ASSERT_LE(played.toldAsDropped, played.dropped.size());
      ASSERT_TRUE(untold != 0 || played.toldAsDropped == played.dropped.size()) << "round " << round;
      drops += played.dropped.size();
    }
    EXPECT_GT(drops, 0U);  // else nothing was ever tried with a full ring
  }
}

TEST(RingModel, AWriterThatDiesLeavesAllThatItPublishedAndNothingTorn) {
  for (const std::uint64_t seed : testing::testSeeds(4712)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937_64 random(seed);
    for (int round = 0; round < 120; ++round) {
      const Played played = Play(random()).run(1 + random() % 1500);
      ASSERT_FALSE(played.broken || played.torn) << "round " << round;
      // Those that it knew as posted may be on their way still; the one in its hands may be out already.
      ASSERT_LE(played.read.size(), played.posted.size() + 1) << "round " << round;
      for (std::size_t i = 0; i < played.read.size() && i < played.posted.size(); ++i) {
        ASSERT_EQ(played.read[i], played.posted[i]) << "round " << round;
      }
    }
  }
}

}  // namespace
}  // namespace tarn::ring
