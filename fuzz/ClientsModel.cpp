// SPDX-License-Identifier: Apache-2.0
#include "fuzz/ClientsModel.h"

#include <algorithm>
#include <utility>

#include "plist/Dictionary.h"

namespace tarn::fuzzing {

namespace {

constexpr std::int64_t kIdleNanoseconds = 5'000'000'000;
constexpr double kYearSeconds = 31536000;
constexpr int kTestType = 11;
constexpr std::uint32_t kSetup = 8;
constexpr std::uint32_t kError = 11;

// The names of those that the fuzzer sends.
std::string nameOf(std::uint32_t category, std::uint16_t type) {
  static const std::map<std::uint32_t, std::string> kCategories{{0, "Undefined"},
                                                                {4, "Playback"},
                                                                {8, "Setup"},
                                                                {11, "Error"},
                                                                {0x10000004, "DSP_Playback"},
                                                                {0x2000000B, "HAL_Error"},
                                                                {0x30000004, "_Playback"},
                                                                {0xFFFFFFFF, "Undefined"}};
  static const std::map<std::uint16_t, std::string> kTypes{
      {0, "Generic"}, {1, "Start"}, {2, "Stop"}, {6, "Error"}, {11, "Summary"}, {20, "Generic"}, {65535, "Unknown"}};
  return kCategories.at(category) + kTypes.at(type);
}

Payload comparable(Payload payload) {
  for (const char* key : {"processuptime_ms", "systemuptime_sec", "tarnreporting_timestamp"}) {
    payload.erase(key);
  }
  return payload;
}

bool isRedundant(const ModelSession& session, const ModelRecord& message) {
  if (message.type == 6 || message.category == kError) return false;
  for (auto record = session.log.rbegin(); record != session.log.rend(); ++record) {
    if (record->type == message.type && record->category == message.category) {
      return comparable(record->payload) == comparable(message.payload);
    }
  }
  return false;
}

void removeBlanks(Payload& payload) {
  const Payload before = payload;
  for (const auto& [key, value] : before) {
    if (key.find(' ') == std::string::npos) continue;
    std::string replaced = key;
    std::replace(replaced.begin(), replaced.end(), ' ', '_');
    payload[replaced] = value;
    payload.erase(key);
  }
}

std::string applicationOf(const ModelSession& session) {
  const auto name = session.configuration.find("HostApplicationDisplayID");
  return name == session.configuration.end() ? "Unknown" : name->second.view().asText();
}

}  // namespace

std::string ClientsModel::textOf(const Payload& payload) {
  std::string text;
  for (const auto& [key, value] : payload) {
    text += key + "=" + value.view().asText() + ";";
  }
  return text;
}

void ClientsModel::create(const Client& client, std::int64_t reporterID, int reply) {
  later([=, this] {
    const Session made = make(reporterID, false);
    for (Session& session : client->sessions) {
      if (session->reporterID == reporterID) {
        session = made;
        answer(reply, "true");
        return;
      }
    }
    client->sessions.push_back(made);
    answer(reply, "true");
  });
}

void ClientsModel::retype(const Client& client, int type, std::int64_t reporterID, int reply) {
  later([=, this] {
    for (Session& session : client->sessions) {
      if (reporterID == 0 || session->reporterID != reporterID || session->type == type) continue;
      const Session made = make(reporterID, false);
      made->configuration = session->configuration;
      made->previous = session->previous;
      made->type = type;
      session = made;
    }
    answer(reply, "true");
  });
}

void ClientsModel::askType(const Client& client, std::int64_t reporterID, int reply) {
  later([=, this] {
    const Session session = reporterID == 0 ? nullptr : anywhere(*client, reporterID);
    answer(reply, std::to_string(session ? session->type : 65535));
  });
}

void ClientsModel::configure(const Client& client, const Payload& configuration, std::int64_t reporterID, int reply) {
  later([=, this] {
    if (const Session session = own(*client, reporterID)) {
      const auto mirrored = configuration.find("KvHostApplicationDisplayID");
      if (mirrored != configuration.end()) {
        session->configuration["HostApplicationDisplayID"] = mirrored->second;
      }
      for (const auto& [key, value] : configuration) {
        session->configuration[key] = value;
      }
    }
    answer(reply, "true");
  });
}

void ClientsModel::start(const Client& client, std::int64_t reporterID, int reply) {
  later([=, this] {
    const Session session = reporterID == 0 ? nullptr : own(*client, reporterID);
    if (!session) {
      answer(reply, "true");
      return;
    }
    if (session->started) return;
    startSession(*session);
    finishStart(*session);
    session->heldReply = reply;
    if (session->type == kTestType && isInternal_) {
      answer(reply, "true");
    }
  });
}

void ClientsModel::finishStart(ModelSession& session) {
  if (session.heldReply) {
    answer(*session.heldReply, "true");
  }
  session.heldReply.reset();
}

void ClientsModel::send(ModelRecord message, const Identifiers& reporterIDs, int reply) {
  if (isInternal_ && isEnabled_ && (!reporterIDs || reporterIDs->empty())) {
    message.payload["sendSingleMessage"] = true;
  }
  later([=, this] {
    if (!isEnabled_) {
      answer(reply, "sys.oxbow.audio.reporting 1");
      return;
    }
    for (const Session& session : receivers(reporterIDs)) {
      take(*session, message);
    }
    answer(reply, "done");
  });
}

void ClientsModel::stop(const Client& client, std::int64_t reporterID, int reply) {
  later([=, this] {
    const Session session = reporterID == 0 ? nullptr : own(*client, reporterID);
    if (session && session->started) {
      stopSession(*session);
      finishStart(*session);
    }
    answer(reply, "true");
  });
}

void ClientsModel::destroy(const Client& client, std::int64_t reporterID, int reply) {
  later([=, this] {
    if (const Session session = own(*client, reporterID)) {
      if (session->started) {
        stopSession(*session);
      }
      std::erase(client->sessions, session);
    }
    answer(reply, "true");
  });
}

void ClientsModel::validate(const Client& client, std::int64_t reporterID, int reply) {
  later([=, this] {
    const Session session = anywhere(*client, reporterID);
    answer(reply, session ? std::to_string(reporterID) + " " + std::to_string(session->type) : "0 65535");
  });
}

void ClientsModel::askReporters(int reply) {
  later([=, this] {
    std::string text;
    for (const Client& client : clients_) {
      for (const Session& session : client->sessions) {
        text += std::to_string(session->reporterID) + ",";
      }
    }
    answer(reply, text);
  });
}

ClientsModel::Client ClientsModel::connect() {
  const auto client = std::make_shared<ModelClient>();
  later([this, client] { clients_.push_back(client); });
  return client;
}

void ClientsModel::lose(const Client& client) {
  later([this, client] {
    if (std::find(clients_.begin(), clients_.end(), client) == clients_.end()) return;
    for (const Session& session : client->sessions) {
      if (session->started) {
        stopSession(*session);
      }
    }
    client->sessions.clear();
    std::erase(clients_, client);
  });
}

void ClientsModel::run() {
  while (!work_.empty()) {
    const auto work = std::move(work_.front());
    work_.pop_front();
    work();
  }
}

void ClientsModel::advance(std::int64_t nanoseconds) {
  run();
  const std::int64_t end = nanoseconds_ + nanoseconds;
  while (nextCheck_ && *nextCheck_ <= end) {
    nanoseconds_ = *nextCheck_;
    checkSingle();
  }
  nanoseconds_ = end;
}

ClientsModel::Session ClientsModel::own(const ModelClient& client, std::int64_t reporterID) {
  for (const Session& session : client.sessions) {
    if (session->reporterID == reporterID) return session;
  }
  return nullptr;
}

ClientsModel::Session ClientsModel::anywhere(const ModelClient& client, std::int64_t reporterID) const {
  const Session session = own(client, reporterID);
  return session ? session : listed(reporterID);
}

ClientsModel::Session ClientsModel::listed(std::int64_t reporterID) const {
  if (reporterID == 0 || !isEnabled_) return nullptr;
  for (const Client& client : clients_) {
    if (const Session session = own(*client, reporterID)) return session;
  }
  return nullptr;
}

ClientsModel::Session ClientsModel::make(std::int64_t reporterID, bool isSingle) {
  const auto session = std::make_shared<ModelSession>();
  session->reporterID = reporterID;
  session->isSingle = isSingle;
  session->earlyRuns = true;
  note("early start " + std::to_string(reporterID));
  return session;
}

std::vector<ClientsModel::Session> ClientsModel::receivers(const Identifiers& reporterIDs) {
  std::vector<Session> found;
  if (reporterIDs && !reporterIDs->empty()) {
    for (const std::int64_t reporterID : *reporterIDs) {
      if (const Session session = listed(reporterID)) {
        found.push_back(session);
      }
    }
    return found;
  }
  for (const Client& client : clients_) {
    for (const Session& session : client->sessions) {
      if (session->started) {
        found.push_back(session);
      }
    }
  }
  if (!found.empty()) return found;
  singleUsed_ = nanoseconds_;
  if (!single_) {
    single_ = make(1, true);
    single_->type = 5;
    single_->configuration["HostApplicationDisplayID"] = "Unknown";
    startSession(*single_);
    nextCheck_ = nanoseconds_ + kIdleNanoseconds + 1000;
  }
  return {single_};
}

void ClientsModel::checkSingle() {
  if (nanoseconds_ - singleUsed_ > kIdleNanoseconds) {
    nextCheck_.reset();
    stopSession(*single_);
    single_.reset();
  } else {
    nextCheck_ = nanoseconds_ + kIdleNanoseconds;
  }
}

void ClientsModel::startSession(ModelSession& session) {
  const std::string name = std::to_string(session.reporterID);
  mark(session, true);
  if (session.started) return;
  session.started = true;
  if (!session.isSingle && !session.lateExists) {
    session.lateExists = session.type != 3;  // which the late worker declines
    note((session.lateExists ? "late made " : "late declined ") + name);
  }
  if (!session.earlyRuns) {
    note("early start " + name);
  }
  session.earlyRuns = true;
  if (session.lateExists && !session.lateRuns) {
    note("late start " + name);
  }
  session.lateRuns = session.lateExists;
}

void ClientsModel::stopSession(ModelSession& session) {
  const std::string name = std::to_string(session.reporterID);
  mark(session, false);
  if (!session.started) return;
  std::stable_sort(session.log.begin(), session.log.end(), [](const ModelRecord& a, const ModelRecord& b) {
    return a.payload.at("tarnreporting_timestamp").view().asDouble() <
           b.payload.at("tarnreporting_timestamp").view().asDouble();
  });
  if (session.lateRuns) {
    note("late stop " + name);
    take(session, {{{"derived", session.log.size() / 2}}, 4, 11});
    session.lateRuns = false;
  }
  if (session.earlyRuns) {
    note("early stop " + name);
  }
  session.earlyRuns = false;
  session.log.clear();
  session.total = 0;
  session.started = false;
}

void ClientsModel::take(ModelSession& session, ModelRecord message) {
  ++session.total;
  stamp(message.payload);
  removeBlanks(message.payload);
  message.payload["audiotag"] = nameOf(message.category, message.type);
  const auto application = message.payload.find("HostApplicationDisplayID");
  if (application == message.payload.end() || application->second == plist::Value("Unknown")) {
    message.payload["HostApplicationDisplayID"] = applicationOf(session);
  }
  const bool redundant = isRedundant(session, message);
  for (const auto& [key, value] : message.payload) {
    session.previous[key] = value;
  }
  if (!redundant) {
    session.log.push_back(message);
  }
  const std::string text = std::to_string(session.reporterID) + (session.started ? " started" : "") +
                           (redundant ? " redundant " : " ") + textOf(message.payload);
  if (session.earlyRuns) {
    note("early got " + text);
  }
  if (session.lateRuns && !redundant) {
    note("late got " + text);
  }
}

void ClientsModel::mark(ModelSession& session, bool isStart) const {
  const std::string suffix = isStart ? "start" : "stop";
  ModelRecord marker{{{"method", suffix},
                      {"messages_at_" + suffix, session.log.size()},
                      {"unique_messages_at_" + suffix, session.log.size()},
                      {"reporterid", session.reporterID},
                      {"running_at_" + suffix, session.started ? "YES" : "NO"}},
                     kSetup,
                     static_cast<std::uint16_t>(isStart ? 1 : 2)};
  stamp(marker.payload);
  marker.payload["audiotag"] = nameOf(marker.category, marker.type);
  session.log.push_back(std::move(marker));
}

void ClientsModel::stamp(Payload& payload) const {
  const auto present = payload.find("tarnreporting_timestamp");
  if (present == payload.end()) {
    payload["invalid_timestamp"] = "nil";
  } else if (present->second.view().asDouble() < now() - kYearSeconds) {
    payload["invalid_timestamp"] = present->second;
  } else {
    return;
  }
  payload["tarnreporting_timestamp"] = now();
}

}  // namespace tarn::fuzzing
