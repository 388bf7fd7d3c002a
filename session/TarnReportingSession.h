// SPDX-License-Identifier: Apache-2.0
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
#include <utility>
#include <vector>

#include "platform/TarnReportingServiceProtocol.h"
#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionChronicle.h"
#include "session/TarnReportingSessionMessageLog.h"
#include "session/TarnReportingSessionPreviousValues.h"
#include "session/TarnReportingSessionTags.h"
#include "session/TarnReportingSessionWorkerSet.h"

namespace tarn {

// What makes, types, configures, starts or stops a session ends the process when it is called outside the server queue;
// the intake only asserts it. Nothing fails: what clients send is repaired or taken as it is. A message costs its
// intake and its workers, however long the log is; a stop costs the log.
class TarnReportingSession : public std::enable_shared_from_this<TarnReportingSession> {
 public:
  enum class Mode {
    Ordinary,
    SingleMessage,  // for messages without a reporter ID: only the workers that accept it are made
  };
  using MessagePointer = std::shared_ptr<TarnReportingSessionMessage>;
  using Opener = TarnReportingSessionOpener;

  // Hands over the table of worker classes for as long as the facilities are installed; it must outlive every session.
  // Before the first session is made. The lists that sessions go by are derived when the first one is made. A later
  // call replaces both, for sessions that are made or started from then on.
  static void setAllWorkerClasses(std::span<const TarnReportingSessionWorkerClass> table);
  // The table that was handed over; empty before.
  static std::span<const TarnReportingSessionWorkerClass> getAllWorkerClasses();

  // A session with its start-on-creation workers running. It has no service type (65535), no configuration, and the
  // opener's name for its client's. `processIdentifiers` are those that the session reports for, the owner's first.
  // Logs the ID at info level. The session records are told of every session but a single-message one: no client opened
  // that.
  static std::shared_ptr<TarnReportingSession> initWithID(std::int64_t reporterID,
                                                          std::vector<std::int32_t> processIdentifiers,
                                                          Mode mode = Mode::Ordinary, const Opener& opener = {});
  TarnReportingSession(const TarnReportingSession&) = delete;
  TarnReportingSession& operator=(const TarnReportingSession&) = delete;
  // Releases the workers without stopping them, as work of this session. So a session that was replaced while it ran
  // reports nothing of what it had gathered. Logs the ID at info level.
  ~TarnReportingSession();

  // Which workers run is not touched: the workers that need the type are made at start. Any number is taken; one
  // without a name is called "unknown". Logs the name at info level.
  void setServiceType(AudioServiceType serviceType);
  // Merges the dictionary into the configuration; a "KvHostApplicationDisplayID" in it also counts as the
  // "HostApplicationDisplayID" unless that is given too. Nothing happens without a dictionary. New values replace old
  // ones, and keys that aren't mentioned stay: nothing takes a key away.
  void updateConfigurationWithContentsOfConfiguration(const plist::Dictionary* configuration);
  // For the description and the session's summary; an empty one counts as not known.
  void setClientProcessName(std::string name);

  // Appends the start marker, then makes and starts every worker that applies and doesn't run yet: consumers, then
  // producers, then the rest, each kind in the table's order. A session that runs gets a further marker, and nothing
  // else happens. Markers are messages of the category Setup, of the type Start or Stop, that tell "method",
  // "reporterid", "messages_at_start" or "messages_at_stop" (of the log before them), and whether the session ran
  // ("YES" or "NO"). They are in the log for the producers and for the redundancy rule; no worker is handed one.
  void start();
  // Appends the stop marker and, when the session runs: sorts the log by time stamp, stops the workers (producers,
  // which send what they derive through the intake, then consumers, then the rest), empties the log and sets the
  // message count to 0. Workers, configuration and latest values stay for the next start. When it doesn't run, the
  // marker stays in the log until the next stop that has an effect.
  void stop();
  // Takes a message in: stamps, cleans and tags it, tests it for redundancy, logs it and hands it to the workers; then
  // calls the reply, if there is one. How many workers got it. The record is the session's own from here on and is
  // changed in place. A redundant one is counted and updates the latest values, but it isn't logged and reaches only
  // the workers that ask for such. It doesn't matter whether the session is started; but before the first start only
  // the workers that start on creation are there to get it, and between a stop and the next start nobody is.
  std::size_t sendMessage(const MessagePointer& message, platform::Reply<> reply = nullptr);
  // What became of a message.
  struct Taken {
    bool isRedundant = false;
    std::size_t workers = 0;  // that got it
  };
  // The same of a message whose payload is a draft still: what the intake adds is in the one block that is made of it.
  Taken sendMessage(const plist::PackedBuilder::Draft& draft, AudioEventCategory category, AudioEventType type);

  // The steps of the intake; each changes the record's payload in place. A payload without a time stamp gets the
  // present one, and "invalid_timestamp" "nil"; one whose stamp is older than 365 days gets it too, and the old stamp
  // under "invalid_timestamp". That catches clients that count from their own start or from another epoch. A stamp in
  // the future is kept.
  static void addMissingDates(TarnReportingSessionMessage& message);
  // Replaces every blank in keys by '_'; tabs and the like stay. A key that had blanks wins over one that was spelled
  // so already. Costs nothing for a shape of payload that has none.
  static void removeWhiteSpaceFromKeys(TarnReportingSessionMessage& message);
  // Sets "audiotag" to the strings of category and type, one after the other: "PlaybackStart".
  static void addAudioMessageTag(TarnReportingSessionMessage& message);
  // Sets "HostApplicationDisplayID" to that of the configuration, or "Unknown", unless the payload names an application
  // other than "Unknown". Takes the record's guard.
  void addAppName(TarnReportingSessionMessage& message) const;
  // Whether the message says what the newest logged message of its category and type said. The time stamp and the two
  // uptimes are left out of the comparison; the values compare as values. Messages of the type Error and of the
  // category Error are never redundant. As redundant messages aren't logged, a run of equal ones is compared with its
  // first. Logs a line at debug level when it is.
  bool messageIsRedundant(const TarnReportingSessionMessage& message) const;
  // The record's time stamp in epoch seconds, 0 when it has none.
  static double getEpochTimeFromTarnReportingStateMessage(const TarnReportingSessionMessage& message);

