// ServiceConnection: the way to the service: where it may be, how long is waited for it, one request and its answer.
#pragma once

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "client/ClientConnection.h"

namespace tarn::ctl {

struct ServiceAddress {
  std::vector<std::string> sockets;         // the next is tried where nobody listens on one
  std::chrono::milliseconds timeout{5000};  // for each answer
};

struct Reached {
  std::unique_ptr<client::ClientConnection> client;  // null when nobody was reached
  std::string socket;                                // where
  std::string complaint;                             // why not, with each place that was tried
};
// Connects to the first socket on which somebody listens; one that refuses this user is not passed over.
Reached reachService(const ServiceAddress& address, const client::Options& options = {});

// Waits until the service is there and answers, at most so long. The exit status; what went wrong was said on stderr.
int waitForService(const ServiceAddress& address, std::chrono::milliseconds longest);

struct Answer {
  client::Reply reply;
  std::string socket;  // who answered
  int status = 0;      // success, or the exit status to end with; what went wrong was said on stderr
};
// Connects, asks and waits for the answer.
Answer askService(const ServiceAddress& address, const client::Request& request);

// Waits until all that was handed over to the service by now is committed, and so is what the ends of clients make that
// have gone, at most so long as for an answer. A service that isn't there has nothing waiting. The exit status; what
// went wrong was said on stderr.
int settleService(const ServiceAddress& address);

// "5 s", "0.25 s"
std::string secondsText(std::chrono::milliseconds time);

}  // namespace tarn::ctl
