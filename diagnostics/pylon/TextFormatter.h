// TextFormatter: where a metric record puts its text rendering, one field after the other.
#pragma once

#include <cstdint>
#include <string_view>

namespace pylonmetrics {

class TextFormatter {
 public:
  virtual ~TextFormatter() = default;
  virtual void beginObject(std::string_view name) = 0;
  virtual void formatSigned(std::string_view name, std::int64_t value) = 0;
  virtual void formatUnsigned(std::string_view name, std::uint64_t value) = 0;
  virtual void formatString(std::string_view name, std::string_view bytes) = 0;
  virtual void endObject() = 0;
};

}  // namespace pylonmetrics
