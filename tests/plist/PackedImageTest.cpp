// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "plist/PackedImage.h"
#include "plist/Value.h"
#include "tests/support/Seeds.h"

namespace tarn::plist {
namespace {

std::string imageOf(const std::vector<Dictionary>& dictionaries) {
  std::string image;
  PackedImageWriter writer(image);
  for (const Dictionary& dictionary : dictionaries) {
    writer.write(dictionary);
  }
  return image;
}

std::vector<Dictionary> readBack(const std::string& image, std::size_t count) {
  PackedImageReader reader(image);
  std::vector<Dictionary> dictionaries(count);
  for (Dictionary& dictionary : dictionaries) {
    EXPECT_TRUE(reader.read(dictionary));
  }
  EXPECT_TRUE(reader.atEnd());
  return dictionaries;
}

// Everything that can be seen of a value: its kind, the bits of a number, the order of keys.
void describe(std::string& text, const ValueView& value) {
  text += std::to_string(static_cast<int>(value.kind())) + ":";
  switch (value.kind()) {
    case Kind::Float:
      text += std::to_string(std::bit_cast<std::uint32_t>(value.floatValue()));
      break;
    case Kind::Double:
    case Kind::Date:
      text += std::to_string(std::bit_cast<std::uint64_t>(value.doubleValue()));
      break;
    case Kind::Array:
      for (const ValueView& item : value.array()) {
        text += "[";
        describe(text, item);
        text += "]";
      }
      break;
    case Kind::Dictionary:
      for (const Dictionary::Entry& entry : value.dictionary()) {
        text += "{" + std::string(entry.key.text()) + "=";
        describe(text, entry.value);
        text += "}";
      }
      break;
    case Kind::Data:
      text += value.data();
      break;
    default:
      text += value.asText();
  }
}

std::string described(const Dictionary& dictionary) {
  std::string text;
  describe(text, dictionary);
  return text;
}

void expectBackAsItWas(const std::vector<Dictionary>& dictionaries) {
  const std::vector<Dictionary> back = readBack(imageOf(dictionaries), dictionaries.size());
  for (std::size_t i = 0; i < dictionaries.size(); ++i) {
    EXPECT_EQ(described(back[i]), described(dictionaries[i]));
  }
}

TEST(PackedImage, EveryKindComesBackAsItWas) {
  const double strange = std::bit_cast<double>(std::uint64_t{0x7FF8000000000123});
  expectBackAsItWas({{{"yes", true},
                      {"no", false},
                      {"small", 1},
                      {"unsigned small", std::uint64_t{1}},
                      {"least", std::numeric_limits<std::int64_t>::min()},
                      {"most", std::numeric_limits<std::uint64_t>::max()},
                      {"float", 1.5F},
                      {"nan", std::nanf("")},
                      {"double", 0.1},
                      {"strange nan", strange},
                      {"minus zero", -0.0},
                      {"infinite", -std::numeric_limits<double>::infinity()},
                      {"date", Date{1.25}},
                      {"text", "caf\xC3\xA9"},
                      {"nothing", ""},
                      {"long", std::string(70000, 'x')},
                      {"data", DataView{std::string_view("\0\1", 2)}},
                      {"long data", DataView{std::string_view("0123456789")}}}});
}

TEST(PackedImage, ContainersComeBackWithWhatTheyHold) {
  const Dictionary inner{{"b", 2}, {"a", Array{1, "x", Array{}, Dictionary{}}}};
  expectBackAsItWas(
      {{{"list", Array{inner, Array{Array{inner}}}}, {"inner", inner}, {"empty", Dictionary{}}, {"n", 1}}});
}

TEST(PackedImage, EmptyDictionaryComesBackEmpty) {
  EXPECT_TRUE(readBack(imageOf({{}}), 1)[0].empty());
}

TEST(PackedImage, KeysOfAShapeAreWrittenOnceAndSharedAgain) {
  const Dictionary first{{"a rather long name of a key", 1}, {"b", 2}};
  const Dictionary second{{"a rather long name of a key", 3}, {"b", 4}};
  const std::string image = imageOf({first, second});
  EXPECT_LT(image.size(), imageOf({first}).size() + 20);
  const std::vector<Dictionary> back = readBack(image, 2);
  EXPECT_TRUE(back[0].sharesKeysWith(back[1]));
  EXPECT_TRUE(back[0].sharesKeysWith(first));
}

TEST(PackedImage, MoreShapesThanTheWriterRemembersComeBack) {
  std::vector<Dictionary> dictionaries;
  for (int round = 0; round < 2; ++round) {
    for (int shape = 0; shape < 300; ++shape) {
      dictionaries.push_back({{"key " + std::to_string(shape), round}, {"n", shape}});
    }
  }
  expectBackAsItWas(dictionaries);
}

TEST(PackedImage, CutImageIsRefusedWhereverItIsCut) {
  const std::string image = imageOf({{{"a", 1}, {"text", "abc"}, {"list", Array{1, "two", Dictionary{{"x", 2.5}}}}}});
  for (std::size_t length = 0; length < image.size(); ++length) {
    PackedImageReader reader(std::string_view(image).substr(0, length));
    Dictionary dictionary;
    EXPECT_FALSE(reader.read(dictionary)) << length;
  }
}

TEST(PackedImage, UnknownTagsAndListsAreRefused) {
  std::string image = imageOf({{{"a", Array{1}}}});
  image[image.size() - 2] = static_cast<char>(0xFF);  // the tag of the item
  Dictionary dictionary;
  EXPECT_FALSE(PackedImageReader(image).read(dictionary));
  image[0] = 2;  // a list that nobody wrote
  EXPECT_FALSE(PackedImageReader(image).read(dictionary));
}

class PackedImageModel : public ::testing::Test {
 protected:
  Value randomValue(int depth) {
    switch (random_() % (depth > 0 ? 10 : 8)) {
      case 0:
        return Value(random_() % 2 == 0);
      case 1:
        return Value(static_cast<std::int64_t>(random_()) << (random_() % 33));
      case 2:
        return Value(static_cast<std::uint64_t>(random_()) << (random_() % 33));
      case 3:
        return Value(std::bit_cast<float>(static_cast<std::uint32_t>(random_())));
      case 4:
        return Value(std::bit_cast<double>(std::uint64_t{random_()} << 32U | random_()));
      case 5:
        return Value(Date{static_cast<double>(random_())});
      case 6:
        return Value(std::string(random_() % 300, 'x'));
      case 7:
        return Value(DataView{std::string_view("\0\xFF\x80", random_() % 4)});
      case 8: {
        Array array;
        for (auto left = random_() % 4; left > 0; --left) {
          array.append(randomValue(depth - 1).view());
        }
        return Value(array);
      }
      default:
        return Value(randomDictionary(depth - 1));
    }
  }
  Dictionary randomDictionary(int depth) {
    Dictionary dictionary;
    for (auto left = random_() % 6; left > 0; --left) {
      dictionary.set(Key("key " + std::to_string(random_() % 12)), randomValue(depth).view());
    }
    return dictionary;
  }

  std::mt19937 random_;
};

TEST_F(PackedImageModel, AnyDictionariesComeBackAsTheyWere) {
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    random_.seed(static_cast<std::mt19937::result_type>(seed));
    for (int round = 0; round < 100; ++round) {
      std::vector<Dictionary> dictionaries;
      for (int each = 0; each < 20; ++each) {
        dictionaries.push_back(randomDictionary(3));
      }
      expectBackAsItWas(dictionaries);
    }
  }
}

}  // namespace
}  // namespace tarn::plist
