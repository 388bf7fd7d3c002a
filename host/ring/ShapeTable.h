// SPDX-License-Identifier: Apache-2.0
// ShapeTable: the shapes that a connection has declared, and how a message of one becomes a request.
//
// A shape says once what all its messages share: category, type, sessions, keys and their kinds. Its key list is made
// when it is declared, so a message is decoded without a look at a key.
//
// Owned by a connection's rings. Threads: the main loop's.
//
// Bounds: 1024 shapes, each of 64 keys of 255 bytes and 64 reporter IDs. A message costs one pass over its values.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "clients/ring/RingLayout.h"
#include "plist/KeyList.h"
#include "plist/PackedBuilder.h"
#include "plist/Result.h"
#include "wire/Request.h"

namespace tarn::linux_host {

// How a value stands in a message; in the order of the names in a declaration. All but text and data are one word of 8
// bytes.
enum class ShapeKind : std::uint8_t { Integer, Unsigned, Double, Date, Boolean, Text, Data };

class ShapeTable {
 public:
  ShapeTable() = default;
  ShapeTable(const ShapeTable&) = delete;
  ShapeTable& operator=(const ShapeTable&) = delete;

  // Takes the shape that the dictionary describes, in place of one of the same number; with the number alone that shape
  // is forgotten. The error tells what is wrong with it: a member that is missing, unknown, of the wrong kind or
  // outside its range, a key given twice; then the shape that was there stays.
  Status declare(const plist::Dictionary& description);

  // A message as its record tells it; the payload has the time stamp.
  struct Message {
    const plist::PackedBuilder::Draft* payload = nullptr;
    std::uint32_t category = 0;
    std::uint16_t type = 0;
    const wire::ReporterIDs* reporterIDs = nullptr;

    wire::DecodedRequest request() const;
  };

  // UnknownShape: it isn't declared, and may be yet. BadValues: the content isn't what its shape says, or its number is
  // beyond what there can be.
  enum class Decoded { Ok, UnknownShape, BadValues };
  // The content of a message record as a request to send it; `request` counts when it is Ok. `content` is a copy that
  // the client can't change. Values must be as many as the shape's and fill the content to its end; text must be UTF-8,
  // a boolean 0 or 1. The record's stamp becomes the time stamp in seconds unless the shape has that key.
  Decoded decode(std::span<const std::byte> content, wire::DecodedRequest& request);
  // The same without a block for the payload. `message` holds until the next call of either and until a shape is
  // declared.
  Decoded decode(std::span<const std::byte> content, Message& message);

 private:
  // One that was checked whole, as decoding needs it.
  struct Shape {
    std::uint32_t category = 0;
    std::uint16_t type = 0;
    wire::ReporterIDs reporterIDs;
    std::vector<ShapeKind> kinds;
    plist::KeyList keys;  // with that of the stamp after them when it is added
    bool addsStamp = false;
  };

  static Status readShape(const plist::Dictionary& description, Shape& shape);
  // Keys and kinds, of which there are as many, and the key of the stamp.
  static Status readKeys(const plist::Dictionary& description, Shape& shape);

  std::vector<std::unique_ptr<Shape>> shapes_;  // by number
  plist::PackedBuilder::Draft draft_;           // of the last message
};

}  // namespace tarn::linux_host
