// SPDX-License-Identifier: Apache-2.0
// JetStreamPublisher: a publisher to NATS JetStream, by its own library. It connects when it can and again when it was
// cut off; meanwhile nothing is taken. Each message goes with its id as Nats-Msg-Id, by which the stream drops what it
// has already.
//
// Threads: one at a time; the library's own hand over outcomes.
#pragma once

#include <memory>
#include <string>

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

  // Begins to connect, without waiting for it. The error: the settings are wrong, as a file that can't be read.
  [[nodiscard]] Status open();

  [[nodiscard]] Status publish(std::uint64_t number, const std::string& id, const std::string& bytes) override;
  void wait(std::chrono::milliseconds longest, std::vector<Outcome>& outcomes) override;

 private:
  class Link;

  const ServerSettings settings_;
  const std::string subject_;
  std::unique_ptr<Link> link_;
};

}  // namespace tarn::fleet
