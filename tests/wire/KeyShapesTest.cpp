// SPDX-License-Identifier: Apache-2.0
#include "wire/KeyShapes.h"

#include <gtest/gtest.h>

#include <random>
#include <vector>

#include "tests/support/Seeds.h"
#include "tests/wire/Bytes.h"
#include "wire/Encoder.h"

namespace tarn::wire {
namespace {

using testing::asBytes;
using testing::configurationFrame;
using testing::fromHex;
using Texts = std::vector<std::string>;

plist::KeyList listOf(const Texts& texts) {
  std::vector<plist::Key> keys(texts.begin(), texts.end());
  return plist::KeyList::make(keys).value();
}

std::string cborOf(const Texts& keys) {
  std::string bytes;
  for (const std::string& key : keys) {
    appendValue(bytes, std::string_view(key));
  }
  return bytes;
}

// The shape that a dictionary of so many entries, which begins with these keys, begins with.
const KeyShape* expected(KeyShapes& shapes, const Texts& begin, std::uint64_t count) {
  const std::string bytes = cborOf(begin);
  return shapes.next(CborReader(asBytes(bytes)), count, nullptr, 0);
}

bool expects(KeyShapes& shapes, const Texts& keys) {
  const KeyShape* const shape = expected(shapes, keys, keys.size());
  return shape != nullptr && shape->keys() == listOf(keys);
}

TEST(KeyShape, IsTheKeysAsTheyStandInAFrame) {
  KeyShape shape;
  const std::string longer(24, 'l');
  shape.set(listOf({"a", "", longer}));
  ASSERT_EQ(shape.size(), 3U);
  EXPECT_EQ(shape.key(0), fromHex("61 61"));
  EXPECT_EQ(shape.key(1), fromHex("60"));
  EXPECT_EQ(shape.key(2), fromHex("78 18") + longer);
  EXPECT_EQ(shape.firstKeys(0), "");
  EXPECT_EQ(shape.firstKeys(2), fromHex("61 61 60"));
  shape.set(listOf({"b"}));
  ASSERT_EQ(shape.size(), 1U);
  EXPECT_EQ(shape.firstKeys(1), fromHex("61 62"));
}

TEST(KeyShapes, ExpectNothingAtFirst) {
  KeyShapes shapes;
  EXPECT_EQ(expected(shapes, {"a"}, 1), nullptr);
}

TEST(KeyShapes, ExpectTheKeysThatCame) {
  KeyShapes shapes;
  shapes.remember(listOf({"a", "b"}));
  EXPECT_TRUE(expects(shapes, {"a", "b"}));
  EXPECT_EQ(expected(shapes, {"a"}, 1), nullptr);
  EXPECT_EQ(expected(shapes, {"a", "b", "c"}, 3), nullptr);
  EXPECT_EQ(expected(shapes, {"b", "a"}, 2), nullptr);
  EXPECT_EQ(expected(shapes, {"ab"}, 2), nullptr);
  EXPECT_EQ(expected(shapes, {}, 2), nullptr);
}

TEST(KeyShapes, LookAtTheLastOneFirst) {
  KeyShapes shapes;
  shapes.remember(listOf({"a", "b"}));
  shapes.remember(listOf({"a", "c"}));
  shapes.remember(listOf({"d"}));
  EXPECT_EQ(expected(shapes, {"a"}, 2)->keys(), listOf({"a", "b"}));
  shapes.remember(listOf({"a", "e"}));
  EXPECT_EQ(expected(shapes, {"a"}, 2)->keys(), listOf({"a", "e"}));
}

TEST(KeyShapes, GoOnWithAnotherOneThatBeginsLikewise) {
  KeyShapes shapes;
  shapes.remember(listOf({"x", "b", "c"}));
  shapes.remember(listOf({"a", "b", "d"}));
  shapes.remember(listOf({"a", "b", "c"}));
  const KeyShape* const first = expected(shapes, {"a"}, 3);
  ASSERT_EQ(first->keys(), listOf({"a", "b", "c"}));
  const auto after = [&](const Texts& keys) {
    const std::string bytes = cborOf(keys);
    return shapes.next(CborReader(asBytes(bytes)), 3, first, 2);
  };
  const KeyShape* const second = after({"d"});
  ASSERT_NE(second, nullptr);
  EXPECT_EQ(second->keys(), listOf({"a", "b", "d"}));
  EXPECT_EQ(expected(shapes, {"a"}, 3), second);  // that is the last one now
  EXPECT_EQ(after({"c"}), first);
  EXPECT_EQ(after({"e"}), nullptr);
}

TEST(KeyShapes, ForgetTheOldestWhenThereAreTooMany) {
  KeyShapes shapes;
  const auto keys = [](std::size_t number) { return Texts{"k" + std::to_string(number)}; };
  for (std::size_t i = 0; i < KeyShapes::kMostShapes; ++i) {
    shapes.remember(listOf(keys(i)));
    shapes.remember(listOf(keys(0)));  // is there already
  }
  EXPECT_TRUE(expects(shapes, keys(0)));
  for (std::size_t i = KeyShapes::kMostShapes; i < 3 * KeyShapes::kMostShapes; ++i) {
    shapes.remember(listOf(keys(i)));
    EXPECT_TRUE(expects(shapes, keys(i)));
    EXPECT_TRUE(expects(shapes, keys(i - KeyShapes::kMostShapes + 1)));
    EXPECT_FALSE(expects(shapes, keys(i - KeyShapes::kMostShapes)));
  }
}

TEST(KeyShapes, KeepNoEmptyList) {
  KeyShapes shapes;
  for (std::size_t i = 0; i < KeyShapes::kMostShapes; ++i) {
    shapes.remember(listOf({"k" + std::to_string(i)}));
  }
  shapes.remember({});
  EXPECT_TRUE(expects(shapes, {"k0"}));
}

TEST(KeyShapes, KeepNoLongList) {
  Texts keys;
  while (keys.size() < KeyShapes::kMostKeys) {
    keys.push_back("k" + std::to_string(keys.size()));
  }
  KeyShapes shapes;
  shapes.remember(listOf(keys));
  EXPECT_TRUE(expects(shapes, keys));
  keys.insert(keys.begin(), "one more");
  shapes.remember(listOf(keys));
  EXPECT_FALSE(expects(shapes, keys));
}

TEST(KeyShapes, KeepNoManyBytes) {
  KeyShapes shapes;
  Texts keys{"a", std::string(KeyShapes::kMostBytes - 1, 'b')};
  shapes.remember(listOf(keys));
  EXPECT_TRUE(expects(shapes, keys));
  keys[1] += 'b';
  shapes.remember(listOf(keys));
  EXPECT_FALSE(expects(shapes, keys));
}

// Whether a decoder makes of each frame what one that has seen no other makes of it.
class Twins {
 public:
  wire::DecodeVerdict check(const std::string& frame) {
    testing::Decoded remembering;
    remembering.verdict = decoder_.decode(asBytes(frame), remembering.request, remembering.refusal);
    const testing::Decoded fresh = testing::decodeBytes(frame);
    EXPECT_EQ(remembering.verdict, fresh.verdict);
    EXPECT_EQ(remembering.code(), fresh.code());
    EXPECT_EQ(remembering.refusal.text, fresh.refusal.text);
    EXPECT_EQ(remembering.request.id, fresh.request.id);
    if (fresh.ok()) {
      EXPECT_EQ(remembering.request.dictionary.keys(), fresh.request.dictionary.keys());
      EXPECT_EQ(encoded(remembering.request), encoded(fresh.request));
    }
    return fresh.verdict;
  }

