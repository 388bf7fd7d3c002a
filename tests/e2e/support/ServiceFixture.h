// SPDX-License-Identifier: Apache-2.0
// ServiceFixture: a real service on private directories, with the clients and readers that the tests need.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "tests/e2e/support/Programs.h"

namespace tarn::e2e {

struct Event {
  std::int64_t id = 0;
  std::string backend;
  std::string name;
  json payload;
  json detail;
};

class ServiceFixture : public ::testing::Test {
 public:
  ~ServiceFixture() override;

 protected:
  std::string socket() const { return directory_ / "socket"; }
  std::string state() const { return directory_ / "state"; }

  // Starts the service with more options and waits until it answers. Whether it does.
  bool startService(const std::vector<std::string>& options = {});
  // The same program without waiting; for starts that must fail.
  Finished runService(const std::vector<std::string>& options);
  Process::Setup serviceSetup(const std::vector<std::string>& options) const;
  // Sends the signal and waits; the exit status, -1 when it still runs at the deadline.
  int stopService(int signal);
  Process& service() { return *service_; }
  std::string serviceLog() const { return service_->complaints(); }
  bool logSays(const std::string& text) const;
  // The same, or soon: the log is written by a thread of its own, and a reply may overtake its lines.
  bool logWillSay(const std::string& text) const;

  // tarnreportingctl with the service's socket and state directory.
  Finished ctl(const std::vector<std::string>& words, const std::string& input = {});
  std::unique_ptr<Process> startCtl(const std::vector<std::string>& words, const std::string& input = {},
                                    int outputFd = -1);
  // Plays a script; its replies. Expects exit status 0.
  std::vector<json> play(const std::string& script);
  std::unique_ptr<client::ClientConnection> connect();

  // What is committed by now.
  std::vector<Event> events(const std::string& nameGlob = "*");
  // Waits until there are so many at least, then returns what is there.
  std::vector<Event> eventsOnceThereAre(std::size_t count, const std::string& nameGlob);
  std::vector<std::string> names(const std::vector<Event>& events) const;
  json status();
  // Waits until nothing is queued or waits for the disk; the ledger then.
  json ledgerAtRest();

  TemporaryDirectory directory_;
  std::unique_ptr<Process> service_;
};

// Replies by the line of their script.
json replyTo(const std::vector<json>& replies, std::size_t line);

}  // namespace tarn::e2e
