// SPDX-License-Identifier: Apache-2.0
// DefaultsStore: small settings that outlive a restart, by suite (or application domain) and key.
//
// Reads see what other processes have written. A store that can't be read is logged by the platform and reads as empty.
// Threads: any.
#pragma once

#include <string_view>

#include "plist/Value.h"

namespace tarn::platform {

// Owned by the platform. A suite is named as a file is: names that can't be one hold nothing. Reading may look at a
// file; writing waits for the disk.
class DefaultsStore {
 public:
  virtual ~DefaultsStore() = default;
  // The value of `key` in `suite`; absent when there is none. Presence, text and boolean are read off the value.
  virtual plist::Value value(std::string_view suite, std::string_view key) const = 0;
  // The preference of `key` in an application domain, for the user of this name on any host; absent when there is none.
  virtual plist::Value preference(std::string_view key, std::string_view applicationDomain,
                                  std::string_view user) const = 0;
  // Stores a value; whether it is now on disk. An absent value removes the key, and that succeeds also when there was
  // none. A value that the store has no form for isn't stored. Why it failed stands in the platform's log.
  [[nodiscard]] virtual bool setValue(std::string_view suite, std::string_view key, const plist::ValueView& value) = 0;
};

}  // namespace tarn::platform
