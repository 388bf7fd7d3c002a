// SPDX-License-Identifier: Apache-2.0
// The XML format of property lists.
//
//   <plist version="1.0">
//   <dict>
//     <key>name</key> <string>text</string>
//     <key>list</key> <array><integer>1</integer><real>2.5</real><true/><false/></array>
//     <key>when</key> <date>2026-11-20T10:00:00Z</date>
//     <key>what</key> <data>AAE=</data>
//   </dict>
//   </plist>
//
// Accepted beside that: the value without <plist> around it, comments, processing instructions, CDATA sections,
// attributes, hexadecimal integers (0x1F), nan and infinities, blanks and line ends inside numbers' and data's
// elements. A document type is skipped unread, so the only entities are the five that XML knows by itself and those
// by number. The text is UTF-8. A key given twice is a fault. Integers go from -2^63 to 2^64-1.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "plist/formats/PropertyList.h"

namespace tarn::plist {

PropertyListReading readXmlPropertyList(std::string_view text);

// The value as a document with tab indentation, dates in whole seconds, data in base64 without line breaks. Nothing for
// an absent value and, at any depth, for what a document can't hold: a text with characters that XML doesn't have, a
// date outside the years 1 to 9999.
std::optional<std::string> xmlPropertyList(const ValueView& value);

}  // namespace tarn::plist
