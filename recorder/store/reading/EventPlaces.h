// SPDX-License-Identifier: Apache-2.0
// EventPlaces: where in a large file the events lie that a query asks for, without going through all of them.
//
// How: kinds and spans are written anew every few hundred events, and blocks of a thousand know their times (see
// EventTable). What that tells are ranges of ids that hold all that is asked for and little else. Threads: the
// connection's.
#pragma once

#include <vector>

#include "plist/Result.h"
#include "recorder/store/StoreCheck.h"
#include "recorder/store/StoreLayout.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

struct EventQuery;

// The function matches_glob(pattern, text) for this connection's statements; what fails shows where one needs it.
void addGlobFunction(Connection& connection);
// Prepares the query's rows within a range of ids: ?1 and ?2 are its ends, ?3 is the most. The query outlives the
// statement. SQLite's result code.
[[nodiscard]] int prepareRows(Connection& connection, const EventSelect& events, const EventQuery& query,
                              Statement& rows);
// Ranges within `ids`, rising, outside which no event of a file of the current layout is what the query asks for. The
// error is the connection's.
[[nodiscard]] Result<std::vector<IdRange>> findPlaces(Connection& connection, const EventQuery& query, IdRange ids);

}  // namespace tarn::recorder
