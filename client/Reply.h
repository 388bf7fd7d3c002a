// SPDX-License-Identifier: Apache-2.0
// Reply: what became of a request, with values of the wire. Plain data, made by the connection and handed over to
// whoever waits; the owner's form of it is tarnkit::Reply. Threads: one at a time.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "plist/Value.h"
#include "wire/ReplyDecoder.h"

#include <tarnkit/Options.h>
#include <tarnkit/Reply.h>

namespace tarn::client {

using tarnkit::Outcome;
using tarnkit::outcomeName;

// The wire's form of tarnkit::Reply: values stay packed. Plain data, which the handler may keep.
struct Reply {
  // Ok: `results` count. Anything else: `error` does.
  Outcome outcome = Outcome::Ok;
  wire::ReplyError error;  // for Error; for the other failures its text says more, its domain is empty
  // As the service sent them: one at most, of the operation's kind.
  std::vector<plist::Value> results;

  // Whether `results` may be looked at.
  bool ok() const noexcept { return outcome == Outcome::Ok; }
  // The first result as an integer, a dictionary, a list of integers; 0 or empty when it is no such thing or there is
  // none. Numbers of other kinds, and whatever a list holds, are converted as ValueView::asInt64() does.
  std::int64_t number() const noexcept;
  plist::Dictionary dictionary() const noexcept;
  std::vector<std::int64_t> numbers() const;
};

// Replies that no service sent: of a request that failed after it was sent, of a call that was not allowed, of one that
// was not sent, whose Outcome says why.
Reply failure(Outcome outcome, std::string text);
Reply misuse();
Reply notSent(tarnkit::SendStatus status);

// Called once for each request that was sent, on the owner's thread.
using ReplyHandler = std::function<void(Reply&& reply)>;

}  // namespace tarn::client
