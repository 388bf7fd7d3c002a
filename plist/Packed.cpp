// SPDX-License-Identifier: Apache-2.0
#include "plist/Packed.h"

#include <cstdlib>
#include <limits>
#include <new>
#include <stdexcept>

#include "plist/Allocation.h"
#include "plist/Dictionary.h"

namespace tarn::plist {

namespace detail {

namespace {

// The allocator hands out blocks of 16 n + 8 bytes; asking for whole ones lets a dictionary grow in place.
std::size_t allocationFor(std::size_t bytes) {
  return ((sizeof(Body) + bytes + 8 + 15) & ~std::size_t{15}) - 8;
}

void checkSize(std::size_t bytes) {
  if (bytes > std::numeric_limits<std::int32_t>::max()) {
    throw std::length_error("a property-list container of more than 2 GiB");
  }
}

}  // namespace

Body* makeBody(std::size_t bytes) {
  checkSize(bytes);
  void* memory = allocate(allocationFor(bytes));
  Body* body = ::new (memory) Body{{1}, 0, 0, {nullptr}};
  body->bytes = static_cast<std::uint32_t>(bytes) & 0x7FFFFFFFU;
  return body;
}

Body* growBody(Body* body, std::size_t bytes) {
  checkSize(bytes);
  if (allocationFor(bytes) != allocationFor(body->bytes)) {
    // A block holds plain bytes and a counter that nobody else looks at now, so it may be moved as bytes.
    body = static_cast<Body*>(allocate(allocationFor(bytes), static_cast<void*>(body)));
  }
  body->bytes = static_cast<std::uint32_t>(bytes) & 0x7FFFFFFFU;
  return body;
}

Body* shrinkBody(Body* body, std::size_t bytes) noexcept {
  if (allocationFor(bytes) != allocationFor(body->bytes)) {
    void* const memory = std::realloc(static_cast<void*>(body), allocationFor(bytes));
    body = memory != nullptr ? static_cast<Body*>(memory) : body;  // a larger block will do as well
  }
  body->bytes = static_cast<std::uint32_t>(bytes) & 0x7FFFFFFFU;
  return body;
}

void freeBody(Body* body) noexcept {
  std::free(body);
}

void retainContainers(const std::byte* begin, const std::byte* end) noexcept {
  for (const std::byte* at = begin; at != end; at += Packed::sizeAt(at)) {
    if (Packed::isContainer(at)) {
      retainBody(Packed::bodyAt(at));
    }
  }
}

void releaseContainers(const std::byte* begin, const std::byte* end) noexcept {
  for (const std::byte* at = begin; at != end; at += Packed::sizeAt(at)) {
    if (static_cast<Tag>(*at) == Tag::Array) {
      releaseArrayBody(Packed::bodyAt(at));
    } else if (static_cast<Tag>(*at) == Tag::Dictionary) {
      releaseDictionaryBody(Packed::bodyAt(at));
    }
  }
}

}  // namespace detail

std::size_t Packed::sizeOf(const ValueView& value) noexcept {
  switch (value.kind()) {
    case Kind::None:
      return 0;
    case Kind::Bool:
      return 1;
    case Kind::Signed: {
      const std::int64_t number = value.signedValue();
      if (number == static_cast<std::int8_t>(number)) return 2;
      if (number == static_cast<std::int16_t>(number)) return 3;
      return number == static_cast<std::int32_t>(number) ? 5 : 9;
    }
    case Kind::Unsigned: {
      const std::uint64_t number = value.unsignedValue();
      if (number <= 0xFF) return 2;
      if (number <= 0xFFFF) return 3;
      return number <= 0xFFFFFFFF ? 5 : 9;
    }
    case Kind::Float:
      return 5;
    case Kind::Text:
    case Kind::Data:
      return value.size_ + (value.size_ <= 0xFF ? 2 : 5);
    case Kind::Double:
    case Kind::Date:
    case Kind::Array:
    case Kind::Dictionary:
      return 9;
  }
  return 0;
}

std::byte* Packed::writeSigned(std::byte* to, std::int64_t value) noexcept {
  if (value == static_cast<std::int8_t>(value)) return store(to, Tag::Signed8, static_cast<std::int8_t>(value));
  if (value == static_cast<std::int16_t>(value)) return store(to, Tag::Signed16, static_cast<std::int16_t>(value));
  if (value == static_cast<std::int32_t>(value)) return store(to, Tag::Signed32, static_cast<std::int32_t>(value));
  return store(to, Tag::Signed64, value);
}

std::byte* Packed::writeUnsigned(std::byte* to, std::uint64_t value) noexcept {
  if (value <= 0xFF) return store(to, Tag::Unsigned8, static_cast<std::uint8_t>(value));
  if (value <= 0xFFFF) return store(to, Tag::Unsigned16, static_cast<std::uint16_t>(value));
  if (value <= 0xFFFFFFFF) return store(to, Tag::Unsigned32, static_cast<std::uint32_t>(value));
  return store(to, Tag::Unsigned64, value);
}

std::byte* Packed::writeBytes(std::byte* to, Tag shortTag, Tag longTag, std::string_view bytes) noexcept {
  to = bytes.size() <= 0xFF ? store(to, shortTag, static_cast<std::uint8_t>(bytes.size()))
                            : store(to, longTag, static_cast<std::uint32_t>(bytes.size()));
  if (!bytes.empty()) {
    std::memcpy(to, bytes.data(), bytes.size());
  }
  return to + bytes.size();
}

std::byte* Packed::write(std::byte* to, const ValueView& value) noexcept {
  switch (value.kind()) {
    case Kind::None:
      return to;
    case Kind::Bool:
      *to = static_cast<std::byte>(value.boolValue() ? Tag::True : Tag::False);
      return to + 1;
    case Kind::Signed:
      return writeSigned(to, value.signedValue());
    case Kind::Unsigned:
      return writeUnsigned(to, value.unsignedValue());
    case Kind::Float:
      return store(to, Tag::Float, value.floatValue());
    case Kind::Double:
      return store(to, Tag::Double, value.doubleValue());
    case Kind::Date:
      return store(to, Tag::Date, value.doubleValue());
    case Kind::Text:
      return writeBytes(to, Tag::Text8, Tag::Text32, value.text());
    case Kind::Data:
      return writeBytes(to, Tag::Data8, Tag::Data32, value.data());
    case Kind::Array:
    case Kind::Dictionary:
      detail::retainBody(value.body_);
      return store(to, value.kind() == Kind::Array ? Tag::Array : Tag::Dictionary, value.body_);
  }
  return to;
}

ValueView Packed::read(const std::byte* at) noexcept {
  const auto bytes = [](const std::byte* from, std::size_t size) {
    return std::string_view(reinterpret_cast<const char*>(from), size);
  };
  const auto container = [&](Kind kind) {
    ValueView view;
    view.body_ = bodyAt(at);
    view.kind_ = kind;
    return view;
  };
  switch (tagAt(at)) {
    case Tag::False:
      return false;
    case Tag::True:
      return true;
    case Tag::Signed8:
      return int{load<std::int8_t>(at + 1)};
    case Tag::Signed16:
      return int{load<std::int16_t>(at + 1)};
    case Tag::Signed32:
      return load<std::int32_t>(at + 1);
    case Tag::Signed64:
      return load<std::int64_t>(at + 1);
    case Tag::Unsigned8:
      return unsigned{load<std::uint8_t>(at + 1)};
    case Tag::Unsigned16:
      return unsigned{load<std::uint16_t>(at + 1)};
    case Tag::Unsigned32:
      return load<std::uint32_t>(at + 1);
    case Tag::Unsigned64:
      return load<std::uint64_t>(at + 1);
    case Tag::Float:
      return load<float>(at + 1);
    case Tag::Double:
      return load<double>(at + 1);
    case Tag::Date:
      return plist::Date{load<double>(at + 1)};
    case Tag::Text8:
      return bytes(at + 2, load<std::uint8_t>(at + 1));
    case Tag::Text32:
      return bytes(at + 5, load<std::uint32_t>(at + 1));
    case Tag::Data8:
      return DataView{bytes(at + 2, load<std::uint8_t>(at + 1))};
    case Tag::Data32:
      return DataView{bytes(at + 5, load<std::uint32_t>(at + 1))};
    case Tag::Array:
      return container(Kind::Array);
    case Tag::Dictionary:
      return container(Kind::Dictionary);
  }
  return {};
}

}  // namespace tarn::plist
