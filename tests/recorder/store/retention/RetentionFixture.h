// SPDX-License-Identifier: Apache-2.0
// RetentionFixture: the recorder's file under retention, one transaction at a time, with sessions of several users.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "recorder/store/EventFile.h"
#include "recorder/store/StoreReport.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {

constexpr double kDay = 86'400;

// An event as a test hands it over. The uid -1 is nobody's.
struct Handed {
  std::int64_t uid = -1;
  std::string backend = "tally";
  std::string name = "sys.oxbow.tarnkit.Playback.Start";
  std::string payload = "{}";
  std::string detail = "{}";
  bool repeatsPayload = false;
};

class RetentionFixture : public RecorderFixture {
 protected:
  static constexpr std::int64_t kCap = std::int64_t{1} << 20;

  // Opens the file, as a run that begins now.
  void open() {
    events_.emplace(file(), limits_, clock_, "boot");
    const Status opened = events_->open();
    ASSERT_TRUE(opened.ok()) << opened->text;
    ASSERT_TRUE(events_->beginRun({}).ok());
    sessions_.clear();
    lastSession_ = 0;
  }
  void close() {
    events_->close();
    events_.reset();
  }
  // As a process that ends without a word leaves it.
  void abandon() {
    events_->closeAfterFault();
    events_.reset();
  }
  // A new session of a user, from the next transaction's beginning on.
  platform::SessionNumber createSession(std::int64_t uid) {
    SessionNote note;
    note.session = ++lastSession_;
    note.facts.uid = static_cast<std::uint32_t>(uid);
    EXPECT_TRUE(events_->append(note).ok());
    return note.session;
  }
  platform::SessionNumber sessionOf(std::int64_t uid) {
    if (uid < 0) return 0;
    platform::SessionNumber& session = sessions_[uid];
    session = session == 0 ? createSession(uid) : session;
    return session;
  }
  // Within a transaction.
  void append(const Handed& event) { append(event, sessionOf(event.uid)); }
  void append(const Handed& event, platform::SessionNumber session) {
    const Status appended = events_->append(
        {clock_.epochSeconds(), event.backend, event.name, event.payload, event.detail}, event.repeatsPayload, session);
    ASSERT_TRUE(appended.ok()) << appended->text;
  }
  // One transaction with these, and what retention makes of it; how many events went.
  std::uint64_t commit(const std::vector<Handed>& events) {
    EXPECT_TRUE(events_->begin().ok());
    for (const Handed& event : events) {
      append(event);
    }
    return endTransaction();
  }
  std::uint64_t endTransaction() {
    const std::uint64_t before = events_->expired();
    const Status expired = events_->expire(std::chrono::steady_clock::time_point::max());
    EXPECT_TRUE(expired.ok()) << expired->text;
    EXPECT_TRUE(events_->commit().ok());
    return events_->expired() - before;
  }
  // So many messages of a user, each with a text of so many bytes, twenty a transaction.
  void send(std::int64_t uid, int count, std::size_t bytes = 1000) {
    for (int sent = 0; sent < count;) {
      std::vector<Handed> events;
      for (int n = 0; n < 20 && sent < count; ++n, ++sent) {
        events.push_back(message(uid, bytes));
      }
      commit(events);
    }
  }
  Handed message(std::int64_t uid, std::size_t bytes) {
    Handed event{uid};
    event.payload = R"({"text":")" + std::to_string(++serial_) + std::string(bytes, 'x') + "\"}";
    return event;
  }
  static Handed summary(std::int64_t uid, std::string_view payload = R"({"play_seconds":1})") {
    return {uid, "tally", "sys.oxbow.tarnkit.Volume.Summary", std::string(payload)};
  }

  std::int64_t number(const std::string& sql) { return std::stoll(askOne(file(), sql)); }
  std::int64_t countOf(std::int64_t uid) {
    return number("SELECT count(*) FROM event_rows WHERE session IN (SELECT id FROM sessions WHERE uid = " +
                  std::to_string(uid) + ")");
  }
  // What the events of a user say, in bytes.
  std::int64_t bytesOf(std::int64_t uid) {
    return number(
        "SELECT coalesce(sum(64 + length(backend) + length(name) + length(payload) + length(detail)), 0) FROM events "
        "WHERE session IN (SELECT id FROM sessions WHERE uid = " +
        std::to_string(uid) + ")");
  }
  // Every event that isn't removed is whole, and nothing stands in the file that no event needs.
  void expectWhole() {
    const auto report = inspectStore(file());
    ASSERT_TRUE(report.ok()) << report.error->text;
    EXPECT_TRUE(report.value.isWhole()) << report.value.damage << " lost " << textOf(report.value.lost) << " unproven "
                                        << textOf(report.value.unproven);
    EXPECT_EQ(report.value.whole, number("SELECT count(*) FROM event_rows"));
    EXPECT_EQ(number("SELECT count(*) FROM events"), number("SELECT count(*) FROM event_rows"));
    EXPECT_EQ(askOne(file(),
                     "WITH used AS (SELECT 2 * (id - kind) + 1 AS text FROM event_rows UNION SELECT 2 * (id - "
                     "payload) FROM event_rows WHERE payload IS NOT NULL) SELECT count(*) FROM event_texts "
                     "WHERE id NOT IN (SELECT text FROM used)"),
              "0")
        << "texts that nobody names";
    EXPECT_EQ(askOne(file(),
                     "SELECT count(*) FROM session_spans AS s WHERE NOT EXISTS (SELECT 1 FROM event_rows AS r "
                     "WHERE r.id BETWEEN s.first AND s.first + 255 AND r.session = s.session)"),
              "0")
        << "spans without an event";
    EXPECT_EQ(number("SELECT sum(length(hashes) / 8 - 1) FROM event_groups"), number("SELECT count(*) FROM event_rows"))
        << "checksums of nothing";
    EXPECT_EQ(number("SELECT count(*) FROM events WHERE session IS NOT NULL"),
              number("SELECT count(*) FROM event_rows WHERE session IS NOT NULL"));
  }

  RetentionLimits limits_{kCap, 30 * kDay, 120 * kDay};
  std::optional<EventFile> events_;
  std::map<std::int64_t, platform::SessionNumber> sessions_;
  platform::SessionNumber lastSession_ = 0;
  std::int64_t serial_ = 0;
};

}  // namespace tarn::recorder
