// SPDX-License-Identifier: Apache-2.0
// Random values against an independent peer, and random damage.
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <random>

#include "plist/Value.h"
#include "tests/support/Seeds.h"
#include "tests/wire/Bytes.h"
#include "wire/Encoder.h"
#include "wire/WellFormed.h"

namespace tarn::wire {
namespace {

using nlohmann::json;
using testing::asBytes;

class Maker {
 public:
  explicit Maker(std::uint64_t seed) : random_(seed) {}

  std::size_t below(std::size_t limit) { return random_() % limit; }

  plist::Value value(std::size_t depth) {
    switch (below(depth < 4 ? 10 : 7)) {
      case 0:
        return below(2) == 0;
      case 1:
        return static_cast<std::int64_t>(random_()) >> below(64);
      case 2:
        return static_cast<std::uint64_t>(random_()) >> below(64);
      case 3:
        return static_cast<float>(below(100000)) / 7.0F;
      case 4:
        return static_cast<double>(below(100000)) / 7.0;
      case 5:
        return text();
      case 6:
        return plist::DataView{data_ = text()};
      case 7:
      case 8:
        return dictionary(depth + 1);
      default:
        return array(depth + 1);
    }
  }

  plist::Dictionary dictionary(std::size_t depth) {
    plist::Dictionary made;
    for (std::size_t i = below(8); i > 0; --i) {
      made.set(plist::Key(text()), value(depth));
    }
    return made;
  }

  plist::Array array(std::size_t depth) {
    plist::Array made;
    for (std::size_t i = below(8); i > 0; --i) {
      made.append(value(depth));
    }
    return made;
  }

 private:
  std::string text() {
    constexpr std::string_view kPieces[] = {"a", "volume", " ", "\xC3\xA4", "\xE6\xB0\xB4", "\xF0\x9F\x8E\xA7", "0"};
    std::string made;
    for (std::size_t i = below(12); i > 0; --i) {
      made += kPieces[below(std::size(kPieces))];
    }
    return made;
  }

  std::mt19937_64 random_;
  std::string data_;
};

json toPeer(const plist::ValueView& value) {
  switch (value.kind()) {
    case plist::Kind::Bool:
      return value.boolValue();
    case plist::Kind::Signed:
      return value.signedValue();
    case plist::Kind::Unsigned:
      return value.unsignedValue();
    case plist::Kind::Float:
      return static_cast<double>(value.floatValue());
    case plist::Kind::Double:
      return value.doubleValue();
    case plist::Kind::Text:
      return std::string(value.text());
    case plist::Kind::Data:
      return json::binary({value.data().begin(), value.data().end()});
    case plist::Kind::Array: {
      json made = json::array();
      for (const plist::ValueView item : value.array()) {
        made.push_back(toPeer(item));
      }
      return made;
    }
    case plist::Kind::Dictionary: {
      json made = json::object();
      for (const plist::Dictionary::Entry entry : value.dictionary()) {
        made[std::string(entry.key.text())] = toPeer(entry.value);
      }
      return made;
    }
    default:
      return nullptr;
  }
}

TEST(RoundTrip, APeerReadsWhatIsEncoded) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    Maker maker(seed);
    for (int i = 0; i < 2000; ++i) {
      const plist::Dictionary dictionary = maker.dictionary(1);
      std::string bytes;
      appendValue(bytes, dictionary);
      EXPECT_EQ(json::from_cbor(bytes), toPeer(dictionary));
    }
  }
}

TEST(RoundTrip, WhatAPeerEncodesIsRead) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(2)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    Maker maker(seed);
    for (int i = 0; i < 2000; ++i) {
      const plist::Dictionary dictionary = maker.dictionary(1);
      std::vector<std::uint8_t> bytes = json::to_cbor(toPeer(dictionary));
      const testing::Decoded decoded = testing::decodeBytes(
          testing::configurationFrame(std::string_view(reinterpret_cast<const char*>(bytes.data()), bytes.size())));
      ASSERT_TRUE(decoded.ok()) << decoded.refusal.text;
      EXPECT_EQ(decoded.request.dictionary, dictionary);
    }
  }
}

TEST(RoundTrip, DecodingAndEncodingAgainYieldsTheSameBytes) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(3)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    Maker maker(seed);
    for (int i = 0; i < 2000; ++i) {
      Request request;
      request.operation = Operation::SendMessage;
      request.dictionary = maker.dictionary(1);
      std::string bytes;
      Encoder(bytes).request(maker.below(1000000), request);
      const testing::Decoded decoded = testing::decodeBytes(std::string_view(bytes).substr(kFrameHeaderBytes));
      ASSERT_TRUE(decoded.ok()) << decoded.refusal.text;
      std::string again;
      Encoder(again).request(decoded.request.id, decoded.request);
      EXPECT_EQ(again, bytes);
    }
  }
}

// Damaged frames are accepted, refused or unreadable as the independent check of well-formedness says, and never more.
TEST(RoundTrip, DamagedFramesGetAnOutcomeThatFitsTheirBytes) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(4)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    Maker maker(seed);
    int outcomes[3] = {};
    for (int i = 0; i < 20000; ++i) {
      Request request;
      request.operation = Operation::SendMessage;
      request.dictionary = maker.dictionary(2);
      request.reporterIDs = std::vector<std::int64_t>{1, 2};
      std::string bytes;
      Encoder(bytes).request(5, request);
      bytes.erase(0, kFrameHeaderBytes);
      for (std::size_t changes = 1 + maker.below(4); changes > 0; --changes) {
        bytes[maker.below(bytes.size())] = static_cast<char>(maker.below(256));
      }
      const testing::Decoded decoded = testing::decodeBytes(bytes);
      ++outcomes[static_cast<std::size_t>(decoded.verdict)];
      const bool wellFormed = checkOneItem(asBytes(bytes)) == nullptr;
      if (!decoded.unreadable()) {
        EXPECT_TRUE(wellFormed) << testing::toHex(bytes);
      } else if (wellFormed) {
        EXPECT_TRUE(decoded.refusal.text == "no readable id" || decoded.refusal.text == "not a CBOR array")
            << decoded.refusal.text << " " << testing::toHex(bytes);
      }
    }
    EXPECT_GT(outcomes[0], 0);
    EXPECT_GT(outcomes[1], 0);
    EXPECT_GT(outcomes[2], 0);
  }
}

}  // namespace
}  // namespace tarn::wire
