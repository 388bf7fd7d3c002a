// SPDX-License-Identifier: Apache-2.0
// Reply: what became of a request.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include <tarnkit/Value.h>

namespace tarnkit {

// What became of a request. Ok and Error are what the service answered; the others say that no answer can be had, and
// whether the request may have been served all the same: not when it is told as not sent.
enum class Outcome : std::uint8_t {
  // The service did what was asked; `results` hold what the operation answers.
  Ok,
  Error,           // the service answered with an error
  Cancelled,       // no reply can come any more: a held start whose session went away, or the owner closed
  ConnectionLost,  // the connection ended before the reply came
  TimedOut,        // call() gave up waiting; a reply that still comes is dropped
  Full,            // not sent: too many requests are outstanding
  TooLarge,        // not sent: the request is longer than a frame may be
  Misuse,          // not sent: another thread is just using the client, or call() was called inside a handler
};

// For logs: "ok", "error", "cancelled", "connection lost", "timed out", "full", "too large", "misuse". The text lives
// for ever.
std::string_view outcomeName(Outcome outcome) noexcept;

// What went wrong. For Outcome::Error as the service says it; for the other failures the text tells more, and the
// domain is empty.
struct ReplyError {
  // "sys.oxbow.audio.reporting.ipc" where the request was refused before it was served: codes 1 (unknown operation), 2
  // (a wrong argument), 3 (something in a dictionary that can't be there), 4 (over a quota).
  // "sys.oxbow.audio.reporting", code 1: a message while reporting is disabled.
  std::string domain;
  std::int64_t code = 0;
  // For people, in English and UTF-8.
  std::string text;
};

// A reply with everything that came with it; yours to keep or to move from.
struct Reply {
  // Look at this first.
  Outcome outcome = Outcome::Ok;
  ReplyError error;
  // None, or the one that the operation has; empty unless the outcome is Ok.
  std::vector<Value> results;

  bool ok() const noexcept { return outcome == Outcome::Ok; }
  // The first result as an integer, a dictionary, a list of integers; 0 or empty when it is no such thing or there is
  // none. Items of a list that are no integers are left out. The last two copy.
  std::int64_t number() const noexcept;
  Dictionary dictionary() const;
  std::vector<std::int64_t> numbers() const;
};

// Called once for each request that was sent, on the thread that drives the client. The reply is the handler's. It
// should be quick, since everything else waits for it, and must not throw.
using ReplyHandler = std::function<void(Reply&& reply)>;

}  // namespace tarnkit
