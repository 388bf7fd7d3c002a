// SPDX-License-Identifier: Apache-2.0
#include "host/socket/RequestDispatcher.h"

#include <algorithm>
#include <array>
#include <exception>
#include <type_traits>
#include <utility>

namespace tarn::linux_host {

namespace {

using platform::TarnReportingServiceProtocol;
using wire::Operation;
using wire::Result;

// One request's right to one reply. Work that ends in an exception takes it along: then the request is refused. Work
// that lets go of it otherwise means that no reply will come.
class ReplyTicket {
 public:
  ReplyTicket(std::weak_ptr<ReplySink> sink, std::uint64_t id) noexcept : sink_(std::move(sink)), id_(id) {}
  ReplyTicket(ReplyTicket&& other) noexcept
      : sink_(std::exchange(other.sink_, {})), id_(other.id_), answered_(other.answered_) {}
  ReplyTicket& operator=(ReplyTicket&&) = delete;
  ~ReplyTicket() {
    if (answered_ || std::uncaught_exceptions() == 0) return;
    if (const auto sink = sink_.lock()) {
      sink->refuseForMemory(id_);
    }
  }

  // Calls `send` with the sink and the ID, or has the error sent; at most once.
  template <class Send>
  void answer(const std::optional<platform::RemoteError>& error, Send send) {
    const auto sink = sink_.lock();
    if (sink == nullptr) return;
    if (std::exchange(answered_, true)) {
      sink->dropReply();
    } else if (error) {
      sink->sendError(id_, *error);
    } else {
      send(*sink, id_);
    }
  }

 private:
  std::weak_ptr<ReplySink> sink_;
  std::uint64_t id_;
  bool answered_ = false;
};

// How the remote interface hands over each kind of result, and how that goes out.
template <Result kResult>
struct ReplyOf {  // Nothing
  using Type = platform::Reply<>;
  static void send(ReplySink& sink, std::uint64_t id) { sink.sendReply(id, {}); }
};

template <>
struct ReplyOf<Result::True> {
  using Type = platform::Acknowledge;
  static void send(ReplySink& sink, std::uint64_t id, bool done) { sink.sendReply(id, {done}); }
};

template <>
struct ReplyOf<Result::TrueAtStop> : ReplyOf<Result::True> {};

template <>
struct ReplyOf<Result::Number> {
  using Type = platform::Reply<std::uint16_t>;
  static void send(ReplySink& sink, std::uint64_t id, unsigned number) { sink.sendReply(id, {number}); }
};

template <>
struct ReplyOf<Result::Dictionary> {
  using Type = platform::Reply<plist::Dictionary>;
  static void send(ReplySink& sink, std::uint64_t id, const plist::Dictionary& dictionary) {
    sink.sendReply(id, {dictionary});
  }
};

template <>
struct ReplyOf<Result::Numbers> {
  using Type = platform::Reply<std::vector<std::int64_t>>;
  static void send(ReplySink& sink, std::uint64_t id, std::vector<std::int64_t> numbers) {
    sink.sendNumbers(id, std::move(numbers));
  }
};

template <Result kResult>
typename ReplyOf<kResult>::Type replyWith(ReplyTicket ticket) {
  return [ticket = std::move(ticket)](const std::optional<platform::RemoteError>& error, auto&&... results) mutable {
    ticket.answer(error, [&](ReplySink& sink, std::uint64_t id) {
      ReplyOf<kResult>::send(sink, id, std::forward<decltype(results)>(results)...);
    });
  };
}

// Calls the remote interface's operation with the arguments, and for the result, that the table names.
template <Operation kOperation, auto kMethod>
void call(wire::Request& request, TarnReportingServiceProtocol& service, ReplyTicket ticket) {
  static constexpr wire::OperationRow kRow = wire::rowOf(kOperation);
  [&]<std::size_t... kIndex>(std::index_sequence<kIndex...>) {
    if constexpr (kRow.result == Result::NoReply) {
      (service.*kMethod)(std::move(wire::argumentIn<kRow.arguments[kIndex]>(request))...);
    } else {
      (service.*kMethod)(std::move(wire::argumentIn<kRow.arguments[kIndex]>(request))...,
                         replyWith<kRow.result>(std::move(ticket)));
    }
  }
  (std::make_index_sequence<kRow.arguments.size()>());
}

struct Entry {
  Operation operation;
  void (*call)(wire::Request& request, TarnReportingServiceProtocol& service, ReplyTicket ticket);
};

template <Operation kOperation, auto kMethod>
constexpr Entry kEntry{kOperation, &call<kOperation, kMethod>};

constexpr std::array kEntries = {
    kEntry<Operation::CreateReportingSession, &TarnReportingServiceProtocol::createReportingSession>,
    kEntry<Operation::SetServiceType, &TarnReportingServiceProtocol::setServiceType>,
    kEntry<Operation::GetServiceNameForReporterID, &TarnReportingServiceProtocol::getServiceNameForReporterID>,
    kEntry<Operation::SetConfiguration, &TarnReportingServiceProtocol::setConfiguration>,
    kEntry<Operation::StartReportingSessionForID, &TarnReportingServiceProtocol::startReportingSessionForID>,
    kEntry<Operation::SendMessage, &TarnReportingServiceProtocol::sendMessage>,
    kEntry<Operation::StopReportingSessionForID, &TarnReportingServiceProtocol::stopReportingSessionForID>,
    kEntry<Operation::DestroyReportingSession, &TarnReportingServiceProtocol::destroyReportingSession>,
    kEntry<Operation::ReporterID, &TarnReportingServiceProtocol::reporterID>,
    kEntry<Operation::GetAllReporters, &TarnReportingServiceProtocol::getAllReporters>,
    kEntry<Operation::KillService, &TarnReportingServiceProtocol::killService>,
};
static_assert(std::equal(kEntries.begin(), kEntries.end(), wire::kOperations.begin(),
                         wire::kOperations.begin() + wire::kServiceOperations,
                         [](const Entry& entry, const auto& row) { return entry.operation == row.operation; }),
              "one entry for each operation of the service, in the table's order");

// A session is made, started and stopped with a worker of each class.
constexpr std::size_t kSessionCost = 16;
// A message reaches its session's workers, and most of it the recorder.
constexpr std::size_t kMessageCost = 2;
// Bytes that are decoded and stored in a unit of cost.
constexpr std::size_t kBytesPerCost = 1024;

}  // namespace

std::size_t costOf(const wire::Request& request, std::size_t frameBytes) noexcept {
  const std::size_t bytes = frameBytes / kBytesPerCost;
  switch (request.operation) {
    case Operation::CreateReportingSession:
    case Operation::SetServiceType:
    case Operation::StartReportingSessionForID:
    case Operation::StopReportingSessionForID:
    case Operation::DestroyReportingSession:
      return kSessionCost + bytes;
    case Operation::SendMessage:
      return kMessageCost + bytes;
    default:
      return 1 + bytes;
  }
}

void dispatchRequest(wire::DecodedRequest& request, platform::TarnReportingServiceProtocol& service,
                     std::weak_ptr<ReplySink> sink) {
  if (wire::rowOf(request.operation).servedBy == wire::ServedBy::Service) {
    const Entry& entry = kEntries[wire::operationIndex(wire::numberOf(request.operation))];
    entry.call(request, service, ReplyTicket(std::move(sink), request.id));
  }
}

}  // namespace tarn::linux_host
