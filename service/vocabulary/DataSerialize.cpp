// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/DataSerialize.h"

#include <algorithm>

#include "plist/formats/Base64.h"
#include "plist/formats/XmlPropertyList.h"

namespace tarn {

std::optional<std::string> DataSerialize::getPlistBlob(const plist::ValueView& value) {
  return plist::xmlPropertyList(value);
}

std::optional<std::string> DataSerialize::getXMLInfo(const plist::ValueView& value) {
  auto xml = getPlistBlob(value);
  const auto isAscii = [](char character) { return (static_cast<unsigned char>(character) & 0x80U) == 0; };
  if (xml && !std::all_of(xml->begin(), xml->end(), isAscii)) return std::nullopt;
  return xml;
}

std::optional<std::string> DataSerialize::getDataXMLInfo(const plist::ValueView& value) {
  return getPlistBlob(value);
}

std::optional<std::string> DataSerialize::getBase64XMLBlob(const plist::ValueView& value) {
  const auto xml = getPlistBlob(value);
  if (!xml) return std::nullopt;
  std::string base64;
  plist::appendBase64(base64, *xml);
  return base64;
}

}  // namespace tarn
