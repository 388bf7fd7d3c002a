// SPDX-License-Identifier: Apache-2.0
// The layout of the database: steps, each a file of fleet/sql, applied once and in order. Which were is in its table
// `schema_versions`.
//
// Threads: any; a database is for one at a time.
#pragma once

#include <span>
#include <string_view>

#include "fleet/collect/Database.h"

namespace tarn::fleet {

struct SchemaStep {
  int version;  // from 1 on
  std::string_view name;
  std::string_view sql;
};
// By version.
std::span<const SchemaStep> schemaSteps();

// Applies what isn't applied yet, all in one transaction while others wait; how many steps that were. The error: the
// database refuses, or its layout is of a later version than this.
Result<int> migrate(Database& database);
// Whether all is applied.
Result<bool> isMigrated(Database& database);
// For those who only ask: the error says what is wrong with the layout, and what brings it up to date.
[[nodiscard]] Status requireLayout(Database& database);

}  // namespace tarn::fleet
