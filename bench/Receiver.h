// SPDX-License-Identifier: Apache-2.0
// Receiver: a process that takes messages and answers each: the service or a peer. What is measured beside each other
// is driven by the same code.
//
// Owned by a figure. The receiving process ends with the object. Threads: one.
#pragma once

#include <cstddef>

namespace tarn::bench {

enum class Writes {
  OneEach,   // a system call for each request
  Gathered,  // as many requests a call as may be outstanding
};

class Receiver {
 public:
  virtual ~Receiver() = default;
  // Makes the message that the next round trip sends. Not measured.
  virtual void prepare() {}
  // Sends one message and waits for the reply.
  virtual void roundTrip() = 0;
  // Sends so many messages, at most `outstanding` of them without their reply, and waits for all replies.
  virtual void stream(std::size_t count, std::size_t outstanding) = 0;
  // Processor time of the receiving process so far.
  virtual double processorSeconds() const = 0;
  // Lets the receiver forget the messages that it keeps. Not measured.
  virtual void forget() {}
};

}  // namespace tarn::bench
