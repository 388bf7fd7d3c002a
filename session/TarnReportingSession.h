// TarnReportingSession: one reporting session of one client: its reporter ID, service type and configuration, the log
// of the messages since it was started, and the workers that turn those messages into reports.
//
// Life: created, started, stopped (as created, with an emptied log), any number of times. The workers that start on
// creation run from the first message on; the others are made at the first start. A worker that doesn't apply is asked
// again at each start.
//
// Owner: the client instance that made it (or the service, for the single-message session). Threads: the server queue.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "platform/TarnReportingServiceProtocol.h"
#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionMessageLog.h"
#include "session/TarnReportingSessionPreviousValues.h"
#include "session/TarnReportingSessionWorkerSet.h"

namespace tarn {

class TarnReportingSession : public std::enable_shared_from_this<TarnReportingSession> {
 public:
  enum class Mode {
    Ordinary,
    SingleMessage,  // for messages without a reporter ID: only the workers that accept it are made
  };
  using MessagePointer = std::shared_ptr<TarnReportingSessionMessage>;

  // Hands over the table of worker classes for as long as the facilities are installed; it must outlive every session.
  // Before the first session is made.
  static void setAllWorkerClasses(std::span<const TarnReportingSessionWorkerClass> table);
  static std::span<const TarnReportingSessionWorkerClass> getAllWorkerClasses();

  // A session with its start-on-creation workers running.
  static std::shared_ptr<TarnReportingSession> initWithID(std::int64_t reporterID,
                                                          std::vector<std::int32_t> processIdentifiers,
                                                          Mode mode = Mode::Ordinary);
  TarnReportingSession(const TarnReportingSession&) = delete;
  TarnReportingSession& operator=(const TarnReportingSession&) = delete;
  // Releases the workers without stopping them.
  ~TarnReportingSession();

  // Which workers run is not touched: the workers that need the type are made at start.
  void setServiceType(AudioServiceType serviceType);
  // Merges the dictionary into the configuration; a "KvHostApplicationDisplayID" in it also counts as the
  // "HostApplicationDisplayID" unless that is given too. Nothing happens without a dictionary.
  void updateConfigurationWithContentsOfConfiguration(const plist::Dictionary* configuration);
  void setClientProcessName(std::string name) { clientProcessName_ = std::move(name); }

  void start();
  void stop();
  // Takes a message in: stamps, cleans and tags it, tests it for redundancy, logs it and hands it to the workers; then
  // calls the reply, if there is one. How many workers got it.
  std::size_t sendMessage(const MessagePointer& message, platform::Reply<> reply = nullptr);

  // The steps of the intake; each changes the record's payload in place.
  static void addMissingDates(TarnReportingSessionMessage& message);
  static void removeWhiteSpaceFromKeys(TarnReportingSessionMessage& message);
  static void addAudioMessageTag(TarnReportingSessionMessage& message);
  void addAppName(TarnReportingSessionMessage& message) const;
  // Whether the message says what the newest logged message of its category and type said.
  bool messageIsRedundant(const TarnReportingSessionMessage& message) const;
  // The record's time stamp in epoch seconds, 0 when it has none.
  static double getEpochTimeFromTarnReportingStateMessage(const TarnReportingSessionMessage& message);

  // "reporterID=%lli,serviceName=%@,ownerPid=%li,clientProcessName=%@,HostApplicationDisplayID=%@,started=%i,
  // singleMessageSession=%i" on one line
  std::string description() const;

  bool started() const noexcept { return started_; }
  bool isSingleMessageSession() const noexcept { return mode_ == Mode::SingleMessage; }
  std::int64_t reporterID() const noexcept { return reporterID_; }
  AudioServiceType serviceType() const noexcept { return serviceType_; }
  std::string_view serviceName() const noexcept { return serviceName_; }
  const plist::Dictionary& configuration() const noexcept { return configuration_; }
  // Empty when it is not known.
  const std::string& clientProcessName() const noexcept { return clientProcessName_; }
  const std::vector<std::int32_t>& processIdentifiers() const noexcept { return processIdentifiers_; }
  // The log: what came and was not redundant since start, and the markers of start and stop.
  const TarnReportingSessionMessageList& messages() const noexcept { return log_.messages(); }
  // Where the memory of the log is counted for the session's owner.
  void setLogAccount(std::shared_ptr<TarnReportingSessionLogAccount> account) { log_.setAccount(std::move(account)); }
  const TarnReportingSessionPreviousValues& previousValues() const noexcept { return previousValues_; }
  TarnReportingSessionPreviousValues& previousValues() noexcept { return previousValues_; }
  // Messages received since the last stop, redundant ones included.
  std::int64_t totalMessageCount() const noexcept { return totalMessageCount_; }

  const TarnReportingSessionWorkerSet& workers() const noexcept { return workers_; }
  std::size_t workerInstanceCount() const noexcept { return workers_.messageWorkers().size(); }

  // The pending reply of the client's start call; kept here for the connection, never called by the session.
  platform::Acknowledge& transactionCompleteBlock() noexcept { return transactionCompleteBlock_; }

 private:
  TarnReportingSession(std::int64_t reporterID, std::vector<std::int32_t> processIdentifiers, Mode mode);
  static const TarnReportingSessionWorkerClasses& workerClasses();
  void appendMarker(AudioEventType type, std::string_view method);

  const std::int64_t reporterID_;
  const std::vector<std::int32_t> processIdentifiers_;
  const Mode mode_;
  bool started_ = false;
  AudioServiceType serviceType_ = AudioServiceType::Unknown;
  std::string_view serviceName_;
  plist::Dictionary configuration_;
  std::string clientProcessName_;
  std::int64_t totalMessageCount_ = 0;
  platform::Acknowledge transactionCompleteBlock_;
  TarnReportingSessionPreviousValues previousValues_;
  TarnReportingSessionMessageLog log_;
  TarnReportingSessionWorkerSet workers_;
};

}  // namespace tarn
