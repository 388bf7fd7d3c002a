// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/ServiceConnection.h"

#include <algorithm>
#include <cerrno>
#include <system_error>
#include <thread>

#include "plist/ValueView.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

using Clock = std::chrono::steady_clock;
using client::Outcome;
using client::Reply;
using std::chrono::milliseconds;

// Between two looks at a service that is not there yet.
constexpr milliseconds kPause{20};

milliseconds left(Clock::time_point deadline) {
  return std::max(milliseconds(0), std::chrono::ceil<milliseconds>(deadline - Clock::now()));
}

bool nobodyListens(std::int64_t errorNumber) {
  return errorNumber == ENOENT || errorNumber == ECONNREFUSED || errorNumber == ENOTDIR;
}

// What to do about it, for an error whose text doesn't say so.
std::string hintOf(const wire::ReplyError& error) {
  const bool isAdminOnly =
      error.domain == wire::kErrorDomain && error.code == static_cast<std::int64_t>(wire::ErrorCode::AdminOnly);
  return isAdminOnly ? " (give --admin)" : "";
}

}  // namespace

std::string silenceText(const std::string& socket, milliseconds timeout) {
  return "the service at " + socket + " does not answer within " + secondsText(timeout);
}

std::string secondsText(milliseconds time) {
  return plist::ValueView(std::chrono::duration<double>(time).count()).asText() + " s";
}

Reached reachService(const ServiceAddress& address, const client::Options& options) {
  Reached reached;
  std::string tried;
  client::Options patient = options;
  patient.timeout = std::max(options.timeout, address.timeout);
  for (const std::string& socket : address.sockets) {
    auto connected = client::ClientConnection::connect(socket, patient);
    if (connected.ok()) {
      reached.client = std::move(connected.value);
      reached.socket = socket;
      return reached;
    }
    const std::int64_t code = connected.error.code();
    const bool isRefused = code == EACCES || code == EPERM;
    tried += tried.empty() ? "" : "; ";
    tried += isRefused ? socket + " refuses this user: " + std::generic_category().message(static_cast<int>(code))
                       : connected.error->text;
    reached.isAbsent = nobodyListens(code);
    if (!reached.isAbsent) break;
  }
  reached.complaint = "the service can't be reached: " + tried;
  return reached;
}

int waitForService(const ServiceAddress& address, milliseconds longest) {
  const auto deadline = Clock::now() + longest;
  for (;;) {
    const Reached reached = reachService(address);
    if (reached.client) {
      // One that is just starting may be reached before it serves.
      const Reply reply = reached.client->call(client::status(), left(deadline));
      if (reply.ok()) return kSuccess;
      if (reply.outcome == Outcome::TimedOut) {
        complain(silenceText(reached.socket, longest));
        return kUnreachable;
      }
    }
    if (Clock::now() >= deadline) {
      complain((reached.client ? "the service at " + reached.socket + " ended" : reached.complaint) + " (waited " +
               secondsText(longest) + ")");
      return kUnreachable;
    }
    std::this_thread::sleep_for(std::min(kPause, left(deadline)));
  }
}

Answer askService(const ServiceAddress& address, const client::Request& request) {
  Answer answer;
  const Reached reached = reachService(address);
  if (!reached.client) {
    complain(reached.complaint);
    answer.status = kUnreachable;
    return answer;
  }
  answer.socket = reached.socket;
  answer.reply = reached.client->call(request, address.timeout);
  switch (answer.reply.outcome) {
    case Outcome::Ok:
      break;
    case Outcome::Error:
      complain("the service answered with an error: " + answer.reply.error.domain + " " +
               std::to_string(answer.reply.error.code) + " " + answer.reply.error.text + hintOf(answer.reply.error));
      answer.status = kFailure;
      break;
    case Outcome::TimedOut:
      complain(silenceText(reached.socket, address.timeout));
      answer.status = kUnreachable;
      break;
    default:
      complain("no answer from the service at " + reached.socket + ": " + answer.reply.error.text);
      answer.status = kUnreachable;
      break;
  }
  return answer;
}

int settleService(const ServiceAddress& address) {
  const Reached reached = reachService(address);
  if (!reached.client) {
    if (reached.isAbsent) return kSuccess;
    complain(reached.complaint);
    return kUnreachable;
  }
  const Reply reply = reached.client->call(client::settle(), address.timeout);
  if (reply.ok()) return kSuccess;
  complain(reply.outcome == Outcome::TimedOut
               ? silenceText(reached.socket, address.timeout)
               : "no answer from the service at " + reached.socket + ": " + reply.error.text);
  return kUnreachable;
}

}  // namespace tarn::ctl
