// The checked locks of plist/ThreadSafety.h, by the names that what stands on the platform uses.
#pragma once

#include "plist/ThreadSafety.h"

namespace tarn::platform {

using tarn::ConditionVariable;
using tarn::Mutex;
using tarn::MutexLock;

}  // namespace tarn::platform
