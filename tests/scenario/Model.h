// Model: what the recorder must hold after some scripts were played, worked out from the scripts alone.
//
// A second, plain telling of the service's rules on plain JSON: sessions by ID, markers, clean-up, redundancy by a walk
// over the log, summaries. It shares no code with the service. The messages that the service derives at a stop it does
// not work out: they stand beside the script, worked out by hand. It knows what has no effect on other scripts only: a
// message for every running session, in a script that is played together with others, is refused.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace tarn::scenario {

using nlohmann::json;

struct ExpectedEvent {
  std::string name;
  json payload;        // without the stamp when that is made by the service
  std::string origin;  // FILE:LINE, or what else made it
  bool hasFreshStamp = false;
  bool isSummary = false;      // carries facts about the machine besides
  bool isMadeAtStop = false;   // by the service
  bool isMirrored = true;      // in the session's mirror too
  std::uint16_t category = 0;  // as a mirror tells them
  std::uint16_t type = 0;
};

struct ExpectedReply {
  std::size_t line = 0;
  std::optional<json> result;  // nothing: any
};

// The file that one stop of a session leaves.
struct ExpectedFile {
  std::int64_t reporterID = 0;
  std::string application;
  std::string service;
  std::size_t received = 0;     // the client's messages in it
  std::size_t beforeStart = 0;  // those of them that came before the start
  std::size_t made = 0;         // the service's messages in it, besides the markers
};

// What the real-time-communication reporting service sees of one period of a session.
struct ExpectedMirror {
  std::int64_t reporterID = 0;
  std::uint16_t serviceType = 0;
  json sessionInfo;  // without the token
  json userInfo;
  std::vector<ExpectedEvent> messages;
  std::set<std::string> openTexts;  // keys with values whose text form isn't worked out here: dates, data, dictionaries
  bool isEnded = false;             // by a stop
};

// What one script leads to.
struct Expectation {
  std::string script;
  std::size_t messages = 0;
  std::size_t deliveries = 0;  // to sessions
  std::size_t redundant = 0;
  std::size_t sessions = 0;
  std::set<std::int64_t> reporterIDs;  // of the sessions that it creates
  std::size_t derived = 0;             // messages
  // By application name; within one, in this order.
  std::map<std::string, std::vector<ExpectedEvent>> events;
  // The least seconds that each connection is open.
  std::vector<double> connections;
  std::vector<ExpectedReply> replies;
  std::vector<ExpectedFile> files;      // in the order of the stops
  std::vector<ExpectedMirror> mirrors;  // in the order of the starts
};

// How a script is played.
struct Setting {
  bool alone = false;          // no other script at the same time
  bool internalBuild = false;  // the device's property
};

// Plays `path` in the mind. Throws std::runtime_error with the line for what can't be predicted.
Expectation expectationOf(const std::string& path, const Setting& setting);

}  // namespace tarn::scenario
