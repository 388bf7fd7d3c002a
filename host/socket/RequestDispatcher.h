// SPDX-License-Identifier: Apache-2.0
// dispatchRequest: calls the operation of the exported object that a decoded request asks for, with a reply that finds
// its way back to the request's connection.
//
// Threads: the main loop's. Replies come on the server queue, which is the same thread.
//
// What an operation takes and answers stands in one table of the wire; from it the compiler makes one entry for each,
// so a request can't be handed over with another operation's arguments.
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

// Where replies go: a connection. It may be gone by the time of the reply; a reply then goes nowhere and is no failure.
class ReplySink {
 public:
  virtual ~ReplySink() = default;
  // The reply to request `id`: no error, and these results. Each request comes to one of these three at most once.
  virtual void sendReply(std::uint64_t id, std::initializer_list<plist::ValueView> results) = 0;
  // One result, an array of numbers, of which there may be very many.
  virtual void sendNumbers(std::uint64_t id, std::vector<std::int64_t> numbers) = 0;
  virtual void sendError(std::uint64_t id, const platform::RemoteError& error) = 0;
  // A second reply to one request came; the first went out.
  virtual void dropReply() = 0;
  // The request's work ended in the middle for want of memory.
  virtual void refuseForMemory(std::uint64_t id) noexcept = 0;
};

// Takes the request's arguments out of it and calls the operation; what the operation does with them comes before this
// returns or is its own to queue. A reply that never comes is the operation's to decide: nobody waits for it.
// Operations of the service only; others are left alone.
void dispatchRequest(wire::DecodedRequest& request, platform::TarnReportingServiceProtocol& service,
                     std::weak_ptr<ReplySink> sink);

// What serving the request costs at least, in units of about a microsecond, from its kind and the bytes of its frame;
// long work charges more as it goes on. Round figures: turns need the right order of magnitude.
std::size_t costOf(const wire::Request& request, std::size_t frameBytes) noexcept;

// Whether a request changes nothing, so that it needn't be served when nobody is there to read the reply.
constexpr bool onlyAsks(wire::Operation operation) noexcept {
  const wire::Result result = wire::rowOf(operation).result;
  return result == wire::Result::Number || result == wire::Result::Dictionary || result == wire::Result::Numbers;
}

}  // namespace tarn::linux_host