  // "reporterID=%lli,serviceName=%@,ownerPid=%li,clientProcessName=%@,HostApplicationDisplayID=%@,started=%i,
  // singleMessageSession=%i" on one line. The owner is the first process identifier, 0 without one. An unknown name is
  // "(null)", an unknown application "Unknown".
  std::string description() const;

  // From start() to the end of stop(): producers that stop still find it true.
  bool started() const noexcept { return started_; }
  // Set at creation, for good.
  bool isSingleMessageSession() const noexcept { return mode_ == Mode::SingleMessage; }
  // The client's own choice; two clients may have the same.
  std::int64_t reporterID() const noexcept { return reporterID_; }
  // Unknown until it is set. Workers ask for it when they need it; what was made under an earlier type stays.
  AudioServiceType serviceType() const noexcept { return serviceType_; }
  // That of the service type. The text is static.
  std::string_view serviceName() const noexcept { return serviceName_; }
  // All that the client has configured so far.
  const plist::Dictionary& configuration() const noexcept { return configuration_; }
  // Empty when it is not known.
  const std::string& clientProcessName() const noexcept { return clientProcessName_; }
  // The owner's first; fixed at creation.
  const std::vector<std::int32_t>& processIdentifiers() const noexcept { return processIdentifiers_; }
  // The log: what came and was not redundant since start, and the markers of start and stop. In the order of arrival;
  // when the workers' stop begins, in the order of time.
  const TarnReportingSessionMessageList& messages() const noexcept { return log_.messages(); }
  // Where the memory of the log is counted for the session's owner.
  void setLogAccount(std::shared_ptr<TarnReportingSessionLogAccount> account) { log_.setAccount(std::move(account)); }
  // The latest value of each key that came with any message, redundant ones included. A stop keeps them.
  const TarnReportingSessionPreviousValues& previousValues() const noexcept { return previousValues_; }
  TarnReportingSessionPreviousValues& previousValues() noexcept { return previousValues_; }
  // Messages received since the last stop, redundant ones included. Messages that producers derive count too, markers
  // don't.
  std::int64_t totalMessageCount() const noexcept { return totalMessageCount_; }

  // Those that were made, whether they run or not.
  const TarnReportingSessionWorkerSet& workers() const noexcept { return workers_; }
  std::size_t workerInstanceCount() const noexcept { return workers_.messageWorkers().size(); }

  // What the session records are told of this session. Who lets go of it says here how it ended.
  TarnReportingSessionChronicle& chronicle() noexcept { return chronicle_; }

  // The pending reply of the client's start call; kept here for the connection, never called by the session. Empty when
  // no start call waits.
  platform::Acknowledge& transactionCompleteBlock() noexcept { return transactionCompleteBlock_; }

 private:
  TarnReportingSession(std::int64_t reporterID, std::vector<std::int32_t> processIdentifiers, Mode mode,
                       const Opener& opener);
  // The process's lists, derived from the table on first use.
  static const TarnReportingSessionWorkerClasses& workerClasses();
  // The two steps of the intake in one, as far as that goes.
  void addTagAndAppName(TarnReportingSessionMessage& message);
  // What a message with this draft for a payload becomes; whether its payload is complete.
  std::pair<MessagePointer, bool> makeMessage(const plist::PackedBuilder::Draft& draft, AudioEventCategory category,
                                              AudioEventType type);
  // The first half of the intake: completes the payload. Then the second.
  void complete(TarnReportingSessionMessage& message);
  std::size_t takeIn(const MessagePointer& message);
  TarnReportingSessionTags& tags();
  // What the session records know of it. They are told of a change before it is made, so what can't be told isn't done,
  // and the client's next try tells it.
  platform::SessionFacts facts() const;
  // A stamped and tagged marker of this type; `method` is "start" or "stop" and the end of its keys.
  void appendMarker(AudioEventType type, std::string_view method);

  const std::int64_t reporterID_;
  const std::vector<std::int32_t> processIdentifiers_;
  const Mode mode_;
  const std::uint32_t user_;
  const std::int64_t connection_;
  bool started_ = false;
  AudioServiceType serviceType_ = AudioServiceType::Unknown;
  std::string_view serviceName_;
  plist::Dictionary configuration_;
  plist::Key application_;  // of the configuration, as messages get it
  std::string clientProcessName_;
  std::int64_t totalMessageCount_ = 0;
  TarnReportingSessionChronicle chronicle_;
  platform::Acknowledge transactionCompleteBlock_;
  TarnReportingSessionPreviousValues previousValues_;
  TarnReportingSessionMessageLog log_;
  std::shared_ptr<TarnReportingSessionTags> tags_;  // from the first message on
  TarnReportingSessionWorkerSet workers_;
};

}  // namespace tarn
