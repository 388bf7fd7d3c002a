// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/Schema.h"

#include <string>

namespace tarn::fleet {

namespace {

// An empty database has version 0.
Result<std::int64_t> versionOf(Database& database) {
  // By a query: a look-up of the name may answer from before a lock was waited for.
  const Result<Answer> table =
      database.ask("SELECT count(*) FROM pg_class WHERE relname = 'schema_versions' AND pg_table_is_visible(oid)");
  if (table.failed()) return {0, table.error};
  if (table.value.number(0, 0) == 0) return {};
  const Result<Answer> version = database.ask("SELECT coalesce(max(version), 0) FROM schema_versions");
  if (version.failed()) return {0, version.error};
  return {version.value.number(0, 0), {}};
}

Status refuseLater(std::int64_t version) {
  const int known = schemaSteps().back().version;
  if (version <= known) return {};
  return Error{kFaultOfPlace, "database: its layout is version " + std::to_string(version) + ", and " +
                                  std::to_string(known) + " is what is known here"};
}

Result<int> applySteps(Database& database) {
  if (Status held = database.run("BEGIN; SELECT pg_advisory_xact_lock(7496301, 1)"); held.failed()) {
    return {0, std::move(held)};
  }
  const Result<std::int64_t> version = versionOf(database);
  if (version.failed()) return {0, version.error};
  if (Status refused = refuseLater(version.value); refused.failed()) return {0, std::move(refused)};
  if (Status made =
          database.run("CREATE TABLE IF NOT EXISTS schema_versions(version integer PRIMARY KEY, name text NOT "
                       "NULL, applied_at timestamptz NOT NULL DEFAULT now())");
      made.failed()) {
    return {0, std::move(made)};
  }
  int applied = 0;
  for (const SchemaStep& step : schemaSteps()) {
    if (step.version <= version.value) continue;
    if (Status done = database.run(std::string(step.sql)); done.failed()) return {0, std::move(done)};
    const Status noted = database
                             .ask("INSERT INTO schema_versions(version, name) VALUES($1::integer, $2)",
                                  {std::to_string(step.version), std::string(step.name)})
                             .error;
    if (noted.failed()) return {0, noted};
    ++applied;
  }
  return {applied, database.run("COMMIT")};
}

}  // namespace

Result<int> migrate(Database& database) {
  Result<int> applied = applySteps(database);
  if (applied.failed()) {
    database.rollBack();
  }
  return applied;
}

Result<bool> isMigrated(Database& database) {
  const Result<std::int64_t> version = versionOf(database);
  if (version.failed()) return {false, version.error};
  if (Status refused = refuseLater(version.value); refused.failed()) return {false, std::move(refused)};
  return {version.value == schemaSteps().back().version, {}};
}

Status requireLayout(Database& database) {
  const Result<std::int64_t> version = versionOf(database);
  if (version.failed()) return version.error;
  const int known = schemaSteps().back().version;
  if (version.value >= known) return refuseLater(version.value);
  const std::string is = version.value == 0 ? "it has no tables of tarnreporting-collect"
                                            : "its layout is version " + std::to_string(version.value) + ", and " +
                                                  std::to_string(known) + " is asked";
  return Error{kFaultOfPlace, "database: " + is + " (tarnreporting-collect --migrate brings it up to date)"};
}

}  // namespace tarn::fleet