 private:
  static std::string encoded(const DecodedRequest& request) {
    std::string bytes;
    Encoder(bytes).request(request.id, request);
    return bytes;
  }

  RequestDecoder decoder_;
};

// A dictionary of these keys, each with its place as value, and the second one's a dictionary in an array.
std::string mapOf(const Texts& keys) {
  std::string bytes(1, static_cast<char>(0xA0 + keys.size()));
  for (std::size_t i = 0; i < keys.size(); ++i) {
    bytes += cborOf({keys[i]}) + (i == 1 ? fromHex("81 a1 61 69 20") : std::string(1, static_cast<char>(i)));
  }
  return bytes;
}

std::string frameOf(const Texts& keys) {
  return configurationFrame(mapOf(keys));
}

const Texts kKeys{"id", "level", "rate", "gain"};

TEST(RememberedKeys, AnyOtherKeysAreReadAsEver) {
  const Texts others[] = {
      kKeys,
      {"id", "level", "rate", "gain", "more"},
      {"id", "level", "rate"},
      {},
      {"id"},
      {"level", "id", "rate", "gain"},
      {"gain", "rate", "level", "id"},
      {"id", "level", "rate", "gai"},
      {"id", "level", "rate", "gains"},
      {"i", "level", "rate", "gain"},
      {"", "level", "rate", "gain"},
      {"id", "level", "other", "gain"},
  };
  for (const Texts& first : others) {
    for (const Texts& second : others) {
      Twins twins;
      for (const Texts* keys : {&first, &second, &first, &second, &second}) {
        EXPECT_EQ(twins.check(frameOf(*keys)), DecodeVerdict::Ok);
      }
    }
  }
}

TEST(RememberedKeys, AKeyGivenTwiceIsRefused) {
  Twins twins;
  twins.check(frameOf(kKeys));
  for (const Texts& keys : {Texts{"id", "id", "rate", "gain"}, Texts{"id", "level", "rate", "id"},
                            Texts{"id", "level", "level", "gain"}, Texts{"id", "level", "rate", "gain", "gain"}}) {
    EXPECT_EQ(twins.check(frameOf(keys)), DecodeVerdict::Refused);
    EXPECT_EQ(twins.check(frameOf(kKeys)), DecodeVerdict::Ok);
  }
}

TEST(RememberedKeys, HeadsMayBeLongerThanNeeded) {
  Twins twins;
  const std::string map = fromHex("a2 62 6964 01 65 6c6576656c 02");
  for (const char* const longer :
       {"a2 7802 6964 01 65 6c6576656c 02", "a2 62 6964 01 790005 6c6576656c 02", "b802 62 6964 01 65 6c6576656c 02",
        "a2 7b0000000000000002 6964 01 65 6c6576656c 02"}) {
    EXPECT_EQ(twins.check(configurationFrame(map)), DecodeVerdict::Ok);
    EXPECT_EQ(twins.check(configurationFrame(fromHex(longer))), DecodeVerdict::Ok);
    EXPECT_EQ(twins.check(configurationFrame(fromHex(longer))), DecodeVerdict::Ok);
  }
}

TEST(RememberedKeys, AnOpenLengthIsRefused) {
  Twins twins;
  twins.check(frameOf({"a"}));
  EXPECT_EQ(twins.check(configurationFrame(fromHex("bf 6161 00 ff"))), DecodeVerdict::Refused);
}

// Every byte of a frame in turn becomes every other one, and every frame is cut at every byte: lengths, kinds, keys
// that are no UTF-8, keys that are none, values that are none.
TEST(RememberedKeys, DamageIsFoundWhereItWasFound) {
  Twins twins;
  const std::string good = frameOf(kKeys);
  for (std::size_t at = 0; at < good.size(); ++at) {
    twins.check(good.substr(0, at));
    for (int byte = 0; byte < 256; ++byte) {
      std::string bad = good;
      bad[at] = static_cast<char>(byte);
      twins.check(bad);
      ASSERT_EQ(twins.check(good), DecodeVerdict::Ok);
      ASSERT_FALSE(HasFailure()) << "byte " << at << " made " << byte;
    }
  }
}

// Few keys, so that lists share their beginnings, and more lists than are remembered.
TEST(RememberedKeys, ManyShapesAlternate) {
  for (const std::uint64_t seed : testing::testSeeds(5)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937_64 random(seed);
    Twins twins;
    int refused = 0;
    for (int i = 0; i < 5000; ++i) {
      Texts keys;
      for (std::size_t count = random() % 6; keys.size() < count;) {
        keys.push_back(std::string(1 + random() % 2, static_cast<char>('a' + random() % 3)));
      }
      refused += twins.check(frameOf(keys)) == DecodeVerdict::Refused ? 1 : 0;
    }
    EXPECT_GT(refused, 100);
    EXPECT_LT(refused, 4900);
  }
}

}  // namespace
}  // namespace tarn::wire
