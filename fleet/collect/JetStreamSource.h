// SPDX-License-Identifier: Apache-2.0
// JetStreamSource: takes messages from a stream of NATS JetStream as one of a group of collectors: a durable consumer
// that hands each message to one of them, and to another when it isn't acknowledged in time.
//
//   open() -> fetch() -> messages() -> acknowledge()    written, and committed
//                                   -> giveBack()       not written: somebody else may have them at once
//
// It connects when it can and again when it was cut off. Threads: one; the library has its own.
#pragma once

#include <chrono>
#include <string>
#include <vector>

#include "fleet/collect/CollectOptions.h"
#include "fleet/collect/Collector.h"
#include "fleet/publish/NatsConnection.h"
#include "recorder/store/retention/IdRange.h"

namespace tarn::fleet {

class JetStreamSource {
 public:
  explicit JetStreamSource(const CollectConfiguration& configuration) : configuration_(configuration) {}
  ~JetStreamSource();
  JetStreamSource(const JetStreamSource&) = delete;
  JetStreamSource& operator=(const JetStreamSource&) = delete;

  // Begins to connect, without waiting for it. The error: the settings are wrong, as a file that can't be read.
  [[nodiscard]] Status open();
  // Waits so long for a first message, and takes what there is with it. None is no error.
  [[nodiscard]] Status fetch(std::chrono::milliseconds longest);
  // What was fetched, until it is acknowledged or given back.
  const std::vector<CollectedMessage>& messages() const noexcept { return messages_; }
  // Those at `refused` aren't to come again, whatever becomes of them.
  void acknowledge(const std::vector<Refusal>& refused);
  void giveBack();
  // Asks a device for ids again, if it hears it. The error: it couldn't be said.
  [[nodiscard]] Status ask(const std::string& device, const std::vector<recorder::IdRange>& ranges);

 private:
  [[nodiscard]] Status join();
  void letGo();

  const CollectConfiguration& configuration_;
  NatsOwned<natsConnection> connection_;
  NatsOwned<jsCtx> context_;
  NatsOwned<natsSubscription> subscription_;
  std::vector<NatsOwned<natsMsg>> held_;
  std::vector<CollectedMessage> messages_;
};

}  // namespace tarn::fleet
