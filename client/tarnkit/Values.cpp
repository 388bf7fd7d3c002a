// SPDX-License-Identifier: Apache-2.0
#include "client/tarnkit/Values.h"

#include <string_view>
#include <type_traits>
#include <utility>
#include <variant>

#include "plist/PackedBuilder.h"
#include "wire/BuilderSink.h"

namespace tarn::client {

namespace {

// Of anything but containers.
plist::ValueView viewOf(const tarnkit::Value& value) {
  return std::visit(
      [](const auto& held) -> plist::ValueView {
        using Held = std::remove_cvref_t<decltype(held)>;
        if constexpr (std::is_same_v<Held, tarnkit::Date>) {
          return plist::Date{held.epochSeconds};
        } else if constexpr (std::is_same_v<Held, tarnkit::Data>) {
          return plist::DataView{held.bytes};
        } else if constexpr (std::is_same_v<Held, tarnkit::Array> || std::is_same_v<Held, tarnkit::Dictionary>) {
          return {};
        } else {
          return held;
        }
      },
      value.held());
}

class Packer {
 public:
  plist::Dictionary pack(const tarnkit::Dictionary& dictionary) {
    addMembers(dictionary);
    return builder_.finishDictionary(keyLists_).value_or(plist::Dictionary());
  }

 private:
  void addMembers(const tarnkit::Dictionary& dictionary) {
    builder_.begin();
    for (const tarnkit::Member& member : dictionary) {
      const std::string_view key = member.key;
      add(&key, member.value);
    }
  }

  // An item of an array has no key.
  void add(const std::string_view* key, const tarnkit::Value& value) {
    if (const auto* array = value.as<tarnkit::Array>()) {
      builder_.begin();
      for (const tarnkit::Value& item : *array) {
        add(nullptr, item);
      }
      sink_.endArray(key);
    } else if (const auto* dictionary = value.as<tarnkit::Dictionary>()) {
      addMembers(*dictionary);
      sink_.endDictionary(key);
    } else if (key != nullptr) {
      builder_.add(*key, viewOf(value));
    } else {
      builder_.add(viewOf(value));
    }
  }

  plist::PackedBuilder builder_;
  plist::KeyListCache keyLists_;
  wire::BuilderSink sink_{builder_, keyLists_};
};

tarnkit::Array unpackedArray(const plist::Array& array) {
  tarnkit::Array items;
  for (const plist::ValueView item : array) {
    items.push_back(unpacked(item));
  }
  return items;
}

tarnkit::Dictionary unpackedDictionary(const plist::Dictionary& dictionary) {
  tarnkit::Dictionary members;
  for (const plist::Dictionary::Entry entry : dictionary) {
    members.set(std::string(entry.key.text()), unpacked(entry.value));
  }
  return members;
}

}  // namespace

plist::Dictionary packed(const tarnkit::Dictionary& dictionary) {
  return Packer().pack(dictionary);
}

tarnkit::Value unpacked(const plist::ValueView& value) {
  switch (value.kind()) {
    case plist::Kind::Bool:
      return value.boolValue();
    case plist::Kind::Signed:
      return value.signedValue();
    case plist::Kind::Unsigned:
      return value.unsignedValue();
    case plist::Kind::Float:
      return value.floatValue();
    case plist::Kind::Double:
      return value.doubleValue();
    case plist::Kind::Date:
      return tarnkit::Date{value.dateValue().epochSeconds};
    case plist::Kind::Data:
      return tarnkit::Data{std::string(value.data())};
    case plist::Kind::Array:
      return unpackedArray(value.array());
    case plist::Kind::Dictionary:
      return unpackedDictionary(value.dictionary());
    case plist::Kind::Text:
    case plist::Kind::None:
      break;
  }
  return value.text();
}

tarnkit::Reply unpacked(Reply&& reply) {
  tarnkit::Reply made;
  made.outcome = reply.outcome;
  made.error = {std::move(reply.error.domain), reply.error.code, std::move(reply.error.text)};
  for (const plist::Value& result : reply.results) {
    made.results.push_back(unpacked(result.view()));
  }
  return made;
}

}  // namespace tarn::client
