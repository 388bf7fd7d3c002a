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
// elements. A document type is passed over unread, so the only entities are the five that XML knows by itself and those
// by number. The text is UTF-8. A key given twice is a fault. Integers go from -2^63 to 2^64-1.
#pragma once

#include <string_view>

#include "plist/formats/PropertyList.h"

namespace tarn::plist {

PropertyListReading readXmlPropertyList(std::string_view text);

}  // namespace tarn::plist
