// SPDX-License-Identifier: Apache-2.0
// The keys of the registration info and of its records.
#pragma once

#include "plist/Key.h"

namespace tarn::registration {

inline const plist::Key kSplunk{"splunk"};  // the list of records, one for each accessory
// Seconds since 1970, in the info; what is published has the work week in its place, 1 to 53.
inline const plist::Key kLastConnectedEpoch{"lastConnectedEpoch"};
inline const plist::Key kLastConnectedWorkWeek{"lastConnectedWW"};

}  // namespace tarn::registration
