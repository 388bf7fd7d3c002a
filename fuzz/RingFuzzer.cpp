// SPDX-License-Identifier: Apache-2.0
// Reads a ring whose positions and data are the input's, as the service does: head and taken in the first sixteen
// bytes, then the data area. What is read must stay within the ring, and an accepted message must be of its shape.
#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <span>
#include <vector>

#include "clients/ring/RingConsumer.h"
#include "host/ring/ShapeTable.h"
#include "wire/RequestDecoder.h"

namespace {

using namespace tarn;

constexpr std::uint32_t kDataBytes = TARNRING_LEAST_DATA_BYTES;
constexpr std::size_t kFewest = 16;

void check(bool holds) {
  if (!holds) {
    std::abort();
  }
}

struct Memory {
  tarnring_header header{};
  std::array<std::byte, kDataBytes> data{};
};

void declare(linux_host::ShapeTable& shapes) {
  check(shapes
            .declare({{"shape", 0},
                      {"category", 4},
                      {"type", 1},
                      {"keys", plist::Array{"i", "u", "d", "t", "b", "s", "x"}},
                      {"kinds", plist::Array{"integer", "unsigned", "double", "date", "boolean", "text", "data"}}})
            .ok());
  check(
      shapes.declare({{"shape", 1}, {"category", 4}, {"type", 1}, {"keys", plist::Array()}, {"kinds", plist::Array()}})
          .ok());
}

void serve(linux_host::ShapeTable& shapes, const ring::Record& record, std::span<const std::byte> content) {
  wire::DecodedRequest request;
  if (record.kind == TARNRING_MESSAGE) {
    if (shapes.decode(content, request) == linux_host::ShapeTable::Decoded::Ok) {
      check(request.dictionary.size() == 8 || request.dictionary.size() == 1);
      check(request.dictionary.contains("tarnreporting_timestamp"));
    }
  } else if (record.kind == TARNRING_FRAME) {
    wire::RequestDecoder decoder;
    wire::Refusal refusal;
    static_cast<void>(decoder.decode(content, request, refusal));
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < kFewest) return 0;
  const auto memory = std::make_unique<Memory>();
  std::memcpy(&memory->header.head, data, 8);
  std::memcpy(&memory->header.taken, data + 8, 8);
  std::memcpy(memory->data.data(), data + kFewest, std::min<std::size_t>(size - kFewest, kDataBytes));
  linux_host::ShapeTable shapes;
  declare(shapes);
  ring::RingConsumer<> consumer(&memory->header, memory->data.data(), kDataBytes, 1);
  const std::uint64_t begin = consumer.taken();
  std::vector<std::byte> buffer(consumer.mostContent());
  ring::Record record;
  while (consumer.next(buffer.data(), record) == ring::Look::Record) {
    check(record.length <= buffer.size());
    serve(shapes, record, std::span(buffer).first(record.length));
    consumer.take(record);
    check(consumer.taken() - begin <= kDataBytes);
  }
  return 0;
}
