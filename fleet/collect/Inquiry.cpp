// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/Inquiry.h"

#include <utility>

#include "fleet/format/Again.h"

namespace tarn::fleet {

namespace {

// Of one look; the others have their turn when these lack nothing more.
constexpr std::size_t kMostDevices = 1000;

constexpr const char* kTakeTurn = "SELECT pg_try_advisory_xact_lock(7496301, 4)::integer";

// $1, here and below: numbers of devices, none for all.
constexpr const char* kJoinTold = R"(
WITH several AS (
  SELECT device FROM told WHERE cardinality($1::integer[]) = 0 OR device = ANY($1::integer[])
  GROUP BY device HAVING count(*) > 1),
taken AS (
  DELETE FROM told USING several WHERE told.device = several.device
  RETURNING told.device, told.first, told.last, told.left_out),
ranges AS (SELECT device, unnest(range_agg(int8range(first, last, '[]'))) AS ids FROM taken GROUP BY device),
held AS (SELECT device, range_agg(r) AS ids FROM taken, unnest(left_out) AS r GROUP BY device)
INSERT INTO told AS t
SELECT ranges.device, lower(ranges.ids), upper(ranges.ids) - 1,
    coalesce(held.ids, '{}') * int8multirange(ranges.ids)
  FROM ranges LEFT JOIN held ON held.device = ranges.device
ON CONFLICT (device, first, last) DO UPDATE SET left_out = t.left_out + excluded.left_out)";

constexpr const char* kUntold = R"(
SELECT d.name, d.id, lower(g), upper(g) - 1 FROM devices AS d
  LEFT JOIN (
    SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM told
      WHERE cardinality($1::integer[]) = 0 OR device = ANY($1::integer[]) GROUP BY device) AS t ON t.device = d.id
  CROSS JOIN unnest(int8multirange(int8range(1, greatest(upper(t.ids), d.made + 1))) - coalesce(t.ids, '{}')) AS g
  WHERE cardinality($1::integer[]) = 0 OR d.id = ANY($1::integer[])
  ORDER BY 2, 3 LIMIT 100000)";

std::string arrayOfNumbers(const std::set<std::int32_t>& numbers) {
  std::string text = "{";
  for (const std::int32_t number : numbers) {
    text += (text.size() > 1 ? "," : "") + std::to_string(number);
  }
  return text + "}";
}

}  // namespace

Result<Inquiry::Found> Inquiry::find() {
  Result<Found> found;
  const Result<Answer> turn = database_.ask(kTakeTurn);
  if (turn.failed()) return {{}, turn.error};
  found.value.isMine = turn.value.number(0, 0) != 0;
  if (!found.value.isMine) return found;
  const std::string devices = looksAtAll_ ? "{}" : arrayOfNumbers(touched_);
  if (const Status joined = database_.ask(kJoinTold, {devices}).error; joined.failed()) return {{}, joined};
  const Result<Answer> rows = database_.ask(kUntold, {devices});
  if (rows.failed()) return {{}, rows.error};
  for (int row = 0; row < rows.value.rows(); ++row) {
    const std::string name(rows.value.text(row, 0));
    if (!found.value.ranges.contains(name) && found.value.ranges.size() == kMostDevices) {
      found.value.isCut = true;
      break;
    }
    found.value.devices.insert(static_cast<std::int32_t>(rows.value.number(row, 1)));
    std::vector<recorder::IdRange>& ranges = found.value.ranges[name];
    if (ranges.size() < kMostRanges) {
      ranges.push_back({rows.value.number(row, 2), rows.value.number(row, 3)});
    }
  }
  return found;
}

Result<std::vector<LackedIds>> Inquiry::look() {
  Result<std::vector<LackedIds>> lacked;
  if (!looksAtAll_ && touched_.empty()) return lacked;
  lacked.error = database_.run("BEGIN");
  if (lacked.failed()) return lacked;
  Result<Found> found = find();
  lacked.error = found.failed() ? found.error : database_.run("COMMIT");
  if (lacked.failed()) {
    database_.rollBack();
    return lacked;
  }
  if (!found.value.isMine) return lacked;
  for (const auto& [device, ranges] : found.value.ranges) {
    std::vector<recorder::IdRange> still = commonOf(ranges, before_[device]);
    if (!still.empty()) {
      lacked.value.push_back({device, std::move(still)});
    }
  }
  before_ = std::move(found.value.ranges);
  // What didn't fit is looked for again.
  looksAtAll_ = found.value.isCut;
  touched_ = std::move(found.value.devices);
  return lacked;
}

}  // namespace tarn::fleet
