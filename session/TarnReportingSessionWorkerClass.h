// TarnReportingSessionWorkerClass: one row of the table of worker classes, read off the class itself, so that a row
// can't disagree with its class; and the lists that the session derives from the table.
#pragma once

#include <concepts>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

struct TarnReportingSessionWorkerClass {
  using Worker = TarnReportingSessionWorkerProtocol;
  using Consumer = TarnReportingSessionWorkerConsumerProtocol;

  // The row of a worker class.
  template <std::derived_from<Worker> T>
  static constexpr TarnReportingSessionWorkerClass of();

  std::string_view name;
  // The operations that the class declares; null for those it doesn't.
  std::unique_ptr<Worker> (*initWithSession)(const std::shared_ptr<TarnReportingSession>&) = nullptr;
  bool (*startOnInit)() = nullptr;
  bool (*handleSingleMessageSession)() = nullptr;
  bool (*start)(Worker&) = nullptr;
  void (*stop)(Worker&) = nullptr;
  bool (*handleRedundantMessages)(Worker&) = nullptr;
  Consumer* (*asConsumer)(Worker&) = nullptr;  // null: no consumer
  bool isProducer = false;
};

// The process-wide lists, each in the table's order.
struct TarnReportingSessionWorkerClasses {
  using List = std::vector<const TarnReportingSessionWorkerClass*>;

  explicit TarnReportingSessionWorkerClasses(std::span<const TarnReportingSessionWorkerClass> table);

  List initializableWorkerClasses;
  List consumerWorkerClasses;
  List producerWorkerClasses;
  List startOnInitWorkerClasses;
};

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
