// SPDX-License-Identifier: Apache-2.0
#include "host/traces/analysis/JsonScanner.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <random>
#include <string>

#include "tests/support/Seeds.h"

namespace tarn::trace_analysis {
namespace {

// What a reader met, as one text.
class Trail {
 public:
  bool add(std::string_view entry) {
    text_.append(entry).append("\n");
    return true;
  }
  const std::string& text() const { return text_; }

 private:
  std::string text_;
};

class Ours final : public JsonListener {
 public:
  explicit Ours(Trail& trail) : trail_(trail) {}
  bool beginObject() override { return trail_.add("{"); }
  bool key(std::string_view key) override { return trail_.add("key " + std::string(key)); }
  bool endObject() override { return trail_.add("}"); }
  bool beginArray() override { return trail_.add("["); }
  bool endArray() override { return trail_.add("]"); }
  bool text(std::string_view text) override { return trail_.add("text " + std::string(text)); }
  bool number(const Number& number) override { return trail_.add("number " + std::to_string(number.value + 0)); }

 private:
  Trail& trail_;
};

class Theirs final : public nlohmann::json_sax<nlohmann::json> {
 public:
  explicit Theirs(Trail& trail) : trail_(trail) {}
  bool null() override { return true; }
  bool boolean(bool) override { return true; }
  bool number_integer(number_integer_t value) override { return number(static_cast<double>(value)); }
  bool number_unsigned(number_unsigned_t value) override { return number(static_cast<double>(value)); }
  bool number_float(number_float_t value, const string_t&) override { return number(value); }
  bool string(string_t& value) override { return trail_.add("text " + value); }
  bool binary(binary_t&) override { return true; }
  bool start_object(std::size_t) override { return trail_.add("{"); }
  bool key(string_t& value) override { return trail_.add("key " + value); }
  bool end_object() override { return trail_.add("}"); }
  bool start_array(std::size_t) override { return trail_.add("["); }
  bool end_array() override { return trail_.add("]"); }
  bool parse_error(std::size_t, const std::string&, const nlohmann::json::exception&) override { return false; }

