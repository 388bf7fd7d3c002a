// SPDX-License-Identifier: Apache-2.0
// What the service reads before anything else: its options and the files that they name. Threads: any.
#pragma once

#include "host/check/Check.h"

namespace tarn::linux_host {

// Whether the log can go where the options say; without making the file.
Check checkOptions(const ServiceOptions& options);
// The configuration file with its drop-ins. What was read is left in `read`: the defaults where it is bad.
Check checkConfiguration(const ServiceOptions& options, HostConfiguration& read);
Check checkDeviceProperties(const ServiceOptions& options);

}  // namespace tarn::linux_host
