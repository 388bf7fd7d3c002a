// SPDX-License-Identifier: Apache-2.0
// ScriptPlayer: plays a script against the service and prints each reply when it arrives.
//
// Each client name of the script is a connection of its own, made at its first line. A line waits for its reply before
// the next one, but for two: the reply to a start is held by the service until the session stops, and killService has
// none. So that a line on one connection still finds what a start on another one began, the player makes sure that the
// start was served before it turns to the other (with a request whose reply is not printed).
//
// While it waits, for a reply, for the script's next line or for a sleep to end, replies of all connections are
// printed. Memory does not grow with the script. Threads: one.
#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "client/ClientConnection.h"
#include "tools/ctl/ServiceConnection.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/script/ScriptLines.h"
#include "tools/script/ScriptStep.h"

namespace tarn::ctl {

// A reply is printed as {"client", "line", "op", "error", "result"}; one that carries an error is a reply like any
// other and doesn't stop the script. Three things do: a bad line, a lost connection, an answer that is late.
class ScriptPlayer {
 public:
  // `scriptName` is the script's name in complaints. Connects to nothing yet. The output outlives the player.
  ScriptPlayer(ServiceAddress address, std::string scriptName, Output& output);
  ScriptPlayer(const ScriptPlayer&) = delete;
  ScriptPlayer& operator=(const ScriptPlayer&) = delete;

  // Plays what `fd` yields to its end and closes the connections. Returns the exit status; what stopped the script
  // early was said on stderr. Once; the descriptor stays the caller's. Complaints begin with the script's name and the
  // line's number. A script that killed the service waits up to 30 seconds for its end.
  int play(int fd);

 private:
  using Clock = std::chrono::steady_clock;
  // What the script calls by a name. `lossReason` is empty while it stands.
  struct Connection {
    std::string lossReason;
    bool startIsUnserved = false;  // a start was sent and nothing answered since
    std::unique_ptr<client::ClientConnection> client;
  };

  // Each returns whether the script goes on; when not, status_ and stderr say why. All lines; one line; what it says; a
  // line for the service. Then the two others that a line may be.
  bool playLines(int fd);
  bool playLine(std::string_view text, std::size_t line);
  bool playStep(const script::ScriptStep& step);
  bool playRequest(const script::ScriptStep& step);
  bool sleep(double seconds);
  bool disconnect(const std::string& name);
  // At the script's end: fetches the replies that are on their way, or waits for the end of a killed service.
  bool finish();
  // The connection of this name, made when there is none; null when it can't be made or was lost.
  Connection* connect(const std::string& name);
  // Waits until every start on connections other than `except` was served.
  bool settleStarts(const Connection* except);
  // Has the service answer something on this connection, which serves its requests in their order.
  bool settle(const std::string& name, Connection& connection);
  // Waits until `done`, at most for the time of an answer.
  bool waitForReply(const std::string& name, Connection& connection, const bool& done);

  // Waits until something happens on a connection or `inputFd` (-1: none) can be read, at most until `deadline`.
  // Replies that came are printed within the call, by the handlers of their requests.
  bool pump(std::optional<Clock::time_point> deadline, int inputFd = -1, bool* inputIsReady = nullptr);
  // Waits for the script, however long that takes.
  bool waitForInput(int fd);
  // Whether none was lost, but for those that the script asked to lose.
  bool checkConnections();
  void printReply(const script::ScriptStep& step, const client::Reply& reply);
  // Stops as unreachable, with the reason of the loss.
  bool stopForLoss(const std::string& name, const Connection& connection);
  // Ends the script with this exit status and says why; false.
  bool stop(int status, const std::string& why);

  ServiceAddress address_;  // the one place alone, once the service was reached
  const std::string scriptName_;
  Output& output_;
  // By the script's names; one that was lost stays until its line asks for it.
  std::map<std::string, Connection> connections_;
  std::size_t line_ = 0;
  bool serviceWasKilled_ = false;  // lost connections are what the script asked for
  int status_ = 0;
};

}  // namespace tarn::ctl