 private:
  bool number(double value) { return trail_.add("number " + std::to_string(value + 0)); }  // no zero with a sign
  Trail& trail_;
};

std::string trailOf(std::string_view text) {
  Trail trail;
  Ours ours(trail);
  EXPECT_EQ(scanJson(text, ours), std::nullopt) << text;
  return trail.text();
}

std::optional<std::size_t> faultOf(std::string_view text) {
  Trail trail;
  Ours ours(trail);
  return scanJson(text, ours);
}

TEST(JsonScanner, TellsWhatItMeetsInOrder) {
  EXPECT_EQ(trailOf(" {\"a\" : [1, -2.5e1, true, false, null, {}, []], \"b\":\"c\"}\n"),
            "{\nkey a\n[\nnumber 1.000000\nnumber -25.000000\n{\n}\n[\n]\n]\nkey b\ntext c\n}\n");
  EXPECT_EQ(trailOf("\xEF\xBB\xBF"
                    "7"),
            "number 7.000000\n");
}

TEST(JsonScanner, EscapesAreTheirCharacters) {
  EXPECT_EQ(trailOf(R"(["\"\\\/\b\f\n\r\t", "\u0041\u00e9\u20AC\ud83d\ude00", "x\u0000y"])"),
            std::string("[\ntext \"\\/\b\f\n\r\t\ntext A\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80\ntext x\0y\n]\n", 43));
}

TEST(JsonScanner, TellsWholeNumbersWithTheirKind) {
  class Numbers final : public JsonListener {
   public:
    bool beginObject() override { return true; }
    bool key(std::string_view) override { return true; }
    bool endObject() override { return true; }
    bool beginArray() override { return true; }
    bool endArray() override { return true; }
    bool text(std::string_view) override { return true; }
    bool number(const Number& number) override {
      wholes.push_back(number.isWhole ? std::to_string(number.whole) : "none");
      return wholes.size() < 6;
    }
    std::vector<std::string> wholes;
  };
  Numbers numbers;
  // The listener ends it after the sixth.
  EXPECT_EQ(scanJson("[-7, 9223372036854775807, 18446744073709551616, -18446744073709551616, 1.0, 1e3, x", numbers),
            80U);
  EXPECT_EQ(numbers.wholes, (std::vector<std::string>{"-7", "9223372036854775807", "9223372036854775807",
                                                      "-9223372036854775808", "none", "none"}));
}

TEST(JsonScanner, WhatIsNoJsonIsToldByItsByte) {
  EXPECT_EQ(faultOf(""), 1U);
  EXPECT_EQ(faultOf("[1"), 3U);
  EXPECT_EQ(faultOf("[1,]"), 4U);
  EXPECT_EQ(faultOf("[] x"), 4U);
  EXPECT_EQ(faultOf("\xEF\xBB\xBF[x"), 5U);
  for (const char* wrong : {"{",
                            "}",
                            "{,}",
                            "{\"a\"}",
                            "{\"a\":}",
                            "{\"a\":1,}",
                            "{1:1}",
                            "[1 2]",
                            "[1}",
                            "{\"a\":1]",
                            "01",
                            "-",
                            "+1",
                            "1.",
                            ".5",
                            "1e",
                            "1e+",
                            "tru",
                            "nulL",
                            "\"",
                            "\"\\x\"",
                            "\"\\u12g4\"",
                            "\"\\ud800\"",
                            "\"\\ud800\\u0041\"",
                            "\"\\udc00\"",
                            "\"\x01\"",
                            "\"\x80\"",
                            "\"\xC0\x80\"",
                            "\"\xE0\x80\x80\"",
                            "\"\xED\xA0\x80\"",
                            "\"\xF4\x90\x80\x80\"",
                            "\"\xF8\x88\x80\x80\x80\"",
                            "\"\xE2\x82\"",
                            "'a'",
                            "1e999",
                            "-1e999",
                            "NaN"}) {
    EXPECT_NE(faultOf(wrong), std::nullopt) << wrong;
  }
  EXPECT_EQ(trailOf("1e-999"), "number 0.000000\n");
}

void compareWithAnotherReader(std::uint64_t seed) {
  std::mt19937_64 random(seed);
  const std::string bases[] = {R"({"a":[1,-2.5e+1,0],"b":{"c":"d\u20ac\ud83d\ude00\n"},"":null})",
                               "[true,false,null,\"\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80\",[[]],{}]"};
  const std::string letters = "\"\\{}[],:0123456789.eE+-u tfnx\x01\x7F\x80\xBF\xC3\xE2\xF0\xED";
  std::size_t taken = 0;
  for (int round = 0; round < 40'000; ++round) {
    std::string text = bases[random() % std::size(bases)];
    for (auto changes = random() % 3; changes > 0; --changes) {
      const std::size_t at = random() % text.size();
      const char letter = letters[random() % letters.size()];
      switch (random() % 3) {
        case 0:
          text[at] = letter;
          break;
        case 1:
          text.insert(at, 1, letter);
          break;
        default:
          text.erase(at, 1);
      }
    }
    Trail ours;
    Trail theirs;
    Ours listener(ours);
    Theirs sax(theirs);
    const bool isTaken = nlohmann::json::sax_parse(text, &sax);
    ASSERT_EQ(!scanJson(text, listener).has_value(), isTaken) << text;
    if (isTaken) {
      ASSERT_EQ(ours.text(), theirs.text()) << text;
      ++taken;
    }
  }
  EXPECT_GT(taken, 10'000U);
}

// Texts that are nearly right, against another reader.
TEST(JsonScanner, ReadsWhatAnotherReaderReadsAndRefusesTheRest) {
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    compareWithAnotherReader(seed);
  }
}

}  // namespace
}  // namespace tarn::trace_analysis
