// SPDX-License-Identifier: Apache-2.0
// Many clients with some sessions each, both events of every message recorded.
#include <sys/epoll.h>
#include <unistd.h>

#include <memory>
#include <vector>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/ServiceProcess.h"
#include "bench/figures/Figures.h"
#include "client/ClientConnection.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kMessages = 240'000;
constexpr std::size_t kClients = 64;
constexpr std::size_t kSessionsEach = 4;
constexpr std::size_t kOutstanding = 64;
constexpr double kPatienceSeconds = 20;
constexpr double kRateTarget = 60e3;
constexpr double kProcessorTarget = 20e-6;  // 1.2 processors at that rate
constexpr std::uint16_t kGenericService = 0;

// One of the clients, whose messages go to its sessions by turns.
class Member {
 public:
  Member(const std::string& socketPath, std::size_t index) : index_(index), request_(makeRequest()) {
    client::ClientConnection::Connected connected = client::ClientConnection::connect(socketPath);
    if (connected.failed()) {
      fail(connected.error->text);
    }
    client_ = std::move(connected.value);
    for (std::size_t session = 0; session < kSessionsEach; ++session) {
      const std::int64_t id = reporterID(session);
      mustBeOk(client_->call(client::createReportingSession(id)));
      mustBeOk(client_->call(client::setServiceType(kGenericService, id)));
      mustBeOk(client_->call(client::setConfiguration({{"HostApplicationDisplayID", "sys.oxbow.music"}}, id)));
      client_->send(client::startReportingSessionForID(id));
    }
    client_->flush();
    sessions_ = client_->outstanding();
  }

  int fd() const noexcept { return client_->fd(); }
  std::size_t outstanding() const noexcept { return client_->outstanding() - sessions_; }
  // Fills the window up; how many were sent.
  std::size_t fill(std::size_t most) {
    std::size_t sent = 0;
    for (; sent < most && outstanding() < kOutstanding; ++sent) {
      renumber(request_, number_ * kClients + index_);
      request_.reporterIDs = std::vector<std::int64_t>{reporterID(number_++ % kSessionsEach)};
      if (client_->send(request_, [](client::Reply&& reply) { mustBeOk(reply); }) != client::SendStatus::Sent) {
        fail("the service went away");
      }
    }
    client_->flush();
    return sent;
  }
  void take() { client_->dispatch(); }
  plist::Dictionary status() {
    const client::Reply reply = client_->call(client::status());
    mustBeOk(reply);
    return reply.dictionary();
  }

 private:
  static void mustBeOk(const client::Reply& reply) {
    if (!reply.ok()) {
      fail("a request of a client of the fleet: " + reply.error.text);
    }
  }
  std::int64_t reporterID(std::size_t session) const {
    return static_cast<std::int64_t>(index_ * kSessionsEach + session) + 1;
  }

  const std::size_t index_;
  std::unique_ptr<client::ClientConnection> client_;
  client::Request request_;
  std::uint64_t number_ = 1;
  std::size_t sessions_ = 0;  // whose starts are outstanding
};

class Fleet {
 public:
  explicit Fleet(const Settings& settings)
      : service_(settings, {.recordsEvents = true}), count_(settings.count(kMessages)), epoll_(::epoll_create1(0)) {
    for (std::size_t index = 0; index < kClients; ++index) {
      members_.push_back(std::make_unique<Member>(service_.socketPath(), index));
      epoll_event wanted{};
      wanted.events = EPOLLIN;
      wanted.data.ptr = members_.back().get();
      ::epoll_ctl(epoll_, EPOLL_CTL_ADD, members_.back()->fd(), &wanted);
    }
    stream(count_ / 5 + 1);  // not counted
    committed_ = waitUntilCommitted();
  }
  ~Fleet() { ::close(epoll_); }
  Fleet(const Fleet&) = delete;
  Fleet& operator=(const Fleet&) = delete;

  void measure() {
    const double processorBefore = processorSeconds(service_.id());
    const double start = nowSeconds();
    stream(count_);
    const std::int64_t committed = waitUntilCommitted();
    const auto messages = static_cast<double>(count_);
    rates_.push_back(messages / (nowSeconds() - start));
    processor_.push_back((processorSeconds(service_.id()) - processorBefore) / messages);
    if (committed - committed_ != 2 * static_cast<std::int64_t>(count_)) {
      fail("not every message left two events");
    }
    committed_ = committed;
  }
  double rate() const { return median(rates_); }
  double processor() const { return median(processor_); }

 private:
  void stream(std::size_t count) {
    std::size_t left = count;
    for (const auto& member : members_) {
      left -= member->fill(left);
    }
    std::size_t outstanding = 1;
    double latest = nowSeconds() + kPatienceSeconds;
    while (left > 0 || outstanding > 0) {
      epoll_event events[kClients];
      const int ready = ::epoll_wait(epoll_, events, kClients, 100);
      for (int i = 0; i < ready; ++i) {
        auto& member = *static_cast<Member*>(events[i].data.ptr);
        member.take();
        left -= member.fill(left);
        latest = nowSeconds() + kPatienceSeconds;
      }
      if (nowSeconds() > latest) {
        fail("the service doesn't answer");
      }
      if (left > 0) continue;
      outstanding = 0;
      for (const auto& member : members_) {
        outstanding += member->outstanding();
      }
    }
  }

  std::int64_t waitUntilCommitted() {
    for (;;) {
      const plist::Dictionary status = members_.front()->status();
      if (status["recorder_failed"].asInt64() != 0) {
        fail("the recorder lost events");
      }
      if (status["recorder_committed"].asInt64() == status["recorder_handed_over"].asInt64()) {
        return status["recorder_committed"].asInt64();
      }
      ::usleep(1000);
    }
  }

  ServiceProcess service_;
  const std::size_t count_;
  const int epoll_;
  std::vector<std::unique_ptr<Member>> members_;
  std::int64_t committed_ = 0;
  Samples rates_;
  Samples processor_;
};

}  // namespace

void measureFleet(const Settings& settings, Table& table) {
  Samples rates;
  Samples processor;
  // A service of its own each round, since the sessions keep what they logged.
  for (int round = 0; round < settings.rounds; ++round) {
    Fleet fleet(settings);
    fleet.measure();
    rates.push_back(fleet.rate());
    processor.push_back(fleet.processor());
  }
  table.addWithTarget(
      {"64 clients with 4 sessions, both events recorded", perSecond(median(rates)), {}, {}, ">= 60 k/s", {}},
      median(rates), kRateTarget, true);
  table.addWithTarget(
      {"processor time a message, 64 clients with 4 sessions", microseconds(median(processor)), {}, {}, "<= 20 us", {}},
      median(processor), kProcessorTarget);
}

}  // namespace tarn::bench
