// SPDX-License-Identifier: Apache-2.0
// JsonScanner: reads a JSON text from its beginning to its end and tells a listener what it meets; nothing is built.
//
// Which problem: a trace is one text of 64 MiB with half a million small objects, of which a few members are wanted.
// How: the text lies in memory, so that strings without escapes are told as views of it.
//
// The text must be whole, strict JSON in UTF-8, its numbers within a double's range; a byte order mark before it is
// looked past. Threads: one at a time.
//
// It never recurses: how deep the text may nest is the listener's to bound, as it is told of each level. Nothing is
// thrown but by the listener and for want of memory.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

namespace tarn::trace_analysis {

// Each operation returns whether to go on. Texts live as long as the call. A boolean and a null are looked past:
// nothing that is wanted is one.
class JsonListener {
 public:
  struct Number {
    double value = 0;
    std::int64_t whole = 0;  // the same when it is a whole one, held within its range
    bool isWhole = false;    // written without a fraction and an exponent
  };

  virtual ~JsonListener() = default;
  virtual bool beginObject() = 0;
  virtual bool key(std::string_view key) = 0;
  virtual bool endObject() = 0;
  virtual bool beginArray() = 0;
  virtual bool endArray() = 0;
  // With its escapes resolved; a view of the text where it has none.
  virtual bool text(std::string_view text) = 0;
  virtual bool number(const Number& number) = 0;
};

// Tells the listener everything up to the end or the first fault, in the text's order. Nothing when it was read to its
// end; else the byte, counted from 1, at which it isn't JSON or the listener ended it. What the listener was told
// before a fault was right as far as it went.
std::optional<std::size_t> scanJson(std::string_view text, JsonListener& listener);

}  // namespace tarn::trace_analysis
