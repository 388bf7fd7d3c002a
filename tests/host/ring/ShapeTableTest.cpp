// SPDX-License-Identifier: Apache-2.0
#include "host/ring/ShapeTable.h"

#include <gtest/gtest.h>

#include <bit>
#include <string>

#include "tests/host/ring/ClientRing.h"

namespace tarn::linux_host {
namespace {

using plist::Array;
using plist::Dictionary;
using testing::ClientRing;

Dictionary shapeOf(const Array& keys, const Array& kinds, std::int64_t number = 3) {
  return {{"shape", number}, {"category", 14}, {"type", 16}, {"reporterIDs", Array{42, -1}},
          {"keys", keys},    {"kinds", kinds}};
}

// What is wrong with it; empty: nothing.
std::string declared(ShapeTable& table, const Dictionary& description) {
  return table.declare(description).text();
}

ShapeTable::Decoded decode(ShapeTable& table, const std::string& content, wire::DecodedRequest& request) {
  return table.decode(std::as_bytes(std::span(content)), request);
}

// A text as it stands in a message.
void appendText(std::string& content, std::string_view text) {
  const std::uint64_t length = text.size();
  content.append(reinterpret_cast<const char*>(&length), sizeof length);
  content += text;
  content.append((8 - text.size() % 8) % 8, '\0');
}

TEST(ShapeTable, AMessageBecomesARequestWithItsStamp) {
  ShapeTable table;
  ASSERT_EQ(declared(table, shapeOf({"i", "u", "d", "t", "b"}, {"integer", "unsigned", "double", "date", "boolean"})),
            "");
  wire::DecodedRequest request;
  const std::string content =
      ClientRing::contentOf(3,
                            {static_cast<std::uint64_t>(-7), 18446744073709551615U, std::bit_cast<std::uint64_t>(0.5),
                             std::bit_cast<std::uint64_t>(12.5), 1},
                            1500000000);
  ASSERT_EQ(decode(table, content, request), ShapeTable::Decoded::Ok);
  const Dictionary expected{{"i", -7},   {"u", 18446744073709551615U},    {"d", 0.5}, {"t", plist::Date{12.5}},
                            {"b", true}, {"tarnreporting_timestamp", 1.5}};
  EXPECT_EQ(request.dictionary, expected);
  EXPECT_TRUE(request.dictionary.sharesKeysWith(expected));  // in this order
  EXPECT_EQ(request.dictionary["t"].kind(), plist::Kind::Date);
  EXPECT_EQ(request.dictionary["b"].kind(), plist::Kind::Bool);
  EXPECT_EQ(request.operation, wire::Operation::SendMessage);
  EXPECT_EQ(request.category, 14U);
  EXPECT_EQ(request.type, 16U);
  EXPECT_EQ(request.reporterIDs, (std::vector<std::int64_t>{42, -1}));
}

TEST(ShapeTable, TextsAndDataMayHaveAnyLength) {
  ShapeTable table;
  ASSERT_EQ(declared(table, shapeOf({"a", "b", "c"}, {"text", "data", "text"})), "");
  std::string content = ClientRing::contentOf(3, {}, 1000000000);
  content[12] = 3;  // values
  appendText(content, "");
  appendText(content, "\xFF\x00");
  appendText(content, "a text that is longer than eight");
  wire::DecodedRequest request;
  ASSERT_EQ(decode(table, content, request), ShapeTable::Decoded::Ok);
  EXPECT_EQ(request.dictionary["a"].text(), "");
  EXPECT_EQ(request.dictionary["b"].data(), "\xFF");
  EXPECT_EQ(request.dictionary["c"].text(), "a text that is longer than eight");
}

TEST(ShapeTable, AShapeWithTheStampsKeyKeepsItsOwn) {
  ShapeTable table;
  ASSERT_EQ(declared(table, shapeOf({"tarnreporting_timestamp"}, {"integer"})), "");
  wire::DecodedRequest request;
  ASSERT_EQ(decode(table, ClientRing::contentOf(3, {99}), request), ShapeTable::Decoded::Ok);
  EXPECT_EQ(request.dictionary, (Dictionary{{"tarnreporting_timestamp", 99}}));
}

TEST(ShapeTable, ValuesThatDoNotFitAreRefused) {
  ShapeTable table;
  ASSERT_EQ(declared(table, shapeOf({"a", "b"}, {"boolean", "text"})), "");
  wire::DecodedRequest request;
  std::string good = ClientRing::contentOf(3, {1});
  good[12] = 2;
  appendText(good, "abc");
  ASSERT_EQ(decode(table, good, request), ShapeTable::Decoded::Ok);
  std::string wrong = good;
  wrong[16] = 2;  // no boolean
  EXPECT_EQ(decode(table, wrong, request), ShapeTable::Decoded::BadValues);
  wrong = good;
  wrong[12] = 1;  // another count
  EXPECT_EQ(decode(table, wrong, request), ShapeTable::Decoded::BadValues);
  wrong = good;
  wrong[24] = 9;  // a text that reaches over the end
  EXPECT_EQ(decode(table, wrong, request), ShapeTable::Decoded::BadValues);
  wrong = good;
  wrong[31] = '\x80';  // by very much
  EXPECT_EQ(decode(table, wrong, request), ShapeTable::Decoded::BadValues);
  wrong = good;
  wrong[32] = '\xFF';  // not UTF-8
  EXPECT_EQ(decode(table, wrong, request), ShapeTable::Decoded::BadValues);
  EXPECT_EQ(decode(table, good + std::string(8, '\0'), request), ShapeTable::Decoded::BadValues);
  for (std::size_t length = 0; length < good.size(); length += 4) {
    EXPECT_EQ(decode(table, good.substr(0, length), request), ShapeTable::Decoded::BadValues) << length;
  }
  EXPECT_EQ(decode(table, good, request), ShapeTable::Decoded::Ok);
}

TEST(ShapeTable, AShapeIsReplacedAndForgotten) {
  ShapeTable table;
  wire::DecodedRequest request;
  const std::string content = ClientRing::contentOf(3, {1});
  EXPECT_EQ(decode(table, content, request), ShapeTable::Decoded::UnknownShape);
  ASSERT_EQ(declared(table, shapeOf({"a"}, {"integer"})), "");
  ASSERT_EQ(declared(table, shapeOf({"b"}, {"integer"})), "");
  ASSERT_EQ(decode(table, content, request), ShapeTable::Decoded::Ok);
  EXPECT_EQ(request.dictionary["b"].asInt64(), 1);
  ASSERT_EQ(declared(table, {{"shape", 3}}), "");
  EXPECT_EQ(decode(table, content, request), ShapeTable::Decoded::UnknownShape);
  EXPECT_EQ(decode(table, ClientRing::contentOf(1024, {1}), request), ShapeTable::Decoded::BadValues);
}

TEST(ShapeTable, WhatIsNoShapeIsRefusedAndTheOldOneStays) {
  ShapeTable table;
  ASSERT_EQ(declared(table, shapeOf({"a"}, {"integer"})), "");
  Dictionary many = shapeOf({"a"}, {"integer"});
  many.set("other", 1);
  const auto with = [](const char* key, const plist::ValueView& value) {
    Dictionary shape = shapeOf({"a"}, {"integer"});
    shape.set(key, value);
    return shape;
  };
  const Dictionary wrong[] = {{},
                              shapeOf({"a"}, {"integer"}, 1024),
                              shapeOf({"a"}, {"integer"}, -1),
                              shapeOf({"a", "b"}, {"integer"}),
                              shapeOf({"a", "a"}, {"integer", "integer"}),
                              shapeOf({"a"}, {"number"}),
                              shapeOf({1}, {"integer"}),
                              shapeOf({std::string(256, 'a')}, {"integer"}),
                              with("category", -1),
                              with("category", 4294967296),
                              with("type", 65536),
                              with("type", "16"),
                              with("reporterIDs", 1),
                              with("reporterIDs", Array{"a"}),
                              with("keys", "a"),
                              many};
  for (const Dictionary& shape : wrong) {
    EXPECT_NE(declared(table, shape), "") << plist::description(shape);
  }
  wire::DecodedRequest request;
  EXPECT_EQ(decode(table, ClientRing::contentOf(3, {1}), request), ShapeTable::Decoded::Ok);
}

TEST(ShapeTable, AShapeHasAtMost64Keys) {
  Array keys;
  Array kinds;
  for (int i = 0; i < 64; ++i) {
    keys.append("key" + std::to_string(i));
    kinds.append("integer");
  }
  ShapeTable table;
  EXPECT_EQ(declared(table, shapeOf(keys, kinds)), "");
  keys.append("one more");
  kinds.append("integer");
  EXPECT_NE(declared(table, shapeOf(keys, kinds)), "");
}

}  // namespace
}  // namespace tarn::linux_host
