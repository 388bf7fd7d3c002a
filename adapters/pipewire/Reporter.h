// SPDX-License-Identifier: Apache-2.0
// Reporter: carries out the StreamBook's actions through the C client.
//
// The client connects by itself, keeps sessions over a restart of the service, and holds messages meanwhile. What it
// can't know is what to tell a service that started anew: that a stream has been playing for long. So before a message
// goes to a session that was last told to another connection, how the stream is goes first, with the time from which
// on it is so. Nothing is looked at in between: without events there is nothing to do.
//
// While no service answers only so many sessions are begun as shall wait; a stream beyond them has its session when it
// has something to say and there is a service. Owned by the program. Threads: one at a time.
#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
#include <utility>

#include "adapters/pipewire/core/StreamMemory.h"
#include "plist/Result.h"

struct tarnreporting_client;
struct tarnreporting_session;
struct tarnreporting_writer;

namespace tarn::streams {

class Reporter {
 public:
  // What was carried out, and what couldn't be.
  struct Counts {
    std::uint64_t sessions = 0;
    std::uint64_t messages = 0;
    std::uint64_t lost = 0;     // messages that found no room, or that the library refused
    std::uint64_t leftOut = 0;  // sessions that weren't begun while nobody answered
    std::string lastRefusal;    // why the last message was lost
  };

  // While no service answers.
  static constexpr std::uint64_t kMostWaiting = 256;

  Reporter() = default;
  ~Reporter();
  Reporter(const Reporter&) = delete;
  Reporter& operator=(const Reporter&) = delete;

  // Opens the client, which looks for the service from then on. An empty path leaves it to the library.
  Status open(const std::string& socket);
  void carryOut(const Actions& actions);
  // Waits at most so long for what was posted to be taken. Messages that nobody took.
  std::uint64_t close(std::uint32_t milliseconds);
  const Counts& counts() const { return counts_; }
  // What the service refused so far: sessions, shapes and messages.
  std::uint64_t refused() const;
  // What went wrong last between the client and the service; empty when nothing did.
  std::string lastError() const;

 private:
  struct Session {
    explicit Session(BeginSession begin) : memory(std::move(begin)) {}

    StreamMemory memory;
    tarnreporting_session* handle = nullptr;  // null: it is left out until there is a service
    std::uint64_t connection = 0;             // the one that was told how the stream is
  };
  struct Standing {
    bool isConnected = false;
    std::uint64_t connection = 0;  // the present one, or the next
  };

  void carryOut(const BeginSession& begin);
  void carryOut(const PostMessage& post);
  void carryOut(const EndSession& end);
  bool begin(Session& session);
  void send(const Session& session, const PostMessage& post);
  Standing standing() const;

  tarnreporting_client* client_ = nullptr;
  tarnreporting_writer* writer_ = nullptr;
  std::unordered_map<StreamNumber, Session> sessions_;
  std::uint64_t waiting_ = 0;  // sessions that were begun since a service answered
  Counts counts_;
};

}  // namespace tarn::streams
