// SPDX-License-Identifier: Apache-2.0
// What a session's workers are.
//
// A session does no reporting itself: its workers look at its messages and forward, aggregate or derive something, each
// for one back-end. A worker class derives from TarnReportingSessionWorkerProtocol and, as it applies, from the
// consumer and the producer interface. It must declare
//
//   static constexpr std::string_view kClassName;                      // its own name
//   static std::unique_ptr<T> initWithSession(const std::shared_ptr<TarnReportingSession>&);
//                                                                      // nothing: the worker doesn't apply to the
//                                                                      session
// and it may declare any of
//
//   bool start();                               // whether the worker now runs
//   void stop();
//   bool handleRedundantMessages();             // of a consumer: whether it also wants repeated messages
//   static bool startOnInit();                  // whether it is made with the session, before the client starts it
//   static bool handleSingleMessageSession();   // whether it may run in the session of messages without a reporter ID
//
// The session finds out which of these a class declares (see TarnReportingSessionWorkerClass) and calls no others.
//
// Owner: the session; workers hold their session weakly. Threads: the server queue.
#pragma once

#include <memory>

namespace tarn {

class TarnReportingSession;
class TarnReportingSessionMessage;

class TarnReportingSessionWorkerProtocol {
 public:
  explicit TarnReportingSessionWorkerProtocol(std::weak_ptr<TarnReportingSession> session)
      : session_(std::move(session)) {}
  TarnReportingSessionWorkerProtocol(const TarnReportingSessionWorkerProtocol&) = delete;
  TarnReportingSessionWorkerProtocol& operator=(const TarnReportingSessionWorkerProtocol&) = delete;
  virtual ~TarnReportingSessionWorkerProtocol() = default;

  // The owning session; nothing while it is going away. A worker asked then has nobody to send to and does nothing.
  std::shared_ptr<TarnReportingSession> session() const noexcept { return session_.lock(); }
  void setSession(std::weak_ptr<TarnReportingSession> session) noexcept { session_ = std::move(session); }
  // Whether the worker runs; kept by the session. A worker whose back-end has a say in it keeps it itself.
  virtual bool started() const noexcept { return started_; }
  // The session sets it to what start() says, and to false when it has stopped the worker.
  virtual void setStarted(bool started) noexcept { started_ = started; }

 private:
  std::weak_ptr<TarnReportingSession> session_;
  bool started_ = false;
};

// A worker that receives the session's messages.
class TarnReportingSessionWorkerConsumerProtocol {
 public:
  virtual ~TarnReportingSessionWorkerConsumerProtocol() = default;
  // One message. All workers get the same record: copy it to keep or change it. Called only while the worker runs, and
  // not for messages that are redundant or addressed to others, but for what the class declares. It may send messages
  // into the session, which come back to it before the call returns.
  virtual void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) = 0;
};

// A worker that derives messages from the session's log, usually at stop, and sends them into the same session.
class TarnReportingSessionWorkerProducerProtocol {
 public:
  virtual ~TarnReportingSessionWorkerProducerProtocol() = default;
};

}  // namespace tarn
