// SPDX-License-Identifier: Apache-2.0
// TextFields: a text rendering as a dictionary, for a metric service that wants the fields one by one. The name of the
// object is left out; strings are taken as they are.
#pragma once

#include "diagnostics/pylon/TextFormatter.h"
#include "plist/Dictionary.h"

namespace pylonmetrics {

// For records without objects in objects: all fields land in one dictionary. Threads: one formatter is for one thread
// at a time.
class TextFields final : public TextFormatter {
 public:
  void beginObject(std::string_view) override {}
  void formatSigned(std::string_view name, std::int64_t value) override { fields_.set(name, value); }
  void formatUnsigned(std::string_view name, std::uint64_t value) override { fields_.set(name, value); }
  void formatString(std::string_view name, std::string_view bytes) override { fields_.set(name, bytes); }
  void endObject() override {}

  // In the order in which they came; of two of one name the later counts.
  const tarn::plist::Dictionary& fields() const noexcept { return fields_; }

 private:
  tarn::plist::Dictionary fields_;
};

}  // namespace pylonmetrics
