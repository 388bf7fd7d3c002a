// SPDX-License-Identifier: Apache-2.0
// BareReceiver: the limit that the socket itself sets. A process that takes frames of our sizes in large gulps, answers
// each with as many bytes as the service does, and looks at nothing but the lengths.
#pragma once

#include <string>

#include "bench/Processes.h"
#include "bench/Receiver.h"
#include "bench/peers/BareTurns.h"

namespace tarn::bench {

class BareReceiver final : public Receiver {
 public:
  explicit BareReceiver(Writes writes, BareTurn turn = BareTurn::Receive);
  ~BareReceiver() override;
  BareReceiver(const BareReceiver&) = delete;
  BareReceiver& operator=(const BareReceiver&) = delete;

  void roundTrip() override;
  void stream(std::size_t count, std::size_t outstanding) override;
  double processorSeconds() const override { return bench::processorSeconds(child_.id()); }

 private:
  void send(std::string_view bytes);
  void receiveReplies();

  const Writes writes_;
  SocketPair ends_;
  ChildProcess child_;
  std::string frame_;
  std::string gathered_;
  std::string received_;
  std::size_t pendingBytes_ = 0;  // of a reply that came in part
  std::size_t replies_ = 0;
};

}  // namespace tarn::bench
