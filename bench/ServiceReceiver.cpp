// SPDX-License-Identifier: Apache-2.0
#include "bench/ServiceReceiver.h"

#include <unistd.h>

#include "bench/Measure.h"
#include "bench/Message.h"

namespace tarn::bench {

namespace {

constexpr std::uint16_t kGenericService = 0;
constexpr double kPatienceSeconds = 10;
constexpr std::chrono::milliseconds kPatience{10'000};

void mustBeOk(const client::Reply& reply, const char* what) {
  if (!reply.ok()) {
    fail(std::string(what) + ": " + reply.error.text);
  }
}

}  // namespace

ServiceReceiver::ServiceReceiver(const Settings& settings, const ServiceSetup& setup, Writes writes)
    : service_(settings, setup), request_(makeRequest()) {
  client::Options options;
  options.autoFlushBytes = writes == Writes::OneEach ? 0 : options.autoFlushBytes;
  client::ClientConnection::Connected connected = client::ClientConnection::connect(service_.socketPath(), options);
  if (connected.failed()) {
    fail(connected.error->text);
  }
  client_ = std::move(connected.value);
  mustBeOk(client_->call(client::createReportingSession(kReporterID)), "creating the session");
  mustBeOk(client_->call(client::setServiceType(kGenericService, kReporterID)), "setting the service type");
  mustBeOk(client_->call(client::setConfiguration({{"HostApplicationDisplayID", "sys.oxbow.music"}}, kReporterID)),
           "configuring");
  start();
}

void ServiceReceiver::start() {
  client_->send(client::startReportingSessionForID(kReporterID));
  client_->flush();
}

void ServiceReceiver::forget() {
  mustBeOk(client_->call(client::stopReportingSessionForID(kReporterID)), "stopping the session");
  start();
}

void ServiceReceiver::prepare() {
  renumber(request_, ++number_);
}

void ServiceReceiver::roundTrip() {
  mustBeOk(client_->call(request_), "sending a message");
}

std::uint64_t ServiceReceiver::send() {
  renumber(request_, ++number_);
  if (client_->send(request_) != client::SendStatus::Sent) {
    fail("the service went away");
  }
  return number_;
}

void ServiceReceiver::stream(std::size_t count, std::size_t outstanding) {
  replies_ = 0;
  failures_ = 0;
  const auto handler = [this](client::Reply&& reply) {
    ++replies_;
    if (!reply.ok()) {
      ++failures_;
    }
  };
  std::size_t sent = 0;
  while (replies_ < count) {
    for (; sent < count && sent - replies_ < outstanding; ++sent) {
      renumber(request_, ++number_);
      if (client_->send(request_, handler) != client::SendStatus::Sent) {
        fail("the service went away");
      }
    }
    // It returns without a reply, too, when there is room again for what is still to be sent.
    const double latest = nowSeconds() + kPatienceSeconds;
    while (client_->wait(kPatience) == 0) {
      if (nowSeconds() > latest) {
        fail("the service doesn't answer");
      }
    }
  }
  if (failures_ != 0) {
    fail("a message was refused");
  }
}

std::int64_t ServiceReceiver::waitUntilCommitted() {
  for (;;) {
    const client::Reply reply = client_->call(client::status());
    mustBeOk(reply, "asking for the status");
    const plist::Dictionary status = reply.dictionary();
    if (status["recorder_failed"].asInt64() != 0) {
      fail("the recorder lost events");
    }
    if (status["recorder_committed"].asInt64() == status["recorder_handed_over"].asInt64()) {
      return status["recorder_committed"].asInt64();
    }
    ::usleep(1000);
  }
}

}  // namespace tarn::bench
