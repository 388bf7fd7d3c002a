// SPDX-License-Identifier: Apache-2.0
// DataSerialize: text forms of a property-list value (a dictionary or an array), for back-ends that need one.
//
// The XML is the property-list document type 1.0 with tab indentation; data in base64. Threads: any.
//
// Nothing of the reporting path depends on it. Each operation walks the whole value and returns a text of its own.
#pragma once

#include <optional>
#include <string>

#include "plist/ValueView.h"

namespace tarn {

class DataSerialize {
 public:
  // The value as an XML property list; nothing for an absent value or one that a property list can't hold. UTF-8.
  static std::optional<std::string> getPlistBlob(const plist::ValueView& value);
  // That XML as ASCII text: nothing when it holds anything else. One character beyond ASCII anywhere in keys or texts
  // is enough for that.
  static std::optional<std::string> getXMLInfo(const plist::ValueView& value);
  // That XML as UTF-8 text.
  static std::optional<std::string> getDataXMLInfo(const plist::ValueView& value);
  // That XML in base64 without line breaks.
  static std::optional<std::string> getBase64XMLBlob(const plist::ValueView& value);
};

}  // namespace tarn
