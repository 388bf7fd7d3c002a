// SPDX-License-Identifier: Apache-2.0
// The keys that the system itself puts into messages, interned once.
//
// Workers look at several of these with every message; a key that is interned compares by its address.
#pragma once

#include "plist/Key.h"

namespace tarn::keys {

// Epoch seconds of the event, with a fraction. Every logged message has it.
inline const plist::Key kTimestamp{"tarnreporting_timestamp"};
// What stood in place of a time stamp that the intake replaced; "nil" when there was none.
inline const plist::Key kInvalidTimestamp{"invalid_timestamp"};
// Strings of category and type in one, for readers that know no numbers.
inline const plist::Key kAudioTag{"audiotag"};
// The application that the client reports for.
inline const plist::Key kHostApplicationDisplayID{"HostApplicationDisplayID"};
// Whole seconds since the machine started, and milliseconds of processor time that a process has used. They differ from
// message to message, so the redundancy rule leaves both out, as it does the time stamp.
inline const plist::Key kSystemUptime{"systemuptime_sec"};
inline const plist::Key kProcessUptime{"processuptime_ms"};

}  // namespace tarn::keys
