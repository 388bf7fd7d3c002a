#include "recorder/store/RecorderTime.h"

#include <sqlite3.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <optional>

#include "recorder/store/RowHash.h"
#include "recorder/store/Statement.h"

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
    seen_ = noted.value.last;
    begun_ = true;
  }
  const bool goesOn = noted.value.sameBoot && std::abs(noted.value.seconds - seconds()) < kTolerance;
  if (goesOn) return keep(connection);
  seen_ = now();
  return note(connection, seen_);
}

Status RecorderTime::keep(Connection& connection) {
  const Moment moment = now();
  const double wallThen = moment.wall - (moment.monotonic - seen_.monotonic);
  if (std::abs(wallThen - seen_.wall) >= kTolerance) {
    if (auto error = note(connection, {seen_.monotonic, wallThen}); error.failed()) return error;
  }
  seen_ = moment;
  return {};
}

double RecorderTime::secondsAt(double wall) const noexcept {
  std::optional<double> latest;
  for (std::size_t i = 0; i < ties_.size(); ++i) {
    if (ties_[i].wall > wall) continue;
    const double next = i + 1 < ties_.size() ? ties_[i + 1].seconds : seconds();
    const double then = std::min(ties_[i].seconds + (wall - ties_[i].wall), next);
    latest = std::max(latest.value_or(then), then);
  }
  if (latest) return *latest;
  return ties_.empty() ? seconds() : ties_.front().seconds;
}

Result<RecorderTime::Noted> RecorderTime::readNoted(Connection& connection) {
  // Of an event's group at the least: nothing may grow younger.
  const Result<std::int64_t> least = connection.readInteger(
      "SELECT coalesce((SELECT cast(seconds AS INTEGER) FROM event_groups ORDER BY first DESC LIMIT 1), 0)");
  if (least.failed()) return {{}, least.error};
  Noted noted{false, static_cast<double>(std::max<std::int64_t>(least.value, 0)), {}};
  Statement rows;
  int code = rows.prepare(connection.handle(),
                          "SELECT boot, monotonic, wall, elapsed, hash FROM recorder_times ORDER BY sequence");
  bool isSound = false;
  ties_.clear();
  for (code = code == SQLITE_OK ? rows.step() : code; code == SQLITE_ROW; code = rows.step()) {
    isSound = hashOfTimes(rows.text(0), rows.real(1), rows.real(2), rows.real(3)) == rows.integer(4);
    if (!isSound) continue;
    ties_.push_back({rows.real(2), rows.real(3)});
    noted.sameBoot = rows.text(0) == boot_;
    noted.last = {rows.real(1), rows.real(2)};
  }
  noted.sameBoot = noted.sameBoot && isSound;
  if (code != SQLITE_DONE || !isSound) return {noted, connection.errorOf(code)};
  const double since = noted.sameBoot ? std::max(monotonic() - noted.last.monotonic, 0.0) : 0.0;
  noted.seconds = std::max(noted.seconds, ties_.back().seconds + since);
  return {noted};
}

Status RecorderTime::note(Connection& connection, const Moment& moment) {
  Statement insert;
  int code = insert.prepare(connection.handle(), "INSERT INTO recorder_times VALUES(NULL, ?1, ?2, ?3, ?4, ?5)");
  if (code != SQLITE_OK) return connection.errorOf(code);
  const double elapsed = base_ + moment.monotonic;
  code = insert.bind(1, std::string_view(boot_))
             .bind(2, moment.monotonic)
             .bind(3, moment.wall)
             .bind(4, elapsed)
             .bind(5, hashOfTimes(boot_, moment.monotonic, moment.wall, elapsed))
             .run();
  if (code == SQLITE_OK) {
    code = connection.run(kForget);
  }
  if (code == SQLITE_OK) {
    ties_.push_back({moment.wall, elapsed});
  }
  return connection.errorOf(code);
}

}  // namespace tarn::recorder
