// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/RecorderTime.h"

#include <sqlite3.h>

#include <algorithm>
#include <cmath>
#include <fstream>

#include "recorder/store/files/RowHash.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

namespace {

constexpr double kTolerance = 1;  // seconds; what adding up may lose
constexpr const char* kForget =
    "DELETE FROM recorder_times WHERE sequence <= (SELECT max(sequence) FROM recorder_times) - 100";

std::int64_t hashOfTimes(std::string_view boot, double monotonic, double wall, double elapsed) noexcept {
  RowHash hash;
  hash.add(boot);
  hash.add(monotonic);
  hash.add(wall);
  hash.add(elapsed);
  return static_cast<std::int64_t>(hash.value());
}

}  // namespace

std::string RecorderTime::currentBoot() {
  std::ifstream file("/proc/sys/kernel/random/boot_id");
  std::string boot;
  std::getline(file, boot);
  return boot;
}

double RecorderTime::monotonic() const noexcept {
  return std::chrono::duration<double>(clock_.monotonic()).count();
}

double RecorderTime::seconds() const noexcept {
  return base_ + monotonic();
}

Status RecorderTime::open(Connection& connection) {
  const Result<Noted> noted = readNoted(connection);
  if (noted.failed()) return noted.error;
  if (!begun_) {
    const double since = noted.value.sameBoot ? 0 : std::max(clock_.systemUptimeSeconds(), 0.0);
    base_ = noted.value.seconds + since - monotonic();
    begun_ = true;
  }
  const bool goesOn = noted.value.sameBoot && std::abs(noted.value.seconds - seconds()) < kTolerance;
  return goesOn ? Status() : note(connection);
}

Result<RecorderTime::Noted> RecorderTime::readNoted(Connection& connection) const {
  // Of an event's group at the least: nothing may grow younger.
  const Result<std::int64_t> least = connection.readInteger(
      "SELECT coalesce((SELECT cast(seconds AS INTEGER) FROM event_groups ORDER BY first DESC LIMIT 1), 0)");
  if (least.failed()) return {{}, least.error};
  Noted noted{false, static_cast<double>(std::max<std::int64_t>(least.value, 0))};
  Statement last;
  int code = last.prepare(connection.handle(),
                          "SELECT boot, monotonic, wall, elapsed, hash FROM recorder_times ORDER BY sequence DESC");
  if (code == SQLITE_OK) {
    code = last.step();
  }
  if (code != SQLITE_ROW) return {noted, connection.errorOf(code)};
  const bool sound = hashOfTimes(last.text(0), last.real(1), last.real(2), last.real(3)) == last.integer(4);
  if (!sound) return {noted};
  noted.sameBoot = last.text(0) == boot_;
  const double since = noted.sameBoot ? std::max(monotonic() - last.real(1), 0.0) : 0.0;
  noted.seconds = std::max(noted.seconds, last.real(3) + since);
  return {noted};
}

Status RecorderTime::note(Connection& connection) const {
  Statement insert;
  int code = insert.prepare(connection.handle(), "INSERT INTO recorder_times VALUES(NULL, ?1, ?2, ?3, ?4, ?5)");
  if (code != SQLITE_OK) return connection.errorOf(code);
  const double wall = clock_.epochSeconds();
  const double now = monotonic();
  code = insert.bind(1, std::string_view(boot_))
             .bind(2, now)
             .bind(3, wall)
             .bind(4, base_ + now)
             .bind(5, hashOfTimes(boot_, now, wall, base_ + now))
             .run();
  if (code == SQLITE_OK) {
    code = connection.run(kForget);
  }
  return connection.errorOf(code);
}

}  // namespace tarn::recorder
