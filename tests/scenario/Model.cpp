#include "tests/scenario/Model.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <ctime>
#include <stdexcept>

#include "tests/scenario/ModelSession.h"
#include "tests/scenario/ScriptData.h"
#include "tests/scenario/Vocabulary.h"

namespace tarn::scenario {

namespace {

// A date as the recorder writes it.
std::string dateText(double seconds) {
  const auto whole = static_cast<std::time_t>(std::floor(seconds));
  std::tm parts{};
  ::gmtime_r(&whole, &parts);
  std::array<char, 32> text{};
  const std::size_t length = std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%S", &parts);
  std::string date(text.data(), length);
  const auto micros = std::llround((seconds - std::floor(seconds)) * 1e6);
  if (micros != 0) {
    std::array<char, 16> digits{};
    std::snprintf(digits.data(), digits.size(), ".%06lld", static_cast<long long>(micros));
    date += digits.data();
    date.erase(date.find_last_not_of('0') + 1);
  }
  return date + "Z";
}

// Whether the text form of a value is the same here as in the service.
bool hasKnownText(const json& value) {
  return !value.is_object() && (!value.is_array() || std::all_of(value.begin(), value.end(), hasKnownText));
}

std::set<std::string> openTextsOf(const json& message) {
  std::set<std::string> keys;
  for (const auto& [key, value] : message.items()) {
    if (!hasKnownText(value)) {
      keys.insert(key);
    }
  }
  return keys;
}

// A script's value as the recorder's JSON has it.
json recordedForm(const json& value) {
  if (value.is_object() && value.size() == 1 && value.contains("$date")) {
    return dateText(value.at("$date").get<double>());
  }
  if (value.is_object() && value.size() == 1 && value.contains("$data")) {
    return value.at("$data");
  }
  if (!value.is_structured()) {
    return value;
  }
  json recorded = value;
  for (auto& item : recorded) {
    item = recordedForm(item);
  }
  return recorded;
}

class Player {
 public:
  Player(const std::string& path, const Setting& setting) : setting_(setting), derived_(linesBeside(path, "derived")) {
    expectation_.script = fileName(path);
    for (const DataLine& line : derived_) {
      allowOnly(line, {"reporterID", "period", "category", "type", "message"});
    }
  }

  void play(const json& step, std::size_t line);
  Expectation finish();

 private:
  using Sessions = std::map<std::int64_t, ModelSession>;
  struct Connection {
    std::string name;
    double openedAt = 0;  // by the script's own sleeps
    Sessions sessions;
  };

  Connection& connection(const std::string& name);
  void close(Connection& connection);
  ModelSession* findOwn(Connection& connection, std::int64_t id);
  ModelSession* findAnywhere(std::int64_t id);
  void start(Connection& connection, std::int64_t id, std::size_t line);
  void stop(ModelSession& session);
  void end(ModelSession& session);
  std::vector<DerivedMessage> takeDerived(std::int64_t id);
  void setType(Connection& connection, std::int64_t id, std::uint16_t type);
  void send(const json& step, std::size_t line);
  std::vector<ModelSession*> receivers(const json& step);
  void reply(std::size_t line, std::optional<json> result) {
    expectation_.replies.push_back({line, std::move(result)});
  }
  bool playOwn(Connection& connection, const std::string& op, const json& step, std::int64_t id, std::size_t line);

