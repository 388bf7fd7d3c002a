#include "host/socket/RequestDispatcher.h"

#include <utility>

namespace tarn::linux_host {

namespace {

using wire::Operation;

// One request's right to one reply.
class ReplyTicket {
 public:
  ReplyTicket(std::weak_ptr<ReplySink> sink, std::uint64_t id) noexcept : sink_(std::move(sink)), id_(id) {}

  // Calls `send` with the sink and the ID, or has the error sent; at most once.
  template <class Send>
  void answer(const std::optional<platform::RemoteError>& error, Send send) {
    const auto sink = sink_.lock();
    if (sink == nullptr) {
      return;
    }
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

platform::Acknowledge acknowledge(ReplyTicket ticket) {
  return [ticket = std::move(ticket)](const std::optional<platform::RemoteError>& error, bool done) mutable {
    ticket.answer(error, [done](ReplySink& sink, std::uint64_t id) { sink.sendReply(id, {done}); });
  };
}

platform::Reply<> bare(ReplyTicket ticket) {
  return [ticket = std::move(ticket)](const std::optional<platform::RemoteError>& error) mutable {
    ticket.answer(error, [](ReplySink& sink, std::uint64_t id) { sink.sendReply(id, {}); });
  };
}

platform::Reply<std::uint16_t> serviceType(ReplyTicket ticket) {
  return [ticket = std::move(ticket)](const std::optional<platform::RemoteError>& error, std::uint16_t type) mutable {
    ticket.answer(error,
                  [type](ReplySink& sink, std::uint64_t id) { sink.sendReply(id, {static_cast<unsigned>(type)}); });
  };
}

platform::Reply<plist::Dictionary> dictionary(ReplyTicket ticket) {
  return [ticket = std::move(ticket)](const std::optional<platform::RemoteError>& error,
                                      const plist::Dictionary& result) mutable {
    ticket.answer(error, [&result](ReplySink& sink, std::uint64_t id) { sink.sendReply(id, {result}); });
  };
}

platform::Reply<std::vector<std::int64_t>> numbers(ReplyTicket ticket) {
  return [ticket = std::move(ticket)](const std::optional<platform::RemoteError>& error,
                                      const std::vector<std::int64_t>& result) mutable {
    ticket.answer(error, [&result](ReplySink& sink, std::uint64_t id) { sink.sendNumbers(id, result); });
  };
}

}  // namespace

void dispatchRequest(wire::DecodedRequest& request, platform::TarnReportingServiceProtocol& service,
                     std::weak_ptr<ReplySink> sink) {
  ReplyTicket ticket(std::move(sink), request.id);
  const std::int64_t reporterID = request.reporterID;
  switch (request.operation) {
    case Operation::CreateReportingSession:
      return service.createReportingSession(reporterID, acknowledge(std::move(ticket)));
    case Operation::SetServiceType:
      return service.setServiceType(request.serviceType, reporterID, acknowledge(std::move(ticket)));
    case Operation::GetServiceNameForReporterID:
      return service.getServiceNameForReporterID(reporterID, serviceType(std::move(ticket)));
    case Operation::SetConfiguration:
      return service.setConfiguration(std::move(request.dictionary), reporterID, acknowledge(std::move(ticket)));
    case Operation::StartReportingSessionForID:
      return service.startReportingSessionForID(reporterID, acknowledge(std::move(ticket)));
    case Operation::SendMessage:
      return service.sendMessage(std::move(request.dictionary), request.category, request.type,
                                 std::move(request.reporterIDs), bare(std::move(ticket)));
    case Operation::StopReportingSessionForID:
      return service.stopReportingSessionForID(reporterID, acknowledge(std::move(ticket)));
    case Operation::DestroyReportingSession:
      return service.destroyReportingSession(reporterID, acknowledge(std::move(ticket)));
    case Operation::ReporterID:
      return service.reporterID(reporterID, dictionary(std::move(ticket)));
    case Operation::GetAllReporters:
      return service.getAllReporters(numbers(std::move(ticket)));
    case Operation::KillService:
      return service.killService();
    case Operation::Status:
      return;  // the host's own, answered before it comes here
  }
}

}  // namespace tarn::linux_host
