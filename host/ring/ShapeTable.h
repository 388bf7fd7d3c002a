// ShapeTable: the shapes that a connection has declared, and how a message of one becomes a request.
//
// A shape says once what all its messages share: category, type, sessions, keys and their kinds. Its key list is made
// when it is declared, so a message is decoded without a look at a key.
//
// Owned by a connection's rings. Threads: the main loop's.
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

// How a value stands in a message.
enum class ShapeKind : std::uint8_t { Integer, Unsigned, Double, Date, Boolean, Text, Data };

class ShapeTable {
 public:
  ShapeTable() = default;
  ShapeTable(const ShapeTable&) = delete;
  ShapeTable& operator=(const ShapeTable&) = delete;

  // Takes the shape that the dictionary describes, in place of one of the same number. The error tells what is
  // wrong with it.
  Status declare(const plist::Dictionary& description);

  enum class Decoded { Ok, UnknownShape, BadValues };
  // The content of a message record as a request to send it; `request` counts when it is Ok.
  Decoded decode(std::span<const std::byte> content, wire::DecodedRequest& request);

 private:
  struct Shape {
    std::uint32_t category = 0;
    std::uint16_t type = 0;
    wire::ReporterIDs reporterIDs;
    std::vector<ShapeKind> kinds;
    plist::KeyList keys;  // with that of the stamp after them when it is added
    bool addsStamp = false;
  };

  static Status readShape(const plist::Dictionary& description, Shape& shape);
  static Status readKeys(const plist::Dictionary& description, Shape& shape);

  std::vector<std::unique_ptr<Shape>> shapes_;  // by number
  plist::PackedBuilder builder_;
};

}  // namespace tarn::linux_host
