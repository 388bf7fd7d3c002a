// SPDX-License-Identifier: Apache-2.0
#include "fleet/export/ShowCommand.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>

#include "fleet/export/BatchMaker.h"
#include "fleet/export/JsonLine.h"
#include "plist/Hex.h"

namespace tarn::fleet {

namespace {

constexpr std::size_t kRowsAtOnce = 1000;
constexpr double kSecondsPerDay = 86400;
constexpr double kMicroseconds = 1e6;

void appendRun(std::string& out, const v1::Run& run) {
  JsonLine line(out, "run");
  line.number("id", run.id());
  line.text("boot", run.boot());
  line.number("started", run.started());
  line.text("version", run.version());
  if (run.has_ended()) {
    line.number("ended", run.ended());
    line.text("end_reason", run.end_reason());
  }
  line.raw("machine", run.machine());
}

void appendSession(std::string& out, const v1::Session& session, const v1::Batch& batch) {
  JsonLine line(out, "session");
  line.number("id", session.id());
  line.number("run", batch.runs(static_cast<int>(session.run())).id());
  line.text("process", session.process());
  line.text("application", session.application());
  line.number("service_type", session.service_type());
  line.text("service_name", session.service_name());
  line.number("created", session.created());
  if (session.has_ended()) {
    line.number("ended", session.ended());
    line.text("end_reason", session.end_reason());
  }
  std::string periods;
  for (const v1::Period& period : session.periods()) {
    periods += periods.empty() ? "[" : ",";
    periods += '[' + std::to_string(period.id()) + ',';
    std::array<char, 32> digits{};
    periods.append(digits.data(), std::to_chars(digits.begin(), digits.end(), period.started()).ptr);
    periods += ',';
    if (period.has_stopped()) {
      periods.append(digits.data(), std::to_chars(digits.begin(), digits.end(), period.stopped()).ptr);
    } else {
      periods += "null";
    }
    periods += ',' + std::to_string(period.messages()) + ',' + std::to_string(period.redundant()) + ']';
  }
  line.raw("periods", periods.empty() ? "[]" : periods + "]");
}

void appendEvent(std::string& out, const v1::Event& event, const v1::Batch& batch) {
  JsonLine line(out, "event");
  const v1::Kind& kind = batch.kinds(static_cast<int>(event.kind()));
  line.number("id", batch.first() + event.ahead());
  line.number("time", event.time());
  line.text("backend", kind.backend());
  line.text("name", kind.name());
  line.raw("payload", event.payload());
  line.raw("detail", kind.detail());
  if (event.session() != 0) {
    line.number("session", batch.sessions(static_cast<int>(event.session()) - 1).id());
  }
}

// What was shown.
struct Total {
  std::int64_t events = 0;
  std::int64_t messages = 0;
  std::int64_t bytes = 0;
  std::optional<double> first;
};

Status showBatch(v1::Batch& batch, MessagePacker& packer, Total& total, std::ostream& out) {
  const Result<PackedMessage> message = packer.pack(batch);
  if (message.failed()) return message.error;
  const auto unpacked = unpackMessage(message.value.bytes);
  if (unpacked.failed()) return unpacked.error;
  std::string text;
  appendBatch(text, *unpacked.value);
  out << text;
  total.events += unpacked.value->events_size();
  total.bytes += static_cast<std::int64_t>(message.value.bytes.size());
  ++total.messages;
  return {};
}

void showTotal(const Total& total, std::optional<double> since, double now, std::ostream& out) {
  std::string text;
  {
    JsonLine line(text, "total");
    line.number("events", total.events);
    line.number("messages", total.messages);
    line.number("bytes", total.bytes);
    const double begun = since.value_or(total.first.value_or(now));
    if (now > begun) {
      line.number("bytes_a_day", static_cast<std::int64_t>(
                                     std::llround(static_cast<double>(total.bytes) * kSecondsPerDay / (now - begun))));
    }
  }
  out << text;
}

}  // namespace

void appendBatch(std::string& out, const v1::Batch& batch) {
  {
    JsonLine line(out, "batch");
    std::string device;
    plist::appendHex(device, std::string_view(batch.device()));
    line.text("device", device);
    line.number("looked_at", batch.looked_at());
    line.number("first", batch.first());
    line.number("last", batch.last());
    line.number("left_out", batch.left_out());
    std::string gaps;
    for (const v1::Gap& gap : batch.gaps()) {
      gaps += gaps.empty() ? "[[" : ",[";
      gaps += std::to_string(gap.first()) + ',' + std::to_string(gap.last()) + ']';
    }
    line.raw("gaps", gaps.empty() ? "[]" : gaps + "]");
  }
  for (const v1::Run& run : batch.runs()) {
    appendRun(out, run);
  }
  for (const v1::Session& session : batch.sessions()) {
    appendSession(out, session, batch);
  }
  for (const v1::Event& event : batch.events()) {
    appendEvent(out, event, batch);
  }
}

Status showStore(StoreTail& store, PrivacySieve& sieve, const std::string& device, std::optional<double> since,
                 double now, std::ostream& out) {
  BatchMaker maker(sieve, device);
  MessagePacker packer;
  Total total;
  std::int64_t after = 0;
  sieve.setTime(now);
  if (since) {
    // From the first one on, however the clock went: what is between is told of too.
    const Result<recorder::EventPage> first = store.read(0, 1, since);
    if (first.failed()) return first.error;
    after = first.value.rows.empty() ? first.value.lookedUpTo : first.value.rows.front().id - 1;
  }
  for (bool isMore = true; isMore && out.good();) {
    const Result<recorder::EventPage> page = store.read(after, kRowsAtOnce);
    if (page.failed()) return page.error;
    if (page.value.missing || page.value.rows.empty()) break;
    if (Status looked = store.look(); looked.failed()) return looked;
    auto made = maker.make(page.value.rows, after, static_cast<std::int64_t>(now * kMicroseconds), store);
    if (made.failed()) return made.error;
    v1::Batch& batch = made.value.batch;
    if (Status shown = showBatch(batch, packer, total, out); shown.failed()) return shown;
    total.first = total.first.value_or(page.value.rows.front().time);
    isMore = page.value.more || batch.last() < page.value.rows.back().id;
    after = batch.last();
  }
  showTotal(total, since, now, out);
  return {};
}

}  // namespace tarn::fleet
