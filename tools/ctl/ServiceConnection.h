// SPDX-License-Identifier: Apache-2.0
// ServiceConnection: the way to the service: where it may be, how long is waited for it, one request and its answer.
//
// Complaints are made here, so that every command says the same about a service that isn't there. Threads: one.
#pragma once

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "client/ClientConnection.h"

namespace tarn::ctl {

// At least one socket: that of an option, or the user's and then the system's.
struct ServiceAddress {
  std::vector<std::string> sockets;         // the next is tried where nobody listens on one
  std::chrono::milliseconds timeout{5000};  // for each answer
};

// Who was reached, or why nobody was.
struct Reached {
  std::unique_ptr<client::ClientConnection> client;  // null when nobody was reached
  std::string socket;                                // where
  std::string complaint;                             // why not, with each place that was tried
  bool isAbsent = false;                             // nobody listens at any of them
};
// Connects to the first socket on which somebody listens; one that refuses this user is not passed over. A socket with
// nobody behind it is passed over, any other failure ends the search. Says nothing on stderr.
Reached reachService(const ServiceAddress& address, const client::Options& options = {});

// Waits until the service is there and answers, at most so long. The exit status; what went wrong was said on stderr.
// It looks every 20 ms, at least once. One that takes the connection and doesn't answer in time counts as unreachable.
int waitForService(const ServiceAddress& address, std::chrono::milliseconds longest);

// What came of a request. The reply means something only when the status is success.
struct Answer {
  client::Reply reply;
  std::string socket;  // who answered
  int status = 0;      // success, or the exit status to end with; what went wrong was said on stderr
};
// Connects, asks and waits for the answer. An answer that is an error is a failure, a late or missing one means
// unreachable.
Answer askService(const ServiceAddress& address, const client::Request& request);

// Waits until all that was handed over to the service by now is committed, and so is what the ends of clients make that
// have gone, at most so long as for an answer. A service that isn't there has nothing waiting; one that refuses this
// user is unreachable. The exit status; what went wrong was said on stderr.
int settleService(const ServiceAddress& address);

// "the service at SOCKET does not answer within 5 s"
std::string silenceText(const std::string& socket, std::chrono::milliseconds timeout);
// "5 s", "0.25 s"
std::string secondsText(std::chrono::milliseconds time);

}  // namespace tarn::ctl
