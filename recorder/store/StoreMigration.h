// SPDX-License-Identifier: Apache-2.0
// StoreMigration: brings a file of an older layout to the current one. Owner: the event file. Threads: the writer's.
#pragma once

#include <cstdint>

#include "plist/Result.h"
#include "recorder/store/rows/Connection.h"

namespace tarn::recorder {

// From version 0, whose tables are checked and whose notes are there; how many events it had. One transaction: whatever
// ends the process, the file is either the old one or the new one. Ids, times and checksums stay as they are, and what
// a checksum says isn't as it was written, stays so. Events lose their place in the old table as they get one in the
// new ones, so the database doesn't grow; its log takes about as much as the events until it is brought in. A disk
// without room for that is as one that is full: the old file stays, and the next opening tries again.
[[nodiscard]] Result<std::int64_t> migrate(Connection& connection);

}  // namespace tarn::recorder
