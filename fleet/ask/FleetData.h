// SPDX-License-Identifier: Apache-2.0
// What is asked of the database, and what it answers. Names and texts are what devices sent: nothing of them is
// trusted. Threads: plain data.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "fleet/ask/Ranking.h"

namespace tarn::fleet {

// From the first moment up to, but without, the second, in epoch seconds. Nothing: no bound.
struct Span {
  std::optional<double> since;
  std::optional<double> until;
};

// What was played within an hour, by all.
struct PlayedHour {
  double begin = 0;
  double seconds = 0;
  std::int64_t overloads = 0;
};

// What the collectors counted by hour.
struct PlayedParts {
  std::vector<Played> routes;
  std::vector<Played> releases;
  std::vector<Played> applications;
  std::vector<PlayedHour> hours;  // rising
};

struct SessionWish {
  Span span;  // sessions that were there at any time of it
  // See globMatches; an empty one lets everything through.
  std::string deviceGlob;
  std::string applicationGlob;
  std::string releaseGlob;
  bool open = false;      // only those of whose end no device told
  bool replaced = false;  // also those that one of another type replaced before they ever ran
  std::size_t limit = 100;
};

// A session as its device told of it last.
struct FleetSession {
  std::string device;
  std::int64_t key = 0;  // the database's, of its run
  std::int64_t run = 0;  // the device's
  std::string release;
  std::int64_t id = 0;
  std::string process;
  std::string application;
  std::int64_t serviceType = 0;
  std::string serviceName;
  double created = 0;
  std::optional<double> ended;
  std::string endReason;
  double lookedAt = 0;  // when the device looked at it
  bool running = false;
  double active = 0;  // seconds between starts and stops, until lookedAt for one that runs
  std::int64_t periods = 0;
  std::int64_t messages = 0;
  std::int64_t redundant = 0;
  std::int64_t overloads = 0;
};

// What became of all ids, of all devices together; see the view `account`.
struct FleetAccount {
  std::int64_t devices = 0;
  std::int64_t made = 0;
  std::int64_t stored = 0;
  std::int64_t gaps = 0;
  std::int64_t leftOut = 0;
  std::int64_t missing = 0;
  std::int64_t untold = 0;
  std::int64_t surplus = 0;  // things beyond the ids: where a device's store was replaced by another one
  std::int64_t refused = 0;  // messages
};

inline constexpr std::size_t kVolumeTenths = 10;

struct FleetPicture {
  Span span;
  double made = 0;  // when, epoch seconds
  bool isExact = false;
  FleetAccount account;
  std::int64_t sessions = 0;
  std::int64_t sessionDevices = 0;  // that had them
  PlayedParts played;
  std::array<double, kVolumeTenths> volumes{};               // seconds
  std::vector<std::pair<std::string, std::int64_t>> issues;  // the most first
};

}  // namespace tarn::fleet
