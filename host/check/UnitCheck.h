// SPDX-License-Identifier: Apache-2.0
// Whether the unit that the service manager starts means the files that are checked. Threads: any.
#pragma once

#include "host/check/Check.h"

namespace tarn::linux_host {

// The unit with its drop-ins, read as files: the manager isn't asked. What the unit leaves out has the service's
// default.
Check checkUnit(const CheckSubject& subject);

}  // namespace tarn::linux_host
