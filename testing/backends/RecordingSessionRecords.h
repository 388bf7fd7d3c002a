// SPDX-License-Identifier: Apache-2.0
// RecordingSessionRecords: session records that keep what they are told, each call with the session whose work the
// thread did then. Fakes of back-ends and the manual queues ask it whose work is being done.
//
// Threads: one at a time; whose work a thread does is the thread's own.
#pragma once

#include <cstddef>
#include <new>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/SessionRecords.h"
#include "testing/backends/OwnMemory.h"

namespace tarn::testing {

class RecordingSessionRecords final : public platform::SessionRecords {
 public:
  using Number = platform::SessionNumber;

  // For the queues: while it lives the thread works for this session.
  class Scope {
   public:
    explicit Scope(Number session) noexcept : previous_(std::exchange(current_, session)) {}
    Scope(const Scope&) = delete;
    Scope& operator=(const Scope&) = delete;
    ~Scope() { current_ = previous_; }

   private:
    const Number previous_;
  };

  // The interface.
  Number created(const platform::SessionFacts& facts) override {
    tell("created", static_cast<Number>(facts_.size()) + 1);
    const OwnMemory own;
    facts_.push_back(facts);
    return static_cast<Number>(facts_.size());
  }
  void described(Number session, const platform::SessionFacts& facts) override {
    tell("described", session);
    const OwnMemory own;
    facts_.at(static_cast<std::size_t>(session) - 1) = facts;
  }
  void started(Number session) override { tell("started", session); }
  void repeated(Number session, const plist::Dictionary& message) override {
    tell("repeated", session);
    const OwnMemory own;
    repeated_.push_back(message);
  }
  void stopped(Number session, std::uint64_t messages, std::uint64_t redundant) override {
    const OwnMemory own;
    tell("stopped", session, " messages=" + std::to_string(messages) + " redundant=" + std::to_string(redundant));
  }
  void ended(Number session, platform::SessionEnd end) override {
    const OwnMemory own;
    tell("ended", session, " " + std::string(platform::nameOf(end)));
  }
  Number enter(Number session) noexcept override { return std::exchange(current_, session); }

  // Controls.
  // There is no memory for any call of this verb from now on; empty: there is again.
  void failAll(std::string_view verb) { failing_ = verb; }

  // Observations.
  // Whose work the calling thread does.
  static Number current() noexcept { return current_; }
  // "created 1", "described 1", "started 1", "stopped 1 messages=3 redundant=1", "ended 1 client-gone", in order.
  const std::vector<std::string>& calls() const noexcept { return calls_; }
  // Those for one session.
  std::vector<std::string> callsOf(Number session) const {
    std::vector<std::string> found;
    for (std::size_t i = 0; i < calls_.size(); ++i) {
      if (sessions_[i] == session) {
        found.push_back(calls_[i]);
      }
    }
    return found;
  }
  // The messages that were told as repeated.
  const std::vector<plist::Dictionary>& repeatedMessages() const noexcept { return repeated_; }
  // Whose work the thread did, call by call.
  const std::vector<Number>& currents() const noexcept { return currents_; }
  // What is known of a session by now.
  const platform::SessionFacts& facts(Number session) const { return facts_.at(static_cast<std::size_t>(session) - 1); }
  std::size_t sessions() const noexcept { return facts_.size(); }

 private:
  void tell(std::string_view verb, Number session, std::string_view rest = {}) {
    const OwnMemory own;
    if (verb == failing_) throw std::bad_alloc();
    calls_.push_back(std::string(verb) + " " + std::to_string(session) + std::string(rest));
    sessions_.push_back(session);
    currents_.push_back(current_);
  }

  static inline thread_local Number current_ = 0;
  std::string_view failing_;
  std::vector<std::string> calls_;
  std::vector<Number> sessions_;  // call by call
  std::vector<Number> currents_;
  std::vector<platform::SessionFacts> facts_;
  std::vector<plist::Dictionary> repeated_;
};

}  // namespace tarn::testing
