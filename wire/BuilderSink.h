// SPDX-License-Identifier: Apache-2.0
// BuilderSink: the sink of a PropertyListReader that makes finished containers. Internal to wire/.
//
//   {"a": 1, "b": [2, 3]}    add("a", 1)  begin()  add(2)  add(3)  endArray("b"), which joins the array under "b"
//
// Requests and replies share it: both hold property-list values, and differ in what stands around them. Nothing here
// checks anything but that keys don't repeat; kinds, UTF-8 and depth are the reader's.
#pragma once

#include <optional>
#include <string_view>

#include "plist/PackedBuilder.h"

namespace tarn::wire {

// One of the two sinks that there are; the other one, which benchmarks use, makes nothing.
//
// What a reader meets goes into the builder's open container, and a container that ends goes into the one around it.
// Holds references alone, so one is made for each reading and costs nothing. Owned by a decoder's pass over one frame;
// builder and cache are the decoder's and outlive it. Threads: one at a time.
class BuilderSink {
 public:
  // The builder has the outermost container open already: whoever reads opens it and finishes it.
  BuilderSink(plist::PackedBuilder& builder, plist::KeyListCache& keyLists) noexcept
      : builder_(builder), keyLists_(keyLists) {}

  // Whether it is a dictionary or an array shows when it ends.
  void begin() { builder_.begin(); }
  // The key's text must stay until its dictionary ends; it lies in the frame. Values are copied.
  void add(std::string_view key, const plist::ValueView& value) { builder_.add(key, value); }
  // An item: containers never come here, they come by join().
  void add(const plist::ValueView& value) { builder_.add(value); }
  // False when a key stands twice: then the dictionary is dropped, and the caller gives up the frame and resets the
  // builder. `key` is that of the entry around it, null for an item of an array; it lies in the frame, too.
  bool endDictionary(const std::string_view* key) {
    const std::optional<plist::Dictionary> dictionary = builder_.finishDictionary(keyLists_);
    if (dictionary) {
      join(key, *dictionary);
    }
    return dictionary.has_value();
  }
  // Always true: an array holds what comes.
  bool endArray(const std::string_view* key) {
    join(key, builder_.finishArray());
    return true;
  }

 private:
  // Adds the finished container to the one around it; it is counted there, so this one's count goes.
  void join(const std::string_view* key, const plist::ValueView& container) {
    if (key != nullptr) {
      builder_.add(*key, container);
    } else {
      builder_.add(container);
    }
  }

  // The decoder's, which keeps their scratch space and the lists from frame to frame.
  plist::PackedBuilder& builder_;
  // By which a dictionary whose keys came lately is finished without a lock.
  plist::KeyListCache& keyLists_;
};

}  // namespace tarn::wire
