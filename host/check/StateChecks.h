// SPDX-License-Identifier: Apache-2.0
// Where the service keeps its state: the directory, the recorder's file in it, and room for that. Threads: any.
#pragma once

#include "host/check/Check.h"

namespace tarn::linux_host {

// That it is there or can be made, is this user's to use and nobody's beside its owner's to change, and that what lies
// in it is its owner's.
Check checkStateDirectory(const std::string& path);
// The recorder's file: one that this service can go on with. Its head is read, and where it has a log the newest head
// there; its pages are for `tarnreportingctl check --store`.
Check checkStore(const std::string& stateDirectory, bool isRecorded);
// Whether the disk has room for what the configuration lets the recorder keep.
Check checkSpace(const std::string& stateDirectory, const HostConfiguration& configuration);

}  // namespace tarn::linux_host
