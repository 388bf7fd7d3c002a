// SPDX-License-Identifier: Apache-2.0
// The figures: each measures ours and its peers in turns and adds its rows to the table.
#pragma once

#include "bench/ServiceProcess.h"
#include "bench/Table.h"

namespace tarn::bench {

void measureRoundTripOnOneProcessor(const Settings& settings, Table& table);
void measureRoundTrip(const Settings& settings, Table& table);
void measureTurns(const Settings& settings, Table& table);
void measureStream(const Settings& settings, Table& table);
void measureGathered(const Settings& settings, Table& table);
void measureRecorded(const Settings& settings, Table& table);
void measureQueries(const Settings& settings, Table& table);
void measureTools(const Settings& settings, Table& table);
void measureFleet(const Settings& settings, Table& table);
void measureVisible(const Settings& settings, Table& table);
void measurePost(const Settings& settings, Table& table);
void measureIdle(const Settings& settings, Table& table);
void measureDecoding(const Settings& settings, Table& table);
void measureMemory(const Settings& settings, Table& table);
void measureEquality(const Settings& settings, Table& table);
void measureGrowth(const Settings& settings, Table& table);
void measureSignposts(const Settings& settings, Table& table);
void measureStop(const Settings& settings, Table& table);
void measureMirror(const Settings& settings, Table& table);
void measureTrace(const Settings& settings, Table& table);
void measureDiagnostics(const Settings& settings, Table& table);

}  // namespace tarn::bench
