// SPDX-License-Identifier: Apache-2.0
// Bytes as what up to three clients do with a service on a platform of fakes, one operation after the other: replies,
// what the workers see and what lies in every session must be as ClientsModel says.
#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "fuzz/ClientsModel.h"
#include "service/TarnReportingClientServerInstance.h"
#include "service/TarnReportingService.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionWorkerClass.h"
#include "testing/FakePlatform.h"

namespace tarn::fuzzing {
namespace {

std::vector<std::string>& trail() {
  static std::vector<std::string> entries;
  return entries;
}

Payload payloadOf(const plist::Dictionary& dictionary) {
  Payload payload;
  for (const auto& entry : dictionary) {
    payload.emplace(entry.key.text(), plist::Value(entry.value));
  }
  return payload;
}

void noteMessage(const std::string& worker, const TarnReportingSession& session,
                 const TarnReportingSessionMessage& message) {
  trail().push_back(worker + " got " + std::to_string(session.reporterID()) +
                    (message.isSessionStarted() ? " started" : "") + (message.isRedundant() ? " redundant " : " ") +
                    ClientsModel::textOf(payloadOf(message.message())));
}

// Runs from the making of a session on, in every session, and wants redundant messages too.
class EarlyWorker : public TarnReportingSessionWorkerProtocol, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "EarlyWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<EarlyWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    return std::make_unique<EarlyWorker>(session);
  }
  static bool startOnInit() { return true; }
  static bool handleSingleMessageSession() { return true; }
  bool handleRedundantMessages() { return true; }
  bool start() {
    trail().push_back("early start " + std::to_string(session()->reporterID()));
    return true;
  }
  void stop() { trail().push_back("early stop " + std::to_string(session()->reporterID())); }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override {
    noteMessage("early", *session(), *message);
  }
};

// Runs in started sessions, but not in those of type 3; sends a message at stop.
class LateWorker : public TarnReportingSessionWorkerProtocol,
                   public TarnReportingSessionWorkerConsumerProtocol,
                   public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "LateWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<LateWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    const bool declines = static_cast<int>(session->serviceType()) == 3;
    trail().push_back((declines ? "late declined " : "late made ") + std::to_string(session->reporterID()));
    return declines ? nullptr : std::make_unique<LateWorker>(session);
  }
  bool start() {
    trail().push_back("late start " + std::to_string(session()->reporterID()));
    return true;
  }
  void stop() {
    trail().push_back("late stop " + std::to_string(session()->reporterID()));
    session()->sendMessage(
        std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{"derived", session()->messages().size() / 2}},
                                                      AudioEventCategory::Playback, AudioEventType::Summary));
  }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override {
    noteMessage("late", *session(), *message);
  }
};

constexpr std::array kWorkers{TarnReportingSessionWorkerClass::of<EarlyWorker>(),
                              TarnReportingSessionWorkerClass::of<LateWorker>()};

// The bytes, one after the other; zeros after their end.
class Bytes {
 public:
  Bytes(const std::uint8_t* data, std::size_t size) : data_(data), size_(size) {}
  bool atEnd() const { return at_ == size_; }
  std::size_t take(std::size_t choices) { return atEnd() ? 0 : data_[at_++] % choices; }
  template <class Item, std::size_t count>
  const Item& pick(const std::array<Item, count>& items) {
    return items[take(count)];
  }

 private:
  const std::uint8_t* const data_;
  const std::size_t size_;
  std::size_t at_ = 0;
};

