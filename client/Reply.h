// Reply: what became of a request, with values of the wire.
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

struct Reply {
  Outcome outcome = Outcome::Ok;
  wire::ReplyError error;  // for Error; for the other failures its text says more, its domain is empty
  std::vector<plist::Value> results;

  bool ok() const noexcept { return outcome == Outcome::Ok; }
  // The first result as an integer, a dictionary, a list of integers; 0 or empty when it is no such thing.
  std::int64_t number() const noexcept;
  plist::Dictionary dictionary() const noexcept;
  std::vector<std::int64_t> numbers() const;
};

// What a failure and a request that was not sent become.
Reply failure(Outcome outcome, std::string text);
Reply misuse();
Reply notSent(tarnkit::SendStatus status);

// Called once for each request that was sent, on the owner's thread.
using ReplyHandler = std::function<void(Reply&& reply)>;

}  // namespace tarn::client
