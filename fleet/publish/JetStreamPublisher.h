// SPDX-License-Identifier: Apache-2.0
// JetStreamPublisher: a publisher to NATS JetStream, by its own library. A message that is to be published connects it,
// where it isn't connected; that may wait a few seconds for each server, and who publishes chooses the pauses between
// such tries. Each message goes with its id as Nats-Msg-Id, by which the stream drops what it has already. While it is
// connected it hears what the device is asked for on SUBJECT-again.DEVICE.
//
// Threads: one at a time; the library's own hand over outcomes.
#pragma once

#include <chrono>
#include <memory>
#include <string>

#include "fleet/publish/NatsConnection.h"
#include "fleet/publish/Publisher.h"
#include "fleet/publish/ServerSettings.h"

namespace tarn::fleet {

class JetStreamPublisher final : public Publisher {
 public:
  // `device` is the end of the subject, SUBJECT.DEVICE.
  JetStreamPublisher(const ServerSettings& settings, const std::string& device);
  ~JetStreamPublisher() override;
  JetStreamPublisher(const JetStreamPublisher&) = delete;
  JetStreamPublisher& operator=(const JetStreamPublisher&) = delete;

  // Connects to nobody yet. The error: the settings are wrong, as a file that can't be read.
  [[nodiscard]] Status open();

  [[nodiscard]] Status publish(std::uint64_t number, const std::string& id, const std::string& bytes) override;
  void wait(std::chrono::milliseconds longest, std::vector<Outcome>& outcomes) override;
  bool hasAsker() const override { return true; }
  // Connects once a minute where nothing else does.
  void asked(std::vector<recorder::IdRange>& ranges) override;

 private:
  class Answers;

  [[nodiscard]] Status connect();
  void disconnect();
  bool isConnected() const;

  const ServerSettings settings_;
  const std::string subject_;
  const std::string againSubject_;
  const std::unique_ptr<Answers> answers_;
  NatsOwned<natsConnection> connection_;
  NatsOwned<jsCtx> context_;
  NatsOwned<natsSubscription> again_;
  std::chrono::steady_clock::time_point nextTry_{};  // to connect when nothing is to be published
};

}  // namespace tarn::fleet