class Run {
 public:
  Run(const std::uint8_t* data, std::size_t size)
      : bytes_(data, size), isInternal_(bytes_.take(2) == 1), model_(isInternal_) {
    trail().clear();
    platform_.log.setThreshold(platform::LogLevel::Error);
    if (isInternal_) {
      platform_.overflow.setBounds(1, 1);  // every log message goes through the store, and nobody may notice
    }
    platform_.clock.setEpochSeconds(1750000000.0);
    platform_.deviceProperties.set("InternalBuild", isInternal_);
    TarnReportingSession::setAllWorkerClasses(kWorkers);
    service_ = TarnReportingService::create();
    platform_.listener.setDelegate(service_);
    platform_.listener.resume();
    platform_.runUntilIdle();
    for (Peer& peer : peers_) {
      connect(peer);
    }
  }
  ~Run() {
    for (const auto& connection : platform_.listener.connections()) {
      connection->invalidate();
    }
    platform_.workQueues.dropAll();
    service_.reset();
  }
  Run(const Run&) = delete;
  Run& operator=(const Run&) = delete;

  void all() {
    constexpr int kMostSteps = 200;
    for (int done = 0; done < kMostSteps && !bytes_.atEnd(); ++done) {
      step();
      if (!isHeld_) {
        settle();
      }
    }
    settle();
  }

 private:
  struct Peer {
    std::shared_ptr<testing::FakeConnection> connection;
    ClientsModel::Client model;
  };

  void connect(Peer& peer) {
    const auto identifier = static_cast<std::int32_t>(100 + (&peer - peers_.data()));
    platform_.processFacts.setProcessName(identifier, "player");
    peer = {platform_.listener.connect(identifier), model_.connect()};
  }

  platform::Acknowledge acknowledge(int reply) {
    return [reply](const std::optional<platform::RemoteError>& error, bool result) {
      trail().push_back("reply " + std::to_string(reply) + (!error && result ? ": true" : ": wrong"));
    };
  }

  void step() {
    Peer& peer = peers_[bytes_.take(peers_.size())];
    switch (bytes_.take(8)) {
      case 0:
        return controlSession(peer);
      case 1:
        return startOrStop(peer);
      case 2:
        return startOrStop(peer);
      case 3:
        return ask(peer);
      case 4:
        return passTime();
      case 5:
        return disturb(peer);
      default:
        return send(peer);
    }
  }

  void controlSession(Peer& peer) {
    platform::TarnReportingServiceProtocol& remote = *peer.connection->exportedObject();
    const int reply = ++replies_;
    const std::size_t kind = bytes_.take(4);
    const std::int64_t reporterID = bytes_.pick(kIdentifiers);
    if (kind == 0) {
      remote.createReportingSession(reporterID, acknowledge(reply));
      model_.create(peer.model, reporterID, reply);
    } else if (kind == 1) {
      const std::uint16_t type = bytes_.pick(kServiceTypes);
      remote.setServiceType(type, reporterID, acknowledge(reply));
      model_.retype(peer.model, type, reporterID, reply);
    } else if (kind == 2) {
      const Payload configuration = somePayload();
      remote.setConfiguration(dictionaryOf(configuration), reporterID, acknowledge(reply));
      model_.configure(peer.model, configuration, reporterID, reply);
    } else {
      remote.destroyReportingSession(reporterID, acknowledge(reply));
      model_.destroy(peer.model, reporterID, reply);
    }
  }

  void startOrStop(Peer& peer) {
    platform::TarnReportingServiceProtocol& remote = *peer.connection->exportedObject();
    const int reply = ++replies_;
    const bool isStart = bytes_.take(3) != 0;
    const std::int64_t reporterID = bytes_.pick(kIdentifiers);
    if (isStart) {
      remote.startReportingSessionForID(reporterID, acknowledge(reply));
      model_.start(peer.model, reporterID, reply);
    } else {
      remote.stopReportingSessionForID(reporterID, acknowledge(reply));
      model_.stop(peer.model, reporterID, reply);
    }
  }

