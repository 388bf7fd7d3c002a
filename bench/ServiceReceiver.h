// SPDX-License-Identifier: Apache-2.0
// ServiceReceiver: the service with one started session of type "generic", driven through the client library. Every
// message is different from those before, so none is redundant and all are logged.
#pragma once

#include <cstdint>
#include <memory>

#include "bench/Receiver.h"
#include "bench/ServiceProcess.h"
#include "client/ClientConnection.h"

namespace tarn::bench {

class ServiceReceiver final : public Receiver {
 public:
  ServiceReceiver(const Settings& settings, const ServiceSetup& setup, Writes writes);

  void prepare() override;
  void roundTrip() override;
  void stream(std::size_t count, std::size_t outstanding) override;
  double processorSeconds() const override { return bench::processorSeconds(service_.id()); }
  // Sends one message and waits for nothing; its number.
  std::uint64_t send();
  // Stops the session and starts it again.
  void forget() override;

  // Waits until the recorder has committed all that it was handed; returns how many events that is so far.
  std::int64_t waitUntilCommitted();
  client::ClientConnection& client() noexcept { return *client_; }
  std::string stateDirectory() const { return service_.stateDirectory(); }
  double residentBytes() const { return bench::residentBytes(service_.id()); }

 private:
  void start();

  ServiceProcess service_;
  std::unique_ptr<client::ClientConnection> client_;
  client::Request request_;
  std::uint64_t number_ = 0;
  std::size_t replies_ = 0;
  std::size_t failures_ = 0;
};

}  // namespace tarn::bench
