// SPDX-License-Identifier: Apache-2.0
// A fleet that never was: what its devices would send, the same for the same seed, and what must come of it.
#pragma once

#include <algorithm>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "fleet/format/Message.h"

namespace tarn::testing {

struct FleetShape {
  int devices = 10;
  int ids = 1000;     // of each device
  int batch = 200;    // ids of a message
  double repeat = 0;  // the share of messages that come again, half of them with other borders
  std::uint64_t seed = 1;
  double begin = 1795000000;  // its first event's time, in seconds since 1970
};

// What must be asked back.
struct FleetTruth {
  std::int64_t made = 0, events = 0, gaps = 0, leftOut = 0, sessions = 0, overloads = 0, messages = 0;
  double playSeconds = 0;
};

class MadeUpFleet {
 public:
  explicit MadeUpFleet(const FleetShape& shape) : shape_(shape), random_(shape.seed) {
    for (int device = 0; device < shape_.devices; ++device) {
      makeDevice();
    }
    makePlan();
  }

  const FleetTruth& truth() const noexcept { return truth_; }
  std::size_t messages() const noexcept { return plan_.size(); }
  fleet::v1::Batch batch(std::size_t message) const {
    return batchOf(plan_[message].device, plan_[message].first, plan_[message].last);
  }
  // Two that are the same but for their number are repeats.
  int number(std::size_t message) const noexcept { return plan_[message].number; }

 private:
  enum class Fate : std::uint8_t { Event, LeftOut, Gone };
  struct Planned {
    std::size_t device = 0;
    std::int64_t first = 0, last = 0;
    int number = 0;
  };

  static constexpr std::int64_t kSessionIds = 50;

  std::uint64_t roll(std::uint64_t below) { return random_() % below; }
  // The same for the same record, whenever it is asked.
  static std::uint64_t hashOf(std::size_t device, std::int64_t id) {
    std::uint64_t x = device * 1'000'003 + static_cast<std::uint64_t>(id) + 0x9E3779B97F4A7C15U;
    x = (x ^ (x >> 30U)) * 0xBF58476D1CE4E5B9U;
    x = (x ^ (x >> 27U)) * 0x94D049BB133111EBU;
    return x ^ (x >> 31U);
  }
  bool isVolume(std::int64_t id) const { return id % 10 == 3; }
  bool isOverload(std::int64_t id) const { return id % 37 == 5 && !isVolume(id); }
  static double played(std::uint64_t hash) { return 0.25 * static_cast<double>(hash % 400); }

  void makeDevice() {
    std::vector<Fate>& fates = fates_.emplace_back(1, Fate::Gone);
    while (static_cast<int>(fates.size()) <= shape_.ids) {
      const std::uint64_t dice = roll(100);
      if (dice < 92) {
        fates.push_back(Fate::Event);
      } else if (dice < 97) {
        fates.push_back(Fate::LeftOut);
      } else {
        fates.insert(fates.end(), 1 + roll(20), Fate::Gone);
      }
    }
    fates.resize(static_cast<std::size_t>(shape_.ids) + 1);
    count(fates_.size() - 1);
  }
  void count(std::size_t device) {
    const std::vector<Fate>& fates = fates_[device];
    std::int64_t session = 0;
    for (std::int64_t id = 1; id < static_cast<std::int64_t>(fates.size()); ++id) {
      ++truth_.made;
      const Fate fate = fates[static_cast<std::size_t>(id)];
      truth_.leftOut += fate == Fate::LeftOut ? 1 : 0;
      truth_.gaps += fate == Fate::Gone ? 1 : 0;
      if (fate != Fate::Event) continue;
      ++truth_.events;
      truth_.overloads += isOverload(id) ? 1 : 0;
      truth_.playSeconds += isVolume(id) ? played(hashOf(device, id)) : 0;
      if (const std::int64_t its = sessionOf(id); its > session) {
        session = its;
        ++truth_.sessions;
      }
    }
  }
  // 0 for nobody's, which every ninth is.
  static std::int64_t sessionOf(std::int64_t id) { return id % 9 == 0 ? 0 : 1 + id / kSessionIds; }

  void makePlan() {
    int number = 0;
    for (std::size_t device = 0; device < fates_.size(); ++device) {
      for (std::int64_t first = 1; first <= shape_.ids; first += shape_.batch) {
        const std::int64_t last = std::min<std::int64_t>(first + shape_.batch - 1, shape_.ids);
        plan_.push_back({device, first, last, number++});
        if (static_cast<double>(roll(1'000'000)) < shape_.repeat * 1e6) {
          const std::int64_t shift = roll(2) == 0 ? 0 : shape_.batch / 2;
          plan_.push_back({device, first + shift, std::min<std::int64_t>(last + shift, shape_.ids), number++});
          if (plan_.back().first > plan_.back().last) {
            plan_.pop_back();
          }
        }
      }
    }
    std::shuffle(plan_.begin(), plan_.end(), random_);
    truth_.messages = static_cast<std::int64_t>(plan_.size());
  }