  void ask(Peer& peer) {
    platform::TarnReportingServiceProtocol& remote = *peer.connection->exportedObject();
    const int reply = ++replies_;
    const std::string begin = "reply " + std::to_string(reply) + ": ";
    const std::size_t kind = bytes_.take(3);
    const std::int64_t reporterID = bytes_.pick(kIdentifiers);
    if (kind == 0) {
      remote.getServiceNameForReporterID(
          reporterID, [begin](const auto&, std::uint16_t type) { trail().push_back(begin + std::to_string(type)); });
      model_.askType(peer.model, reporterID, reply);
    } else if (kind == 1) {
      remote.reporterID(reporterID, [begin](const auto&, const plist::Dictionary& answer) {
        trail().push_back(begin + answer["reporterID"].asText() + " " + answer["serviceType"].asText());
      });
      model_.validate(peer.model, reporterID, reply);
    } else {
      remote.getAllReporters([begin](const auto&, const std::vector<std::int64_t>& reporters) {
        std::string text;
        for (const std::int64_t reporter : reporters) {
          text += std::to_string(reporter) + ",";
        }
        trail().push_back(begin + text);
      });
      model_.askReporters(reply);
    }
  }

  void send(Peer& peer) {
    constexpr std::array<std::uint32_t, 9> kCategories{4, 4, 0, 8, 11, 0x10000004, 0x2000000B, 0x30000004, 0xFFFFFFFF};
    constexpr std::array<std::uint16_t, 7> kTypes{1, 2, 0, 6, 11, 20, 65535};
    const int reply = ++replies_;
    ModelRecord message{somePayload(), bytes_.pick(kCategories), bytes_.pick(kTypes)};
    Identifiers reporterIDs;
    if (const std::size_t count = bytes_.take(4); count > 0) {
      reporterIDs.emplace();
      for (std::size_t named = 1; named < count; ++named) {
        reporterIDs->push_back(bytes_.pick(kIdentifiers));
      }
    }
    peer.connection->exportedObject()->sendMessage(
        dictionaryOf(message.payload), message.category, message.type, reporterIDs,
        [reply](const std::optional<platform::RemoteError>& error) {
          trail().push_back("reply " + std::to_string(reply) + ": " +
                            (error ? std::string(error->domain) + " " + std::to_string(error->code) : "done"));
        });
    model_.send(std::move(message), reporterIDs, reply);
  }

  void passTime() {
    constexpr std::array<std::int64_t, 7> kNanoseconds{
        1'000, 999'000'000, 2'500'000'000, 4'999'999'999, 5'000'000'000, 7'000'000'000, 34'560'000'000'000'000};
    const std::int64_t duration = bytes_.pick(kNanoseconds);
    platform_.advance(std::chrono::nanoseconds(duration));
    model_.advance(duration);
  }

  void disturb(Peer& peer) {
    switch (bytes_.take(5)) {
      case 0:
        peer.connection->interrupt();
        return model_.lose(peer.model);
      case 1:
        peer.connection->invalidate();
        model_.lose(peer.model);
        return connect(peer);
      case 2:
        isEnabled_ = !isEnabled_;
        service_->setReportingEnabled(isEnabled_);
        return model_.setReportingEnabled(isEnabled_);
      default:
        isHeld_ = !isHeld_;  // from here on work waits on the queue, until it is let go or time passes
    }
  }

  Payload somePayload() {
    static const std::array<std::string, 9> kKeys{"a",
                                                  "a b",
                                                  "a_b",
                                                  "HostApplicationDisplayID",
                                                  "KvHostApplicationDisplayID",
                                                  "systemuptime_sec",
                                                  "invalid_timestamp",
                                                  "audiotag",
                                                  "tarnreporting_timestamp"};
    Payload payload;
    for (std::size_t left = bytes_.take(4); left > 0; --left) {
      const std::string& key = bytes_.pick(kKeys);
      payload[key] = key == "tarnreporting_timestamp" ? someStamp() : someValue();
    }
    return payload;
  }
  plist::Value someValue() {
    switch (const std::size_t kind = bytes_.take(7)) {
      case 0:
        return plist::Value("Unknown");
      case 1:
        return plist::Value("x");
      case 2:
        return plist::Value(true);
      case 3:
        return plist::Value(1.0);
      case 4:
        return plist::Value(plist::Dictionary{{"n", 1}});
      default:
        return plist::Value(kind - 5);
    }
  }
  plist::Value someStamp() {
    constexpr double kYear = 31536000;
    const double now = model_.now();
    const std::array<plist::Value, 7> stamps{now, now - 1, now - kYear, now - kYear - 1, now + kYear, 0, 12};
    return stamps[bytes_.take(stamps.size())];
  }
  static plist::Dictionary dictionaryOf(const Payload& payload) {
    plist::Dictionary dictionary;
    for (const auto& [key, value] : payload) {
      dictionary.set(plist::Key(key), value);
    }
    return dictionary;
  }

