// The keys that the system itself puts into messages, interned once.
#pragma once

#include "plist/Key.h"

namespace tarn::keys {

inline const plist::Key kTimestamp{"tarnreporting_timestamp"};
inline const plist::Key kInvalidTimestamp{"invalid_timestamp"};
inline const plist::Key kAudioTag{"audiotag"};
inline const plist::Key kHostApplicationDisplayID{"HostApplicationDisplayID"};
inline const plist::Key kSystemUptime{"systemuptime_sec"};
inline const plist::Key kProcessUptime{"processuptime_ms"};

}  // namespace tarn::keys