  fleet::v1::Batch batchOf(std::size_t device, std::int64_t first, std::int64_t last) const {
    fleet::v1::Batch batch;
    std::string name(fleet::kDeviceBytes, '\x5a');
    name[0] = static_cast<char>(device & 0xFFU);
    name[1] = static_cast<char>((device >> 8U) & 0xFFU);
    name[2] = static_cast<char>((device >> 16U) & 0xFFU);
    batch.set_device(name);
    batch.set_first(first);
    batch.set_last(last);
    // Of two states of a session the one with the later ids is the later one.
    batch.set_looked_at(1'795'000'000'000'000 + last);
    addKinds(batch);
    const std::vector<Fate>& fates = fates_[device];
    for (std::int64_t id = first; id <= last; ++id) {
      const Fate fate = fates[static_cast<std::size_t>(id)];
      if (fate == Fate::LeftOut) {
        batch.set_left_out(batch.left_out() + 1);
      } else if (fate == Fate::Event) {
        addEvent(batch, device, id, last);
      } else if (batch.gaps_size() > 0 && batch.gaps(batch.gaps_size() - 1).last() == id - 1) {
        batch.mutable_gaps(batch.gaps_size() - 1)->set_last(id);
      } else {
        fleet::v1::Gap& gap = *batch.add_gaps();
        gap.set_first(id);
        gap.set_last(id);
      }
    }
    return batch;
  }
  static void addKinds(fleet::v1::Batch& batch) {
    for (const char* const name : {"Volume.Summary", "IO.Error", "Playback.Start"}) {
      fleet::v1::Kind& kind = *batch.add_kinds();
      kind.set_backend("tally");
      kind.set_name(std::string("sys.oxbow.tarnkit.") + name);
      kind.set_detail("{}");
    }
  }
  void addEvent(fleet::v1::Batch& batch, std::size_t device, std::int64_t id, std::int64_t last) const {
    const std::uint64_t hash = hashOf(device, id);
    fleet::v1::Event& event = *batch.add_events();
    event.set_ahead(static_cast<std::uint32_t>(id - batch.first()));
    // Three days of devices, and now and then a clock that was ten days behind.
    event.set_time(shape_.begin + static_cast<double>(device % 3) * 86400 + static_cast<double>(id) * 2.5 -
                   (hash % 97 == 0 ? 864000 : 0));
    event.set_kind(isVolume(id) ? 0 : isOverload(id) ? 1 : 2);
    const std::string who = R"("HostApplicationDisplayID":"0:app)" + std::to_string(hash % 5) +
                            R"(","active_devices":"0:route)" + std::to_string((hash >> 8U) % 4) + '"';
    if (isVolume(id)) {
      event.set_payload("{" + who + R"(,"play_seconds":)" + std::to_string(played(hash)) + R"(,"KvSessionVolume":)" +
                        std::to_string(static_cast<double>((hash >> 16U) % 17) / 16) + R"(,"msgidx":1,"msgcnt":1})");
    } else if (isOverload(id)) {
      event.set_payload("{" + who +
                        R"(,"audiotag":"IOError","issue_type":"overload","smallest_buffer_frame_size":512})");
    } else {
      event.set_payload("{" + who + R"(,"audiotag":"PlaybackStart","session_output_running":true})");
    }
    event.set_session(sessionNumber(batch, device, sessionOf(id), last));
  }
  std::uint32_t sessionNumber(fleet::v1::Batch& batch, std::size_t device, std::int64_t session,
                              std::int64_t last) const {
    if (session == 0) return 0;
    for (int i = batch.sessions_size(); i > 0; --i) {
      if (batch.sessions(i - 1).id() == session) return static_cast<std::uint32_t>(i);
    }
    if (batch.runs_size() == 0) {
      fleet::v1::Run& run = *batch.add_runs();
      run.set_id(1);
      run.set_boot("boot" + std::to_string(device));
      run.set_version("1." + std::to_string(device % 3));
      run.set_started(shape_.begin - 100);
      run.set_machine(R"({"release":"12"})");
    }
    fleet::v1::Session& made = *batch.add_sessions();
    made.set_id(session);
    made.set_process("player");
    made.set_application("0:app");
    made.set_service_type(7);
    made.set_service_name("longformaudio");
    made.set_created(shape_.begin + static_cast<double>(session));
    fleet::v1::Period& period = *made.add_periods();
    period.set_id(session);
    period.set_started(shape_.begin + static_cast<double>(session));
    // It has ended when a later look finds it so.
    if (last >= session * kSessionIds) {
      made.set_ended(shape_.begin + static_cast<double>(session) + 60);
      made.set_end_reason("stopped");
      period.set_stopped(shape_.begin + static_cast<double>(session) + 60);
      period.set_messages(kSessionIds);
    }
    return static_cast<std::uint32_t>(batch.sessions_size());
  }

  const FleetShape shape_;
  std::mt19937_64 random_;
  std::vector<std::vector<Fate>> fates_;  // by device, then by id
  std::vector<Planned> plan_;
  FleetTruth truth_;
};

}  // namespace tarn::testing