  const Setting setting_;
  Expectation expectation_;
  std::vector<DataLine> derived_;              // those that no stop has yet led to
  std::map<std::int64_t, std::size_t> stops_;  // by reporter ID
  std::vector<Connection> connections_;
  ModelSession single_{1, ModelSession::Mode::Single};
  double time_ = 0;
};

Player::Connection& Player::connection(const std::string& name) {
  for (Connection& one : connections_) {
    if (one.name == name) {
      return one;
    }
  }
  return connections_.emplace_back(Connection{name, time_, {}});
}

void Player::close(Connection& connection) {
  for (auto& [id, session] : connection.sessions) {
    end(session);
  }
  expectation_.connections.push_back(time_ - connection.openedAt);
}

ModelSession* Player::findOwn(Connection& connection, std::int64_t id) {
  const auto found = connection.sessions.find(id);
  return found == connection.sessions.end() ? nullptr : &found->second;
}

ModelSession* Player::findAnywhere(std::int64_t id) {
  for (Connection& one : connections_) {
    if (ModelSession* session = findOwn(one, id); session != nullptr && id != 0) {
      return session;
    }
  }
  return nullptr;
}

void Player::start(Connection& connection, std::int64_t id, std::size_t line) {
  ModelSession* session = id == 0 ? nullptr : findOwn(connection, id);
  if (session == nullptr) {
    reply(line, true);
    return;
  }
  if (session->started()) {
    return;  // never answered
  }
  session->heldStartLine = line;
  session->start(expectation_);
}

void Player::stop(ModelSession& session) {
  end(session);
  if (session.heldStartLine != 0) {
    reply(session.heldStartLine, true);
    session.heldStartLine = 0;
  }
}

void Player::end(ModelSession& session) {
  if (session.started()) {
    ++stops_[session.reporterID()];
    session.stop(takeDerived(session.reporterID()), setting_.internalBuild, expectation_);
  }
}

// What this stop leads to.
std::vector<DerivedMessage> Player::takeDerived(std::int64_t id) {
  std::vector<DerivedMessage> taken;
  const auto isOfThisStop = [&](const DataLine& line) {
    return member(line, "reporterID") == id && line.value.value("period", std::size_t{1}) == stops_[id];
  };
  for (const DataLine& line : derived_) {
    if (isOfThisStop(line)) {
      taken.push_back({line.origin, categoryOf(member(line, "category")), typeOf(member(line, "type")),
                       recordedForm(member(line, "message"))});
    }
  }
  derived_.erase(std::remove_if(derived_.begin(), derived_.end(), isOfThisStop), derived_.end());
  return taken;
}

void Player::setType(Connection& connection, std::int64_t id, std::uint16_t type) {
  ModelSession* session = id == 0 ? nullptr : findOwn(connection, id);
  if (session != nullptr && session->type() != type) {
    *session = session->successor(type);
  }
}

std::vector<ModelSession*> Player::receivers(const json& step) {
  std::vector<ModelSession*> found;
  const json ids = step.value("reporterIDs", json::array());
  for (const json& id : ids) {
    if (ModelSession* session = findAnywhere(id.get<std::int64_t>()); session != nullptr) {
      found.push_back(session);
    }
  }
  if (!ids.empty()) {
    return found;
  }
  if (!setting_.alone) {
    throw std::runtime_error("a message for all sessions can't be predicted while other scripts play");
  }
  for (Connection& one : connections_) {
    for (auto& [id, session] : one.sessions) {
      if (session.started()) {
        found.push_back(&session);
      }
    }
  }
  if (found.empty()) {
    single_.setType(5);
    found.push_back(&single_);
  }
  return found;
}

void Player::send(const json& step, std::size_t line) {
  ++expectation_.messages;
  const std::string origin = expectation_.script + ":" + std::to_string(line);
  for (ModelSession* session : receivers(step)) {
    session->receive(recordedForm(step.at("message")), categoryOf(step.at("category")), typeOf(step.at("type")), origin,
                     expectation_);
    session->leaveTextsOpen(openTextsOf(step.at("message")), expectation_);
  }
  reply(line, json());
}

// Operations on one of the connection's own sessions, all of which answer true.
bool Player::playOwn(Connection& connection, const std::string& op, const json& step, std::int64_t id,
                     std::size_t line) {
  ModelSession* session = findOwn(connection, id);
  if (op == "createReportingSession") {
    connection.sessions.insert_or_assign(id, ModelSession(id));
    ++expectation_.sessions;
    expectation_.reporterIDs.insert(id);
  } else if (op == "setServiceType") {
    setType(connection, id, serviceTypeOf(step.at("serviceType")));
  } else if (op == "setConfiguration") {
    if (session != nullptr) {
      session->configure(recordedForm(step.at("configuration")));
    }
  } else if (op == "stopReportingSessionForID") {
    if (session != nullptr && id != 0) {
      stop(*session);
    }
  } else if (op == "destroyReportingSession") {
    if (session != nullptr) {
      end(*session);
    }
    connection.sessions.erase(id);
  } else {
    return false;
  }
  reply(line, true);
  return true;
}

void Player::play(const json& step, std::size_t line) {
  const std::string op = step.at("op");
  const std::string name = step.value("client", std::string("main"));
  if (op == "sleep") {
    time_ += step.at("seconds").get<double>();
    return;
  }
  if (op == "disconnect") {
    for (auto one = connections_.begin(); one != connections_.end(); ++one) {
      if (one->name == name) {
        close(*one);
        connections_.erase(one);
        return;
      }
    }
    return;
  }
  Connection& own = connection(name);
  const auto id = step.value("reporterID", std::int64_t{0});
  if (playOwn(own, op, step, id, line)) {
    return;
  }
  const ModelSession* any = findAnywhere(id);
  if (op == "startReportingSessionForID") {
    start(own, id, line);
  } else if (op == "sendMessage") {
    send(step, line);
  } else if (op == "getServiceNameForReporterID") {
    reply(line, any == nullptr ? 0xFFFF : any->type());
  } else if (op == "reporterID") {
    reply(line, json{{"reporterID", any == nullptr ? 0 : id}, {"serviceType", any == nullptr ? 0xFFFF : any->type()}});
  } else if (op == "getAllReporters") {
    reply(line, std::nullopt);
  } else {
    throw std::runtime_error(op + " has no place in a scenario");
  }
}

Expectation Player::finish() {
  for (Connection& one : connections_) {
    close(one);
  }
  if (!derived_.empty()) {
    throw std::runtime_error(derived_.front().origin + ": the script has no such stop");
  }
  return std::move(expectation_);
}

}  // namespace

Expectation expectationOf(const std::string& path, const Setting& setting) {
  Player player(path, setting);
  for (const auto& [origin, step] : linesOf(path)) {
    try {
      player.play(step, std::stoul(origin.substr(origin.find_last_of(':') + 1)));
    } catch (const std::exception& trouble) {
      throw std::runtime_error(origin + ": " + trouble.what());
    }
  }
  return player.finish();
}

}  // namespace tarn::scenario
