// SPDX-License-Identifier: Apache-2.0
// Random changes to a dictionary beside a slow, obvious model of one: a list of names and texts.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/Value.h"
#include "tests/support/Seeds.h"

namespace tarn::plist {
namespace {

using Model = std::vector<std::pair<std::string, Value>>;

Value randomValue(std::mt19937& random, int depth) {
  switch (random() % (depth > 0 ? 10 : 8)) {
    case 0:
      return Value(random() % 2 == 0);
    case 1:
      return Value(static_cast<std::int64_t>((std::uint64_t{random()} << 32U | random()) >> random() % 64));
    case 2:
      return Value(std::uint64_t{random()} << 32U);
    case 3:
      return Value(static_cast<float>(random()) / 7);
    case 4:
      return Value(static_cast<double>(random()) / 3);
    case 5:
      return Value(std::string(random() % 300, 'x'));
    case 6:
      return Value(DataView{"bytes"});
    case 7:
      return Value(Date{static_cast<double>(random())});
    case 8: {
      Array array;
      for (std::size_t i = random() % 4; i > 0; --i) {
        array.append(randomValue(random, depth - 1));
      }
      return Value(array);
    }
    default: {
      Dictionary dictionary;
      for (std::size_t i = random() % 4; i > 0; --i) {
        dictionary.set(Key("inner" + std::to_string(i)), randomValue(random, depth - 1));
      }
      return Value(dictionary);
    }
  }
}

auto find(Model& model, const std::string& key) {
  return std::find_if(model.begin(), model.end(), [&](const auto& entry) { return entry.first == key; });
}

void set(Model& model, const std::string& key, const Value& value) {
  const auto found = find(model, key);
  if (found == model.end()) {
    model.emplace_back(key, value);
  } else {
    found->second = value;
  }
}

void expectSame(const Dictionary& dictionary, const Model& model) {
  ASSERT_EQ(dictionary.size(), model.size());
  std::size_t index = 0;
  for (const auto& entry : dictionary) {
    ASSERT_EQ(entry.key.text(), model[index].first);
    ASSERT_EQ(description(entry.value), description(model[index].second));
    ASSERT_EQ(entry.value.kind(), model[index].second.kind());
    ++index;
  }
}

TEST(DictionaryModel, RandomChangesLeaveWhatTheModelHolds) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937 random(seed);
    for (int round = 0; round < 60; ++round) {
      Dictionary dictionary;
      Model model;
      std::vector<std::pair<Dictionary, Model>> copies;
      for (int step = 0; step < 120; ++step) {
        const std::string key = "key" + std::to_string(random() % 24);
        switch (random() % 6) {
          case 0:
            dictionary.remove(Key(key));
            if (const auto found = find(model, key); found != model.end()) {
              model.erase(found);
            }
            break;
          case 1:
            copies.emplace_back(dictionary, model);
            break;
          case 2:
            if (!copies.empty()) {
              const auto& [other, otherModel] = copies[random() % copies.size()];
              dictionary.merge(other);
              for (const auto& [name, value] : otherModel) {
                set(model, name, value);
              }
            }
            break;
          default: {
            const Value value = randomValue(random, 2);
            dictionary.set(Key(key), value);
            set(model, key, value);
          }
        }
      }
      expectSame(dictionary, model);
      for (const auto& [copy, copyModel] : copies) {
        expectSame(copy, copyModel);
      }
    }
  }
}

}  // namespace
}  // namespace tarn::plist
