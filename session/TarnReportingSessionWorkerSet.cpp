#include "session/TarnReportingSessionWorkerSet.h"

#include <algorithm>
#include <array>

#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingSignpost.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr std::string_view kModule = "TarnReportingSession";

using Member = TarnReportingSessionWorkerSet::Member;

template <class... Arguments>
void debugLog(const LogText& text, const Arguments&... arguments) {
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule, text, arguments...);
}

// The three lists one behind the other, each worker at its first place.
std::vector<Member> withoutRepeats(std::initializer_list<const std::vector<Member>*> lists) {
  std::vector<Member> ordered;
  for (const std::vector<Member>* list : lists) {
    for (const Member& member : *list) {
      const bool known = std::any_of(ordered.begin(), ordered.end(),
                                     [&](const Member& other) { return other.worker == member.worker; });
      if (!known) {
        ordered.push_back(member);
      }
    }
  }
  return ordered;
}

TarnReportingSignpost call(const Member& member, std::string_view verb, std::int64_t reporterID) noexcept {
  return {SignpostCategory::Worker, member.workerClass->name, verb, {"reporterID", reporterID}};
}

bool wants(const Member& member, const TarnReportingSessionMessage& message) {
  if (!member.worker->started()) {
    return false;
  }
  if (message.isRedundant() && (member.workerClass->handleRedundantMessages == nullptr ||
                                !member.workerClass->handleRedundantMessages(*member.worker))) {
    return false;
  }
  const auto& destinations = message.destinationWorkers();
  return destinations.empty() ||
         std::find(destinations.begin(), destinations.end(), member.workerClass->name) != destinations.end();
}

}  // namespace

void TarnReportingSessionWorkerSet::startWorkersFromClasses(const TarnReportingSessionWorkerClasses::List& classes,
                                                            const std::shared_ptr<TarnReportingSession>& session) {
  for (const Class* workerClass : classes) {
    makeWorker(*workerClass, session);
  }
  startWorkers(session->reporterID());
}

void TarnReportingSessionWorkerSet::makeWorker(const Class& workerClass,
                                               const std::shared_ptr<TarnReportingSession>& session) {
  const std::int64_t reporterID = session->reporterID();
  if (session->isSingleMessageSession() &&
      (workerClass.handleSingleMessageSession == nullptr || !workerClass.handleSingleMessageSession())) {
    debugLog("Skipping TarnReportingSessionWorker for single message session. action=skipped worker=%@ reporterID=%lli",
             workerClass.name, reporterID);
    return;
  }
  if (std::find(initializedWorkerClasses_.begin(), initializedWorkerClasses_.end(), &workerClass) !=
      initializedWorkerClasses_.end()) {
    debugLog("TarnReportingSessionWorker already initialized. action=skipped worker=%@ reporterID=%lli",
             workerClass.name, reporterID);
    return;
  }
  debugLog("Initializing TarnReportingSessionWorker. action=init worker=%@ reporterID=%lli", workerClass.name,
           reporterID);
  std::unique_ptr<Worker> worker = workerClass.initWithSession(session);
  if (!worker) {
    debugLog("TarnReportingSessionWorker failed to initialize. action=failure worker=%@ reporterID=%lli",
             workerClass.name, reporterID);
    return;
  }
  const Member member{&workerClass, worker.get(),
                      workerClass.asConsumer == nullptr ? nullptr : workerClass.asConsumer(*worker)};
  owned_.push_back(std::move(worker));
  initializedWorkerClasses_.push_back(&workerClass);
  messageWorkers_.push_back(member);
  if (member.consumer != nullptr) {
    consumingMessageWorkers_.push_back(member);
  }
  if (workerClass.isProducer) {
    producingMessageWorkers_.push_back(member);
  }
  debugLog("TarnReportingSessionWorker action=added worker=%@ reporterID=%lli", workerClass.name, reporterID);
}

void TarnReportingSessionWorkerSet::startWorkers(std::int64_t reporterID) {
  const auto ordered = withoutRepeats({&consumingMessageWorkers_, &producingMessageWorkers_, &messageWorkers_});
  for (const Member& member : ordered) {
    if (member.worker->started()) {
      continue;
    }
    if (member.workerClass->start == nullptr) {
      member.worker->setStarted(true);
      continue;
    }
    {
      const TarnReportingSignpost signpost = call(member, "start", reporterID);
      member.worker->setStarted(member.workerClass->start(*member.worker));
    }
    debugLog("TarnReportingSessionWorker action=start worker=%@ started=%@ reporterID=%lli", member.workerClass->name,
             member.worker->started() ? "YES" : "NO", reporterID);
  }
}

void TarnReportingSessionWorkerSet::stopWorkers(std::int64_t reporterID) {
  const auto ordered = withoutRepeats({&producingMessageWorkers_, &consumingMessageWorkers_, &messageWorkers_});
  for (const Member& member : ordered) {
    if (!member.worker->started()) {
      continue;
    }
    if (member.workerClass->stop != nullptr) {
      const TarnReportingSignpost signpost = call(member, "stop", reporterID);
      member.workerClass->stop(*member.worker);
    }
    member.worker->setStarted(false);
    debugLog("TarnReportingSessionWorker action=stop worker=%@ reporterID=%lli", member.workerClass->name, reporterID);
  }
}

void TarnReportingSessionWorkerSet::deliver(const std::shared_ptr<TarnReportingSessionMessage>& message,
                                            std::int64_t reporterID) const {
  for (std::size_t i = 0; i < consumingMessageWorkers_.size(); ++i) {  // by index: a worker may send a message itself
    const Member& member = consumingMessageWorkers_[i];
    if (wants(member, *message)) {
      {
        const TarnReportingSignpost signpost = call(member, "handleMessage", reporterID);
        member.consumer->handleMessage(message);
      }
      debugLog("TarnReportingSessionWorker action=handleMessage worker=%@ reporterID=%lli", member.workerClass->name,
               reporterID);
    }
  }
}

}  // namespace tarn
