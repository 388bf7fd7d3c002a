// The keys of the registration info and of its records.
#pragma once

#include "plist/Key.h"

namespace tarn::registration {

inline const plist::Key kSplunk{"splunk"};  // the list of records, one for each accessory
inline const plist::Key kLastConnectedEpoch{"lastConnectedEpoch"};
inline const plist::Key kLastConnectedWorkWeek{"lastConnectedWW"};

}  // namespace tarn::registration
