// dispatchRequest: calls the operation of the exported object that a decoded request asks for, with a reply that finds
// its way back to the request's connection.
//
// Threads: the main loop's. Replies come on the server queue, which is the same thread.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <memory>
#include <optional>
#include <vector>

#include "platform/TarnReportingServiceProtocol.h"
#include "plist/ValueView.h"
#include "wire/Request.h"

namespace tarn::linux_host {

// Where replies go: a connection. It may be gone by the time of the reply.
class ReplySink {
 public:
  virtual ~ReplySink() = default;
  virtual void sendReply(std::uint64_t id, std::initializer_list<plist::ValueView> results) = 0;
  virtual void sendNumbers(std::uint64_t id, std::vector<std::int64_t> numbers) = 0;
  virtual void sendError(std::uint64_t id, const platform::RemoteError& error) = 0;
  // A second reply to one request came; the first went out.
  virtual void dropReply() = 0;
  // The request's work ended in the middle for want of memory.
  virtual void refuseForMemory(std::uint64_t id) noexcept = 0;
};

// Takes the request's arguments out of it. Operations of the service only, not the host's own.
void dispatchRequest(wire::DecodedRequest& request, platform::TarnReportingServiceProtocol& service,
                     std::weak_ptr<ReplySink> sink);

// What serving the request costs at least, in units of about a microsecond; long work charges more as it goes on.
std::size_t costOf(const wire::Request& request, std::size_t frameBytes) noexcept;

// Whether a request changes nothing, so that it needn't be served when nobody is there to read the reply.
constexpr bool onlyAsks(wire::Operation operation) noexcept {
  const wire::Result result = wire::rowOf(operation).result;
  return result == wire::Result::Number || result == wire::Result::Dictionary || result == wire::Result::Numbers;
}

}  // namespace tarn::linux_host
