// SPDX-License-Identifier: Apache-2.0
// The binary format of property lists.
//
//   "bplist00"
//   objects       a mark each, its upper half the kind, its lower half a size or count; 0xF: an integer object follows
//                 with the count
//                   00 false is 08, true 09          50 ASCII text
//                   10 integer of 2^n bytes          60 UTF-16 text, counted in units of 2 bytes
//                   20 float or double               80 UID of n + 1 bytes
//                   33 date: double, seconds         A0 array: references to objects
//                      since 2001-01-01              D0 dictionary: references to its keys, then to its values
//                   40 data
//   offset table  where each object begins; a reference is an index into it
//   trailer       32 bytes: 6 unused, size of an offset, size of a reference, count of objects, the outermost
//                 object's index, where the offset table begins (8 bytes each)
//
// All numbers are big-endian; integers of 1, 2 and 4 bytes have no sign, those of 8 do, those of 16 may hold what
// 64 bits without a sign hold. A UID reads as the dictionary {"CF$UID" = n}, which is its form in XML. Null and sets
// have no place in a property list of ours and are faults, as are a key given twice, text that is none, a date that is
// not finite, and an object inside itself.
#pragma once

#include <string_view>

#include "plist/formats/PropertyList.h"

namespace tarn::plist {

PropertyListReading readBinaryPropertyList(std::string_view bytes);

}  // namespace tarn::plist
