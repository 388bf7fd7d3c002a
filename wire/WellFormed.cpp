// SPDX-License-Identifier: Apache-2.0
#include "wire/WellFormed.h"

#include <limits>
#include <vector>

namespace tarn::wire {

namespace {

constexpr const char* kEndsInside = "the frame ends inside an item";
constexpr const char* kReserved = "a reserved item head";
constexpr const char* kStrayBreak = "a break outside an open container";

class Skipper {
 public:
  explicit Skipper(CborReader& in) : in_(in) { open_.push_back(1); }

  const char* run() {
    while (!open_.empty()) {
      if (const char* why = step()) return why;
      // Every item that is still to come takes a byte at least, so hollow promises end here.
      if (needed_ > in_.left()) return kEndsInside;
    }
    return nullptr;
  }

 private:
  // What an open container waits for: so many items, or whatever comes until the break.
  static constexpr std::uint32_t kOpenArray = std::numeric_limits<std::uint32_t>::max();
  static constexpr std::uint32_t kOpenMapKey = kOpenArray - 1;
  static constexpr std::uint32_t kOpenMapValue = kOpenArray - 2;

  const char* step() {
    if (in_.atBreak()) return takeBreak();
    CborHead head;
    if (!in_.readHead(head)) return in_.atEnd() ? kEndsInside : kReserved;
    if (head.major == Major::Tag) {
      behindTag_ = true;  // the tagged item is the one that counts
      return nullptr;
    }
    behindTag_ = false;
    countItem();
    switch (head.major) {
      case Major::Unsigned:
      case Major::Negative:
        return nullptr;
      case Major::Bytes:
      case Major::Text:
        return head.open() ? takeChunks(head.major) : takeBytes(head.argument);
      case Major::Array:
      case Major::Map:
        return openContainer(head);
      default:
        return head.info == kInfoOneByte && head.argument < 32 ? kReserved : nullptr;
    }
  }

  // One item less to come. A container leaves with the beginning of its last item: chains of containers that hold one
  // another and nothing else pile up nothing.
  void countItem() {
    std::uint32_t& top = open_.back();
    if (top == kOpenMapKey) {
      top = kOpenMapValue;
    } else if (top == kOpenMapValue) {
      top = kOpenMapKey;
    } else if (top != kOpenArray) {
      --needed_;
      if (--top == 0) {
        open_.pop_back();
      }
    }
  }

  const char* takeBreak() {
    const std::uint32_t top = open_.back();
    if (behindTag_ || (top != kOpenArray && top != kOpenMapKey)) return kStrayBreak;
    in_.skip(1);
    open_.pop_back();
    --needed_;
    return nullptr;
  }

  const char* openContainer(const CborHead& head) {
    const bool map = head.major == Major::Map;
    if (head.open()) {
      open_.push_back(map ? kOpenMapKey : kOpenArray);
      ++needed_;
      return nullptr;
    }
    if (head.argument > in_.left() / (map ? 2 : 1)) return kEndsInside;
    const auto items = static_cast<std::uint32_t>(head.argument * (map ? 2 : 1));
    if (items > 0) {
      open_.push_back(items);
      needed_ += items;
    }
    return nullptr;
  }

  const char* takeBytes(std::uint64_t count) {
    std::string_view bytes;
    return in_.readBytes(count, bytes) ? nullptr : kEndsInside;
  }

  const char* takeChunks(Major major) {
    while (!in_.atBreak()) {
      CborHead head;
      if (!in_.readHead(head)) return in_.atEnd() ? kEndsInside : kReserved;
      if (head.major != major || head.open()) return "a string whose parts are no strings of its kind";
      if (const char* why = takeBytes(head.argument)) return why;
    }
    in_.skip(1);
    return nullptr;
  }

  CborReader& in_;
  std::vector<std::uint32_t> open_;
  std::uint64_t needed_ = 1;  // items and breaks that must still come
  bool behindTag_ = false;
};

}  // namespace

const char* skipItem(CborReader& in) {
  return Skipper(in).run();
}

const char* checkOneItem(std::span<const std::byte> bytes) {
  CborReader in(bytes);
  if (const char* why = skipItem(in)) return why;
  return in.atEnd() ? nullptr : "bytes behind the array";
}

}  // namespace tarn::wire
