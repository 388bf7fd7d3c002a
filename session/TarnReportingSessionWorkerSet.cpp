// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionWorkerSet.h"

#include <algorithm>

#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingSignpost.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSession"};

using Member = TarnReportingSessionWorkerSet::Member;

// When a worker's turn comes: first one kind of workers, then the other, then those of neither kind. A worker of both
// kinds takes its earlier turn.
int turnToStart(const Member& member) {
  return member.consumer != nullptr ? 0 : member.workerClass->isProducer ? 1 : 2;
}

int turnToStop(const Member& member) {
  return member.workerClass->isProducer ? 0 : member.consumer != nullptr ? 1 : 2;
}

template <class Act>
void inTurns(const std::vector<Member>& members, int (*turnOf)(const Member&), const Act& act) {
  for (const int turn : {0, 1, 2}) {
    for (const Member& member : members) {
      if (turnOf(member) == turn) {
        act(member);
      }
    }
  }
}

// In the place of the call, where it costs a look at the switch.
[[gnu::always_inline]] inline TarnReportingSignpost call(const Member& member, std::string_view verb,
                                                         std::int64_t reporterID) noexcept {
  return {SignpostCategory::Worker, member.workerClass->name, verb, {"reporterID", reporterID}};
}

bool wants(const Member& member, const TarnReportingSessionMessage& message) {
  if (member.consumer == nullptr || !member.worker->started()) return false;
  if (message.isRedundant() && (member.workerClass->handleRedundantMessages == nullptr ||
                                !member.workerClass->handleRedundantMessages(*member.worker))) {
    return false;
  }
  return message.isFor(member.workerClass->name);
}

}  // namespace

void TarnReportingSessionWorkerSet::startWorkersFromClasses(const TarnReportingSessionWorkerClasses::List& classes,
                                                            const std::shared_ptr<TarnReportingSession>& session) {
  if (messageWorkers_.empty()) {
    messageWorkers_.reserve(classes.size());
  }
  for (const Class* workerClass : classes) {
    makeWorker(*workerClass, session);
  }
  messageWorkers_.shrink_to_fit();  // a client may have thousands of sessions
  startWorkers(session->reporterID());
}

void TarnReportingSessionWorkerSet::makeWorker(const Class& workerClass,
                                               const std::shared_ptr<TarnReportingSession>& session) {
  const std::int64_t reporterID = session->reporterID();
  if (session->isSingleMessageSession() &&
      (workerClass.handleSingleMessageSession == nullptr || !workerClass.handleSingleMessageSession())) {
    kLog(LogLevel::Debug,
         "Skipping TarnReportingSessionWorker for single message session. action=skipped worker=%@ reporterID=%lli",
         workerClass.name, reporterID);
    return;
  }
  if (holds(workerClass)) {
    kLog(LogLevel::Debug, "TarnReportingSessionWorker already initialized. action=skipped worker=%@ reporterID=%lli",
         workerClass.name, reporterID);
    return;
  }
  kLog(LogLevel::Debug, "Initializing TarnReportingSessionWorker. action=init worker=%@ reporterID=%lli",
       workerClass.name, reporterID);
  std::unique_ptr<Worker> worker = workerClass.initWithSession(session);
  if (!worker) {
    kLog(LogLevel::Debug, "TarnReportingSessionWorker failed to initialize. action=failure worker=%@ reporterID=%lli",
         workerClass.name, reporterID);
    return;
  }
  TarnReportingSessionWorkerConsumerProtocol* const consumer =
      workerClass.asConsumer == nullptr ? nullptr : workerClass.asConsumer(*worker);
  messageWorkers_.push_back({&workerClass, std::move(worker), consumer});
  kLog(LogLevel::Debug, "TarnReportingSessionWorker action=added worker=%@ reporterID=%lli", workerClass.name,
       reporterID);
}

bool TarnReportingSessionWorkerSet::holds(const Class& workerClass) const noexcept {
  return std::any_of(messageWorkers_.begin(), messageWorkers_.end(),
                     [&workerClass](const Member& member) { return member.workerClass == &workerClass; });
}

void TarnReportingSessionWorkerSet::startWorkers(std::int64_t reporterID) {
  inTurns(messageWorkers_, turnToStart, [reporterID](const Member& member) {
    if (member.worker->started()) return;
    if (member.workerClass->start == nullptr) {
      member.worker->setStarted(true);
      return;
    }
    {
      const TarnReportingSignpost signpost = call(member, "start", reporterID);
      member.worker->setStarted(member.workerClass->start(*member.worker));
    }
    kLog(LogLevel::Debug, "TarnReportingSessionWorker action=start worker=%@ started=%@ reporterID=%lli",
         member.workerClass->name, member.worker->started() ? "YES" : "NO", reporterID);
  });
}

void TarnReportingSessionWorkerSet::stopWorkers(std::int64_t reporterID) {
  inTurns(messageWorkers_, turnToStop, [reporterID](const Member& member) {
    if (!member.worker->started()) return;
    if (member.workerClass->stop != nullptr) {
      const TarnReportingSignpost signpost = call(member, "stop", reporterID);
      member.workerClass->stop(*member.worker);
    }
    member.worker->setStarted(false);
    kLog(LogLevel::Debug, "TarnReportingSessionWorker action=stop worker=%@ reporterID=%lli", member.workerClass->name,
         reporterID);
  });
}

std::size_t TarnReportingSessionWorkerSet::deliver(const std::shared_ptr<TarnReportingSessionMessage>& message,
                                                   std::int64_t reporterID) const {
  std::size_t count = 0;
  for (const Member& member : messageWorkers_) {
    if (wants(member, *message)) {
      {
        const TarnReportingSignpost signpost = call(member, "handleMessage", reporterID);
        member.consumer->handleMessage(message);
      }
      kLog(LogLevel::Debug, "TarnReportingSessionWorker action=handleMessage worker=%@ reporterID=%lli",
           member.workerClass->name, reporterID);
      ++count;
    }
  }
  return count;
}

}  // namespace tarn
