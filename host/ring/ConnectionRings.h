// ConnectionRings: the rings and shapes of one connection, and how their records become requests.
//
// The rings of a connection share its part of a turn. A record that can't be handed on now (the owner takes none, or
// its shape isn't declared yet) stays where it is. At the end of the connection what was published by then is still
// served, before the connection's sessions stop.
//
// Made by RingBoard, owned by the connection. Threads: the main loop's.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "host/ring/RingReader.h"
#include "host/ring/ShapeTable.h"
#include "platform/UniqueFunction.h"
#include "plist/Result.h"
#include "wire/RequestDecoder.h"

namespace tarn::linux_host {

class RingBoard;

// The connection, as its rings see it.
class RingOwner {
 public:
  virtual ~RingOwner() = default;
  // Whether a request may be handed on now. Asked for each: must be cheap.
  virtual bool takesRingRequests() = 0;
  // Runs the work on the server queue after that of the requests that were served before.
  virtual void afterRingRequests(platform::Work work) = 0;
  // A checked request of the service, to which there is no reply.
  virtual void serveRingRequest(wire::DecodedRequest& request) = 0;
  // The record of the last request is done with: what it asked for may be done before the next one is read.
  virtual void workOffRingRequest() = 0;
  // Names the client in a log line.
  virtual std::string description() const = 0;
};

class ConnectionRings : public std::enable_shared_from_this<ConnectionRings> {
 public:
  using Drained = platform::UniqueFunction<void()>;

  // The board outlives it.
  ConnectionRings(RingBoard& board, std::weak_ptr<RingOwner> owner);
  ConnectionRings(const ConnectionRings&) = delete;
  ConnectionRings& operator=(const ConnectionRings&) = delete;
  ~ConnectionRings();

  // Takes the ring that these descriptors are; its number, from 1.
  Result<std::uint64_t> open(std::vector<UniqueDescriptor> descriptors);
  Status declareShape(const plist::Dictionary& description);

  // Reads what is published by now, then closes all rings and calls `drained`, which may be at once.
  void end(Drained drained);

  // For the board: serves up to a turn's share. Whether there is more to serve right now.
  bool serveTurn(std::chrono::nanoseconds now);
  // Whether a ring is awake, or waits for the recorder at least.
  bool isActive() const noexcept;
  bool isAwake() const noexcept;
  bool has(const RingIdentity& identity) const noexcept;

 private:
  // Whether it went on, or why it didn't.
  enum class Step : std::uint8_t { Served, Nothing, Held };

  std::optional<RingFault> check(const std::vector<UniqueDescriptor>& descriptors, RingMemory& memory) const;
  Error refuse(RingFault fault);
  bool serveRing(RingReader& reader, std::size_t& share);
  Step serveRecord(RingReader& reader, RingOwner& owner, std::size_t& share);
  Step serveMessage(RingReader& reader, RingOwner& owner, std::span<const std::byte> content);
  Step serveFrame(RingReader& reader, RingOwner& owner, std::span<const std::byte> content);
  Step refuseRecord(RingReader& reader, tarnring_refusal reason);
  void close(RingReader& reader);
  void closeFinished();
  void rest(RingReader& reader, std::chrono::nanoseconds now);
  void wake(RingReader& reader);
  void follow();
  void noteDoneAfterTheWork(const std::vector<std::shared_ptr<RingReader>>& served);

  RingBoard& board_;
  std::weak_ptr<RingOwner> owner_;
  ShapeTable shapes_;
  std::vector<std::shared_ptr<RingReader>> rings_;
  std::vector<std::byte> buffer_;  // a record's content
  std::size_t first_ = 0;          // whose turn it is to be served first
  std::uint64_t nextNumber_ = 1;
  std::uint64_t dropped_ = 0;
  Drained drained_;
  bool ending_ = false;
  bool refusalLogged_ = false;  // one line a connection will do
};

}  // namespace tarn::linux_host
