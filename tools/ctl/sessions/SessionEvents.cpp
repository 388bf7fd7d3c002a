// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionEvents.h"

#include <string_view>
#include <utility>

namespace tarn::ctl {

namespace {

constexpr std::string_view kPrefix = "sys.oxbow.";
constexpr std::string_view kFirstPrefix = "sys.oxbow.tarnkit";

// ".Playback.Start" of "sys.oxbow.wisp.Playback.Start"; empty for another name.
std::string_view kindOf(std::string_view name) {
  const std::size_t end = name.starts_with(kPrefix) ? name.find('.', kPrefix.size()) : std::string_view::npos;
  return end == std::string_view::npos ? std::string_view() : name.substr(end);
}

}  // namespace

Status eachEvent(const std::filesystem::path& file, std::int64_t session, std::int64_t after,
                 const std::function<bool(recorder::EventRow&&)>& take) {
  recorder::EventReader reader(file);
  return eachEvent(reader, session, after, take);
}

Status eachEvent(recorder::EventReader& reader, std::optional<std::int64_t> session, std::int64_t after,
                 const std::function<bool(recorder::EventRow&&)>& take) {
  recorder::EventQuery query;
  query.session = session;
  query.after = after;
  for (;;) {
    Result<recorder::EventPage> page = reader.read(query);
    if (page.failed()) return page.error;
    for (recorder::EventRow& row : page.value.rows) {
      if (!take(std::move(row))) return {};
    }
    if (!page.value.more) return {};
    query.after = page.value.lookedUpTo;
  }
}

EventProgress::EventProgress(const std::vector<recorder::PeriodRow>& periods, ProgressHandler handler) {
  if (!handler || periods.empty() || !periods.front().firstEvent || !periods.back().lastEvent) return;
  first_ = *periods.front().firstEvent;
  last_ = *periods.back().lastEvent;
  if (last_ > first_) {
    handler_ = std::move(handler);
  }
}

bool MessageSieve::letsThrough(const recorder::EventRow& row) {
  if (row.backend == "rtc" && row.name == "sendMessage") return false;
  if (row.backend != "tally") return true;
  const std::string_view kind = kindOf(row.name);
  const bool isFirst = row.name.starts_with(kFirstPrefix) && !kind.empty();
  const bool repeats = !isFirst && !kind.empty() && kind == kind_ && row.payload == payload_;
  kind_ = isFirst ? kind : std::string_view();
  payload_ = isFirst ? row.payload : std::string();
  return !repeats;
}

}  // namespace tarn::ctl
