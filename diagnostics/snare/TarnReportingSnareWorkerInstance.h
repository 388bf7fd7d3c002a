// SPDX-License-Identifier: Apache-2.0
// What the Snare worker's fault detectors are.
//
// An instance looks for one kind of fault in a session's messages. Its class derives from
// TarnReportingSnareWorkerInstance and must declare
//
//   static constexpr std::string_view kClassName;                      // its own name
//   static std::unique_ptr<T> initWithSession(const std::shared_ptr<TarnReportingSession>&);
//                                                                      // nothing: it doesn't apply to the session
// and it may declare any of
//
//   void handleMessage(const TarnReportingSessionMessage&);   // each interesting message that is no repeat
//   void fire(const TarnReportingSessionMessage&);            // seen often enough: have the device capture
//                                                             // diagnostics, by the state's symptomReporter
//   void start();
//   void stop();
//   static bool handleSingleMessageSession();                 // whether it may run in a single-message session
//
// The worker finds out which of these a class declares (see TarnReportingSnareWorkerInstanceClass) and calls no others.
//
// Owner: the worker; instances hold the session weakly. Threads: the server queue.
#pragma once

#include <concepts>
#include <memory>
#include <string_view>
#include <utility>

namespace tarn {

class TarnReportingSession;
class TarnReportingSessionMessage;
struct WorkerInstanceState;

// What it counts is in its state, which may be shared with the instances of other sessions.
class TarnReportingSnareWorkerInstance {
 public:
  // The state isn't null.
  TarnReportingSnareWorkerInstance(std::weak_ptr<TarnReportingSession> session,
                                   std::shared_ptr<WorkerInstanceState> workerState)
      : session_(std::move(session)), workerState_(std::move(workerState)) {}
  TarnReportingSnareWorkerInstance(const TarnReportingSnareWorkerInstance&) = delete;
  TarnReportingSnareWorkerInstance& operator=(const TarnReportingSnareWorkerInstance&) = delete;
  virtual ~TarnReportingSnareWorkerInstance() = default;

  // Nothing while it is going away.
  std::shared_ptr<TarnReportingSession> session() const noexcept { return session_.lock(); }
  // The worker counts in it; the instance sets its thresholds and reads the reporter of a fire.
  WorkerInstanceState& workerState() const noexcept { return *workerState_; }
  // Whether the message tells of this fault. Asked of every message of every session: it looks and changes nothing.
  virtual bool interestedInMessage(const TarnReportingSessionMessage& message) const = 0;

 private:
  const std::weak_ptr<TarnReportingSession> session_;
  const std::shared_ptr<WorkerInstanceState> workerState_;
};

// What a class of instances is, read off the class itself.
struct TarnReportingSnareWorkerInstanceClass {
  using Instance = TarnReportingSnareWorkerInstance;

  template <std::derived_from<Instance> T>
  static constexpr TarnReportingSnareWorkerInstanceClass of();

  // kClassName: what log lines and shared states call it.
  std::string_view name;
  // Never null in a row that of() made.
  std::unique_ptr<Instance> (*initWithSession)(const std::shared_ptr<TarnReportingSession>&) = nullptr;
  // The operations that the class declares; null for those it doesn't.
  bool (*handleSingleMessageSession)() = nullptr;
  // Called after the message was counted and before the rule is asked; the fire comes after the rule.
  void (*handleMessage)(Instance&, const TarnReportingSessionMessage&) = nullptr;
  void (*fire)(Instance&, const TarnReportingSessionMessage&) = nullptr;
  // With the worker's own start and stop.
  void (*start)(Instance&) = nullptr;
  void (*stop)(Instance&) = nullptr;
};

template <std::derived_from<TarnReportingSnareWorkerInstance> T>
constexpr TarnReportingSnareWorkerInstanceClass TarnReportingSnareWorkerInstanceClass::of() {
  using Message = TarnReportingSessionMessage;
  TarnReportingSnareWorkerInstanceClass row;
  row.name = T::kClassName;
  row.initWithSession = [](const std::shared_ptr<TarnReportingSession>& session) -> std::unique_ptr<Instance> {
    return T::initWithSession(session);
  };
  if constexpr (requires {
                  { T::handleSingleMessageSession() } -> std::same_as<bool>;
                }) {
    row.handleSingleMessageSession = [] { return T::handleSingleMessageSession(); };
  }
  if constexpr (requires(T & instance, const Message& message) { instance.handleMessage(message); }) {
    row.handleMessage = [](Instance& instance, const Message& message) {
      static_cast<T&>(instance).handleMessage(message);
    };
  }
  if constexpr (requires(T & instance, const Message& message) { instance.fire(message); }) {
    row.fire = [](Instance& instance, const Message& message) { static_cast<T&>(instance).fire(message); };
  }
  if constexpr (requires(T & instance) { instance.start(); }) {
    row.start = [](Instance& instance) { static_cast<T&>(instance).start(); };
  }
  if constexpr (requires(T & instance) { instance.stop(); }) {
    row.stop = [](Instance& instance) { static_cast<T&>(instance).stop(); };
  }
  return row;
}

}  // namespace tarn
