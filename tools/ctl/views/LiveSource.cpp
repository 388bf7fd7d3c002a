// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/views/LiveSource.h"

#include <chrono>
#include <utility>

#include "recorder/store/rows/Statement.h"
#include "tools/report/Message.h"

namespace tarn::ctl {

namespace {

// Before the first look nobody has counted; so far back it looks for last messages.
constexpr std::int64_t kFirstLook = 20000;
constexpr std::int64_t kMostSessions = 1000;

// max(id) makes the other columns those of its row.
constexpr const char* kSelectMessages =
    "SELECT session, count(*), name, time, max(id) FROM events WHERE id > ?1 AND id <= ?2 AND session IS NOT NULL AND "
    "backend = 'tally' AND name >= 'sys.oxbow.tarnkit.' AND name < 'sys.oxbow.tarnkit/' GROUP BY session";
constexpr const char* kSelectOpen =
    "SELECT id, reporter, pid, process, application, service_name, created FROM sessions WHERE ended IS NULL "
    "ORDER BY id DESC LIMIT ?1";

template <class Clock>
double secondsOf() {
  return std::chrono::duration<double>(Clock::now().time_since_epoch()).count();
}

}  // namespace

TopSample LiveSource::look() {
  TopSample sample;
  askStatus(sample);
  sample.steady = secondsOf<std::chrono::steady_clock>();
  sample.time = secondsOf<std::chrono::system_clock>();
  const Status read = readSessions(sample);
  if (read.failed()) {
    sample.sessions.clear();
    sample.storeTrouble = read->text;
  }
  return sample;
}

void LiveSource::askStatus(TopSample& sample) {
  if (!client_ || !client_->connected()) {
    Reached reached = reachService(address_);
    client_ = std::move(reached.client);
    socket_ = std::move(reached.socket);
    sample.whyNot = std::move(reached.complaint);
    if (!client_) return;
  }
  const client::Reply reply = client_->call(client::status(), address_.timeout);
  if (reply.ok()) {
    sample.status = reply.dictionary();
    return;
  }
  sample.whyNot = reply.outcome == client::Outcome::TimedOut
                      ? silenceText(socket_, address_.timeout)
                      : "no answer from the service at " + socket_ + ": " + reply.error.text;
  client_.reset();
}

Status LiveSource::readSessions(TopSample& sample) {
  report::StoreMoment store(store_);
  std::map<std::int64_t, std::int64_t> counts;
  if (const Status error = store.open(); error.failed()) return error;
  if (const Status error = readMessages(store, counts); error.failed()) return error;
  if (const Status error = readOpen(store, counts, sample); error.failed()) return error;
  countedTo_ = newest_;
  return {};
}

Status LiveSource::readMessages(report::StoreMoment& store, std::map<std::int64_t, std::int64_t>& counts) {
  Status error = store.each(
      "SELECT coalesce(max(id), 0) FROM events", [](recorder::Statement&) {},
      [&](const recorder::Statement& row) { newest_ = row.integer(0); });
  if (error.failed()) return error;
  if (countedTo_ && newest_ < *countedTo_) {
    countedTo_.reset();
    last_.clear();
  }
  const std::int64_t from = countedTo_.value_or(newest_ - kFirstLook);
  return store.each(
      kSelectMessages, [&](recorder::Statement& rows) { rows.bind(1, from).bind(2, newest_); },
      [&](const recorder::Statement& row) {
        counts[row.integer(0)] = row.integer(1);
        last_[row.integer(0)] = {std::string(row.text(2).substr(report::kMessagePrefix.size())), row.real(3)};
      });
}

Status LiveSource::readOpen(report::StoreMoment& store, const std::map<std::int64_t, std::int64_t>& counts,
                            TopSample& sample) {
  std::map<std::int64_t, Last> last;
  const auto take = [&](const recorder::Statement& row) {
    OpenSession session;
    session.id = row.integer(0);
    session.reporter = row.integer(1);
    session.pid = row.integer(2);
    session.process = row.text(3);
    session.application = row.text(4);
    session.serviceName = row.text(5);
    session.created = row.real(6);
    if (countedTo_) {
      const auto count = counts.find(session.id);
      session.newMessages = count == counts.end() ? 0 : count->second;
    }
    if (const auto known = last_.find(session.id); known != last_.end()) {
      session.lastMessage = known->second.name;
      session.lastTime = known->second.time;
      last.insert(*known);
    }
    sample.sessions.push_back(std::move(session));
  };
  Status error = store.each(
      kSelectOpen, [](recorder::Statement& rows) { rows.bind(1, kMostSessions); }, take);
  if (error.ok()) {
    last_ = std::move(last);
  }
  return error;
}

}  // namespace tarn::ctl
