// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/ScriptPlayer.h"

#include <poll.h>

#include <algorithm>
#include <cerrno>
#include <iostream>
#include <limits>
#include <utility>
#include <vector>

#include "host/system/SystemError.h"
#include "plist/EscapedText.h"
#include "plist/formats/Json.h"
#include "tools/script/ScriptParser.h"

namespace tarn::ctl {

namespace {

using client::Outcome;
using client::Reply;
using script::ScriptLines;
using script::ScriptStep;

// How long the end of a script that killed the service waits for the service's end.
constexpr std::chrono::seconds kKillPatience{30};

client::Options connectionOptions() {
  client::Options options;
  options.timeout = std::chrono::minutes(10);  // a script has patience with its service
  options.autoFlushBytes = 0;
  // How long a frame may be is the service's to say: it is configured there.
  options.maxFrameBytes = ScriptLines::kMaxLineBytes;
  options.maxOutgoingBytes = 2 * ScriptLines::kMaxLineBytes;
  return options;
}

// Whether the service said it; otherwise the request was cancelled or the connection lost.
bool isAnswer(const Reply& reply) {
  return reply.ok() || reply.outcome == Outcome::Error;
}

// One result as it is, none as null; more than one would be an array.
void appendResult(std::string& out, const Reply& reply) {
  if (!reply.ok() || reply.results.empty()) {
    out += "null";
  } else if (reply.results.size() == 1) {
    plist::appendJson(out, reply.results.front());
  } else {
    plist::Array all;
    for (const plist::Value& result : reply.results) {
      all.append(result);
    }
    plist::appendJson(out, all);
  }
}

void appendError(std::string& out, const Reply& reply) {
  if (reply.outcome != Outcome::Error) {
    out += "null";
    return;
  }
  out += "{\"domain\":";
  plist::appendJsonText(out, reply.error.domain);
  out += ",\"code\":" + std::to_string(reply.error.code) + ",\"text\":";
  plist::appendJsonText(out, reply.error.text);
  out += '}';
}

int pollTimeout(std::optional<std::chrono::steady_clock::time_point> deadline) {
  if (!deadline) return -1;
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(*deadline - std::chrono::steady_clock::now()).count();
  return static_cast<int>(std::clamp<std::int64_t>(left, 0, std::numeric_limits<int>::max()));
}

}  // namespace

ScriptPlayer::ScriptPlayer(ServiceAddress address, std::string scriptName, Output& output)
    : address_(std::move(address)), scriptName_(std::move(scriptName)), output_(output) {}

int ScriptPlayer::play(int fd) {
  if (playLines(fd)) {
    finish();
  }
  connections_.clear();
  if (!output_.good()) {
    // Nobody reads the replies any more, so the rest of the script was not played.
    output_.status();
    return kFailure;
  }
  return status_;
}

bool ScriptPlayer::playLines(int fd) {
  ScriptLines lines(fd);
  while (output_.good()) {
    std::string_view text;
    const auto next = lines.next(text);
    line_ = lines.lineNumber();
    switch (next) {
      case ScriptLines::Next::End:
        return true;
      case ScriptLines::Next::TooLong:
        return stop(kBadInput,
                    "the line is too long, expected at most " + std::to_string(ScriptLines::kMaxLineBytes) + " bytes");
      case ScriptLines::Next::Incomplete:
        if (!waitForInput(fd)) return false;
        if (const Status filled = lines.fill(); filled.failed()) {
          return stop(kBadInput, "can't read the script: " + filled->text);
        }
        break;
      case ScriptLines::Next::Line:
        if (!playLine(text, line_)) return false;
        break;
    }
  }
  return false;
}

bool ScriptPlayer::playLine(std::string_view text, std::size_t line) {
  if (script::isBlank(text)) return true;
  const Result<ScriptStep> parsed = script::parseLine(text, line);
  if (parsed.failed()) return stop(kBadInput, parsed.error->text);
  return playStep(parsed.value);
}

bool ScriptPlayer::playStep(const ScriptStep& step) {
  switch (step.kind) {
    case ScriptStep::Kind::Sleep:
      return sleep(step.seconds);
    case ScriptStep::Kind::Disconnect:
      return disconnect(step.client);
    case ScriptStep::Kind::Request:
      return playRequest(step);
  }
  return false;
}

bool ScriptPlayer::playRequest(const ScriptStep& step) {
  Connection* connection = connect(step.client);
  if (connection == nullptr || !settleStarts(connection)) return false;
  const wire::Result result = wire::rowOf(step.request.operation).result;
  const bool isStart = result == wire::Result::TrueAtStop;
  const bool isKill = result == wire::Result::NoReply;
  const auto done = std::make_shared<bool>(false);
  // The handler of a start outlives this step, so it keeps what it prints; a message need not be kept for that.
  ScriptStep named = step;
  named.request = {};
  const auto status =
      connection->client->send(step.request, [this, named = std::move(named), done, isKill](Reply&& reply) {
        *done = isAnswer(reply);
        if (*done && !isKill) {
          printReply(named, reply);
        }
      });
  if (status == client::SendStatus::TooLarge) return stop(kBadInput, step.op + " is too long for a frame");
  serviceWasKilled_ = serviceWasKilled_ || isKill;
  connection->startIsUnserved = connection->startIsUnserved || isStart;
  if (isStart || isKill) {
    connection->client->flush();
    return checkConnections();
  }
  return waitForReply(step.client, *connection, *done);
}

bool ScriptPlayer::waitForReply(const std::string& name, Connection& connection, const bool& done) {
  const auto deadline = Clock::now() + address_.timeout;
  while (!done) {
    if (!connection.client->connected()) return stopForLoss(name, connection);
    if (Clock::now() >= deadline) {
      return stop(kUnreachable, "the service at " + address_.sockets.front() + " does not answer within " +
                                    secondsText(address_.timeout));
    }
    if (!pump(deadline)) return false;
  }
  // The service serves a connection's requests in order, so what was sent before was served before.
  connection.startIsUnserved = false;
  return true;
}

bool ScriptPlayer::settle(const std::string& name, Connection& connection) {
  const auto done = std::make_shared<bool>(false);
  connection.client->send(client::getAllReporters(), [done](Reply&& reply) { *done = isAnswer(reply); });
  return waitForReply(name, connection, *done);
}

bool ScriptPlayer::settleStarts(const Connection* except) {
  for (auto& [name, connection] : connections_) {
    const bool needsIt = &connection != except && connection.startIsUnserved && connection.client->connected();
    if (needsIt && !settle(name, connection)) return false;
  }
  return true;
}

bool ScriptPlayer::sleep(double seconds) {
  const auto deadline = Clock::now() + std::chrono::ceil<Clock::duration>(std::chrono::duration<double>(seconds));
  while (Clock::now() < deadline) {
    if (!pump(deadline)) return false;
  }
  return true;
}

bool ScriptPlayer::disconnect(const std::string& name) {
  const auto found = connections_.find(name);
  if (found == connections_.end()) return true;
  Connection& connection = found->second;
  if (connection.startIsUnserved && connection.client->connected() && !settle(name, connection)) return false;
  connections_.erase(found);
  return true;
}

// A start that needn't be held is answered at once: such replies are fetched. A killed service is waited for, so that
// who comes next finds it gone.
bool ScriptPlayer::finish() {
  if (!serviceWasKilled_) return settleStarts(nullptr);
  const auto deadline = Clock::now() + kKillPatience;
  const auto isConnected = [](const auto& entry) { return entry.second.client->connected(); };
  while (std::any_of(connections_.begin(), connections_.end(), isConnected)) {
    if (Clock::now() >= deadline) return stop(kFailure, "the service was told to end and still runs");
    if (!pump(deadline)) return false;
  }
  return true;
}

ScriptPlayer::Connection* ScriptPlayer::connect(const std::string& name) {
  const auto found = connections_.find(name);
  if (found != connections_.end()) {
    if (!found->second.client->connected()) {
      stopForLoss(name, found->second);
      return nullptr;
    }
    return &found->second;
  }
  Reached reached = reachService(address_, connectionOptions());
  if (!reached.client) {
    stop(kUnreachable, reached.complaint);
    return nullptr;
  }
  address_.sockets = {reached.socket};
  Connection& connection = connections_[name];
  connection.client = std::move(reached.client);
  connection.client->setLostHandler([&connection](const std::string& why) { connection.lossReason = why; });
  return &connection;
}

bool ScriptPlayer::pump(std::optional<Clock::time_point> deadline, int inputFd, bool* inputIsReady) {
  std::vector<pollfd> polled;
  polled.reserve(connections_.size() + 1);
  for (const auto& [name, connection] : connections_) {
    if (connection.client->connected()) {
      const short events = connection.client->wantsToWrite() ? POLLIN | POLLOUT : POLLIN;
      polled.push_back({connection.client->fd(), events, 0});
    }
  }
  polled.push_back({inputFd, POLLIN, 0});  // a negative one is passed over
  const int ready = ::poll(polled.data(), polled.size(), pollTimeout(deadline));
  if (ready < 0 && errno != EINTR) return stop(kFailure, linux_host::errorOf("can't wait for replies", errno).text);
  for (auto& [name, connection] : connections_) {
    if (connection.client->connected()) {
      connection.client->dispatch();
    }
  }
  if (inputIsReady != nullptr) {
    *inputIsReady = ready > 0 && polled.back().revents != 0;
  }
  return checkConnections() && output_.good();
}

bool ScriptPlayer::waitForInput(int fd) {
  bool isReady = false;
  while (!isReady) {
    if (!pump(std::nullopt, fd, &isReady)) return false;
  }
  return true;
}

bool ScriptPlayer::checkConnections() {
  if (serviceWasKilled_) return true;
  for (const auto& [name, connection] : connections_) {
    if (!connection.client->connected()) return stopForLoss(name, connection);
  }
  return true;
}

void ScriptPlayer::printReply(const ScriptStep& step, const Reply& reply) {
  std::string text = "{\"client\":";
  plist::appendJsonText(text, step.client);
  text += ",\"line\":" + std::to_string(step.line) + ",\"op\":";
  plist::appendJsonText(text, step.op);
  text += ",\"error\":";
  appendError(text, reply);
  text += ",\"result\":";
  appendResult(text, reply);
  text += '}';
  output_.line(text);
}

bool ScriptPlayer::stopForLoss(const std::string& name, const Connection& connection) {
  return stop(kUnreachable, "the connection \"" + name + "\" to " + address_.sockets.front() + " was lost: " +
                                (serviceWasKilled_ ? "the script ended the service" : connection.lossReason));
}

bool ScriptPlayer::stop(int status, const std::string& why) {
  status_ = status;
  std::cerr << printable(scriptName_) << ':' << line_ << ": " << printable(why) << '\n';
  return false;
}

}  // namespace tarn::ctl
