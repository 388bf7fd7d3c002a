// Reply: what became of a request.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include <tarnkit/Value.h>

namespace tarnkit {

enum class Outcome : std::uint8_t {
  Ok,
  Error,           // the service answered with an error
  Cancelled,       // no reply can come any more: a held start whose session went away, or the owner closed
  ConnectionLost,  // the connection ended before the reply came
  TimedOut,        // call() gave up waiting; a reply that still comes is dropped
  Full,            // not sent: too many requests are outstanding
  TooLarge,        // not sent: the request is longer than a frame may be
  Misuse,          // not sent: another thread is just using the client, or call() was called inside a handler
};

// "ok", "error", "cancelled", "connection lost", "timed out", "full", "too large", "misuse". The text lives for ever.
std::string_view outcomeName(Outcome outcome) noexcept;

// For Outcome::Error; for the other failures its text says more, its domain is empty.
struct ReplyError {
  std::string domain;
  std::int64_t code = 0;
  std::string text;
};

struct Reply {
  Outcome outcome = Outcome::Ok;
  ReplyError error;
  std::vector<Value> results;

  bool ok() const noexcept { return outcome == Outcome::Ok; }
  // The first result as an integer, a dictionary, a list of integers; 0 or empty when it is no such thing.
  std::int64_t number() const noexcept;
  Dictionary dictionary() const;
  std::vector<std::int64_t> numbers() const;
};

// Called once for each request that was sent, on the owner's thread.
using ReplyHandler = std::function<void(Reply&& reply)>;

}  // namespace tarnkit
