// JSON text of property-list values.
//
// Numbers keep their kind: a bool is true or false, an integer has no point, a float or double always reads back as one
// (10.0). What JSON can't hold is written as text or number: a date as ISO 8601 text in UTC (2026-11-20T10:00:00Z, with
// the decimals it has, at most microseconds), a date outside the years 1 to 9999 as its seconds, data as base64 text, a
// number that is not finite as the text "nan", "inf" or "-inf".
#pragma once

#include <string>

#include "plist/ValueView.h"

namespace tarn::plist {

// Appends the value as compact JSON, members in their own order.
void appendJson(std::string& out, const ValueView& value);

}  // namespace tarn::plist