  // Lets all work run, on both sides, and compares.
  void settle() {
    platform_.runUntilIdle();
    model_.run();
    compareTrails();
    const auto& clients = service_->getAllClients();
    check(clients.size() == model_.clients().size(), "clients");
    for (std::size_t at = 0; at < clients.size(); ++at) {
      const auto& expected = model_.clients()[at]->sessions;
      std::size_t place = 0;
      const TarnReportingSessionMap& sessions = clients[at]->clientReportingSessionMap();
      TarnReportingSessionMap::Place from = 0;
      sessions.forEachFrom(from, [&](std::int64_t reporterID) {
        check(place < expected.size() && reporterID == expected[place]->reporterID, "sessions");
        compare(*sessions.find(reporterID), *expected[place++]);
        return true;
      });
      check(place == expected.size(), "sessions");
    }
  }
  void compareTrails() {
    for (; compared_ < std::max(trail().size(), model_.trail().size()); ++compared_) {
      const std::string seen = compared_ < trail().size() ? trail()[compared_] : "nothing";
      const std::string wanted = compared_ < model_.trail().size() ? model_.trail()[compared_] : "nothing";
      if (seen == wanted) continue;
      std::fprintf(stderr, "seen:   %s\nwanted: %s\n", seen.c_str(), wanted.c_str());
      std::abort();
    }
  }
  static void compare(const TarnReportingSession& session, const ModelSession& expected) {
    check(session.reporterID() == expected.reporterID, "reporter ID");
    check(static_cast<int>(session.serviceType()) == expected.type, "type");
    check(session.started() == expected.started, "started");
    check(session.totalMessageCount() == expected.total, "count of messages");
    check(payloadOf(session.configuration()) == expected.configuration, "configuration");
    check(payloadOf(session.previousValues().dictionary()) == expected.previous, "previous values");
    check(session.messages().size() == expected.log.size(), "length of the log");
    for (std::size_t at = 0; at < expected.log.size(); ++at) {
      const auto record = session.messages()[at];
      const TarnReportingSessionMessage& message = *record;
      check(payloadOf(message.message()) == expected.log[at].payload, "logged message");
      check(static_cast<std::uint32_t>(message.category()) == expected.log[at].category, "logged category");
      check(static_cast<std::uint16_t>(message.type()) == expected.log[at].type, "logged type");
    }
  }
  static void check(bool holds, const char* what) {
    if (holds) return;
    std::fprintf(stderr, "another %s than the model's\n", what);
    std::abort();
  }

  static constexpr std::array<std::int64_t, 6> kIdentifiers{7, 7, 8, 1, 0, INT64_MIN};
  static constexpr std::array<std::uint16_t, 6> kServiceTypes{1, 3, 5, 11, 14, 65535};

  Bytes bytes_;
  const bool isInternal_;
  ClientsModel model_;
  testing::FakePlatform platform_;
  std::shared_ptr<TarnReportingService> service_;
  std::array<Peer, 3> peers_;
  int replies_ = 0;
  bool isEnabled_ = true;
  bool isHeld_ = false;
  std::size_t compared_ = 0;
};

}  // namespace
}  // namespace tarn::fuzzing

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tarn::fuzzing::Run(data, size).all();
  return 0;
}
