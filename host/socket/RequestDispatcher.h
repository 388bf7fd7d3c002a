// dispatchRequest: calls the operation of the exported object that a decoded request asks for, with a reply that finds
// its way back to the request's connection.
//
// Threads: the main loop's. Replies come on the server queue, which is the same thread.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <memory>
#include <optional>
#include <span>

#include "platform/TarnReportingServiceProtocol.h"
#include "plist/ValueView.h"
#include "wire/Request.h"

namespace tarn::linux_host {

// Where replies go: a connection. It may be gone by the time of the reply.
class ReplySink {
 public:
  virtual ~ReplySink() = default;
  virtual void sendReply(std::uint64_t id, std::initializer_list<plist::ValueView> results) = 0;
  virtual void sendNumbers(std::uint64_t id, std::span<const std::int64_t> numbers) = 0;
  virtual void sendError(std::uint64_t id, const platform::RemoteError& error) = 0;
  // A second reply to one request came; the first went out.
  virtual void dropReply() = 0;
};

// Takes the request's arguments out of it. Operations of the service only, not the host's own.
void dispatchRequest(wire::DecodedRequest& request, platform::TarnReportingServiceProtocol& service,
                     std::weak_ptr<ReplySink> sink);

}  // namespace tarn::linux_host
