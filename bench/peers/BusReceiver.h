// SPDX-License-Identifier: Apache-2.0
// BusReceiver: the peer on sd-bus. A service of libsystemd on a private connection, without a broker, with one method
// that takes the same dictionary as a{sv}, reads all of it and answers.
#pragma once

#include <systemd/sd-bus.h>

#include <cstdint>

#include "bench/Processes.h"
#include "bench/Receiver.h"

namespace tarn::bench {

class BusReceiver final : public Receiver {
 public:
  BusReceiver();
  ~BusReceiver() override;
  BusReceiver(const BusReceiver&) = delete;
  BusReceiver& operator=(const BusReceiver&) = delete;

  void roundTrip() override;
  // The library writes each call by itself.
  void stream(std::size_t count, std::size_t outstanding) override;
  double processorSeconds() const override { return bench::processorSeconds(child_.id()); }

 private:
  sd_bus_message* makeCall();
  static int countReply(sd_bus_message* message, void* receiver, sd_bus_error* error);

  SocketPair ends_;
  ChildProcess child_;
  sd_bus* bus_ = nullptr;
  std::uint64_t number_ = 0;
  std::size_t replies_ = 0;
};

}  // namespace tarn::bench
