// ModelSession: one session of the model: its log as a plain list, its counters, and the events that it leads to.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "tests/scenario/Model.h"

namespace tarn::scenario {

// A message that the service makes of what it saw, without what the intake adds.
struct DerivedMessage {
  std::string origin;
  std::uint32_t category;
  std::uint16_t type;
  json payload;
};

class ModelSession {
 public:
  enum class Mode { Ordinary, Single };
  explicit ModelSession(std::int64_t reporterID, Mode mode = Mode::Ordinary)
      : reporterID_(reporterID), isSingle_(mode == Mode::Single) {}

  std::int64_t reporterID() const { return reporterID_; }

  void configure(const json& configuration);
  void setType(std::uint16_t type) { type_ = type; }
  std::uint16_t type() const { return type_; }
  bool started() const { return started_; }
  std::string application() const { return configuration_.value("HostApplicationDisplayID", std::string("Unknown")); }
  const json& configuration() const { return configuration_; }

  // A session of the same ID that takes this one's place.
  ModelSession successor(std::uint16_t type) const;
  // Begins its mirror too, if it has one.
  void start(Expectation& expectation);
  // Ends it; what is derived and the summary join the events, and a file the files if the session leaves one.
  void stop(const std::vector<DerivedMessage>& derived, bool internalBuild, Expectation& expectation);
  void receive(const json& message, std::uint32_t category, std::uint16_t type, const std::string& origin,
               Expectation& expectation);
  // Of these keys the mirror's summary event isn't looked at.
  void leaveTextsOpen(const std::set<std::string>& keys, Expectation& expectation) const;

  std::size_t heldStartLine = 0;  // of the start that waits for its reply; 0: none

 private:
  struct Record {
    std::uint32_t category;
    std::uint16_t type;
    json compared;  // the payload without stamps; a marker's is never equal to a message's
  };
  // The intake of any message. Whether it was new.
  bool take(json payload, std::uint32_t category, std::uint16_t type, ExpectedEvent event, Expectation& expectation);
  void takeDerived(const DerivedMessage& message, Expectation& expectation);
  bool isRepeated(const Record& record) const;
  void count(const json& payload);
  void appendMarker(std::uint16_t type);
  void forward(const json& payload, std::uint32_t category, std::uint16_t type, ExpectedEvent event,
               Expectation& expectation) const;
  void beginMirror(Expectation& expectation);
  void mirror(const json& payload, std::uint32_t category, std::uint16_t type, ExpectedEvent event,
              Expectation& expectation) const;
  json summary() const;

  std::int64_t reporterID_;
  bool isSingle_;
  bool started_ = false;
  bool forwards_ = true;  // from its creation on, until it is stopped
  std::uint16_t type_ = 0xFFFF;
  json configuration_ = json::object();
  std::vector<Record> log_;
  std::int64_t received_ = 0;
  std::size_t beforeStart_ = 0;  // records of the log
  double activeTime_ = 0;
  std::int64_t activeCount_ = 0;
  std::int64_t overloads_ = 0;
  std::optional<std::size_t> mirror_;  // its place among the expected ones, while it runs
};

}  // namespace tarn::scenario
