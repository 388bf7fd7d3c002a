// SPDX-License-Identifier: Apache-2.0
// TextFormatter: where a metric record puts its text rendering, one field after the other.
#pragma once

#include <cstdint>
#include <string_view>

namespace pylonmetrics {

// A record calls beginObject() first and endObject() last, and each field once in between. What comes out is the
// formatter's business: text for people or a dictionary.
class TextFormatter {
 public:
  virtual ~TextFormatter() = default;
  // `name` is that of the record's type.
  virtual void beginObject(std::string_view name) = 0;
  // The name is the field's, without escapes, and needs to last only for the call.
  virtual void formatSigned(std::string_view name, std::int64_t value) = 0;
  virtual void formatUnsigned(std::string_view name, std::uint64_t value) = 0;
  // Any bytes, NUL included.
  virtual void formatString(std::string_view name, std::string_view bytes) = 0;
  // As many as there were beginnings.
  virtual void endObject() = 0;
};

}  // namespace pylonmetrics
