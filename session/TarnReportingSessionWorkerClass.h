// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionWorkerClass: one row of the table of worker classes, read off the class itself, so that a row
// can't disagree with its class; and the lists that the session derives from the table.
//
// An operation that is misspelled or has other types counts as not declared, without a word of the compiler.
//
// Threads: any; rows are constants of the program.
#pragma once

#include <concepts>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// Plain pointers to functions, which cast back to the class: a row needs no object and a call no look-up.
struct TarnReportingSessionWorkerClass {
  using Worker = TarnReportingSessionWorkerProtocol;
  using Consumer = TarnReportingSessionWorkerConsumerProtocol;

  // The row of a worker class. Fails to compile when the class has no kClassName.
  template <std::derived_from<Worker> T>
  static constexpr TarnReportingSessionWorkerClass of();

  // kClassName: what log lines, signposts and destinations of messages call the worker.
  std::string_view name;
  // The operations that the class declares; null for those it doesn't.
  std::unique_ptr<Worker> (*initWithSession)(const std::shared_ptr<TarnReportingSession>&) = nullptr;
  // Asked once, when the lists are made.
  bool (*startOnInit)() = nullptr;
  // Asked whenever the workers of a single-message session are made.
  bool (*handleSingleMessageSession)() = nullptr;
  bool (*start)(Worker&) = nullptr;
  void (*stop)(Worker&) = nullptr;
  // Asked for each redundant message, so a worker may change its mind.
  bool (*handleRedundantMessages)(Worker&) = nullptr;
  // The same worker, seen as a consumer.
  Consumer* (*asConsumer)(Worker&) = nullptr;  // null: no consumer
  bool isProducer = false;
};

// The process-wide lists, each in the table's order. Made once and read only from then on; they point into the table.
struct TarnReportingSessionWorkerClasses {
  using List = std::vector<const TarnReportingSessionWorkerClass*>;

  // A class without initWithSession is in none of them and told at debug level.
  explicit TarnReportingSessionWorkerClasses(std::span<const TarnReportingSessionWorkerClass> table);

  // All that can be made; the others are parts of this one.
  List initializableWorkerClasses;
  List consumerWorkerClasses;
  List producerWorkerClasses;
  // Those that a session makes and starts before its client starts it.
  List startOnInitWorkerClasses;
};

// Each operation is looked for by the expression by which the session calls it and, but for initWithSession, with its
// exact result. What is found is wrapped into a function on the base class; what isn't leaves null.
template <std::derived_from<TarnReportingSessionWorkerProtocol> T>
constexpr TarnReportingSessionWorkerClass TarnReportingSessionWorkerClass::of() {
  TarnReportingSessionWorkerClass row;
  row.name = T::kClassName;
  if constexpr (requires(const std::shared_ptr<TarnReportingSession>& session) { T::initWithSession(session); }) {
    row.initWithSession = [](const std::shared_ptr<TarnReportingSession>& session) -> std::unique_ptr<Worker> {
      return T::initWithSession(session);
    };
  }
  if constexpr (requires {
                  { T::startOnInit() } -> std::same_as<bool>;
                }) {
    row.startOnInit = [] { return T::startOnInit(); };
  }
  if constexpr (requires {
                  { T::handleSingleMessageSession() } -> std::same_as<bool>;
                }) {
    row.handleSingleMessageSession = [] { return T::handleSingleMessageSession(); };
  }
  if constexpr (requires(T & worker) {
                  { worker.start() } -> std::same_as<bool>;
                }) {
    row.start = [](Worker& worker) { return static_cast<T&>(worker).start(); };
  }
  if constexpr (requires(T & worker) {
                  { worker.stop() } -> std::same_as<void>;
                }) {
    row.stop = [](Worker& worker) { static_cast<T&>(worker).stop(); };
  }
  if constexpr (requires(T & worker) {
                  { worker.handleRedundantMessages() } -> std::same_as<bool>;
                }) {
    row.handleRedundantMessages = [](Worker& worker) { return static_cast<T&>(worker).handleRedundantMessages(); };
  }
  if constexpr (std::derived_from<T, Consumer>) {
    row.asConsumer = [](Worker& worker) -> Consumer* { return &static_cast<T&>(worker); };
  }
  row.isProducer = std::derived_from<T, TarnReportingSessionWorkerProducerProtocol>;
  return row;
}

}  // namespace tarn
