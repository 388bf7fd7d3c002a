// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/PropertyList.h"

#include "plist/formats/BinaryPropertyList.h"
#include "plist/formats/XmlPropertyList.h"

namespace tarn::plist {

std::string PropertyListFault::description() const {
  return (place == Place::Line ? "line " : "byte ") + std::to_string(number) + ": " + text;
}

PropertyListReading readPropertyList(std::string_view bytes) {
  return bytes.starts_with("bplist") ? readBinaryPropertyList(bytes) : readXmlPropertyList(bytes);
}

}  // namespace tarn::plist
