// SPDX-License-Identifier: Apache-2.0
// ConnectionRings: the rings and shapes of one connection, and how their records become requests.
//
// The rings of a connection share its part of a turn. A record that can't be handed on now (the owner takes none, or
// its shape isn't declared yet) stays where it is. At the end of the connection what was published by then is still
// served, before the connection's sessions stop.
//
// Made by RingBoard, owned by the connection. Threads: the main loop's.
//
// A record becomes its request once: it is accepted, and its room given back to the client, after it was handed on,
// refused and counted, or found to be a gap. A ring whose positions make no sense is closed alone; the connection and
// its other rings go on.
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
#include "platform/TarnReportingServiceProtocol.h"
#include "platform/UniqueFunction.h"
#include "plist/Result.h"
#include "wire/RequestDecoder.h"

namespace tarn::linux_host {

class RingBoard;

// The connection, as its rings see it. Held weakly: once it is gone nothing more is handed on.
class RingOwner {
 public:
  virtual ~RingOwner() = default;
  // Whether a request may be handed on now. False leaves the record where it is, to be asked for again in the next
  // turn. Asked for each: must be cheap.
  virtual bool takesRingRequests() = 0;
  // Runs the work on the server queue after that of the requests that were served before.
  virtual void afterRingRequests(platform::Work work) = 0;
  // Whether the client may ask for this at all.
  virtual bool mayAskFor(wire::Operation operation) const noexcept = 0;
  // A checked request of the service, to which there is no reply. It may be moved from.
  virtual void serveRingRequest(wire::DecodedRequest& request) = 0;
  // Hands messages on as one piece of work, ahead of the connection's turn, until the run gives no more. False, and
  // nothing was taken of the run: its messages are to be handed on one by one.
  virtual bool serveRingMessages(platform::MessageRun& run) = 0;
  // Asked before each further message of the run: whether there is one still in the turn. Must be cheap.
  virtual bool takesMoreOfTheRun() = 0;
  // A message of the run is taken, and comes next.
  virtual void countRingMessage() = 0;
  // The record of the last request is done with: what it asked for may be done before the next one is read. Work that
  // memory is missing for is given up in there, so the ring is read on.
  virtual void workOffRingRequest() = 0;
  // Names the client in a log line.
  virtual std::string description() const = 0;
};

class ConnectionRings : public std::enable_shared_from_this<ConnectionRings> {
 public:
  using Drained = platform::UniqueFunction<void()>;

  // The board outlives it. Made as shared, which its readers rely on.
  ConnectionRings(RingBoard& board, std::weak_ptr<RingOwner> owner);
  ConnectionRings(const ConnectionRings&) = delete;
  ConnectionRings& operator=(const ConnectionRings&) = delete;
  // Closes the rings that are left without reading them on; the connection calls end() first.
  ~ConnectionRings();

  // Takes the ring that these descriptors are (the memory file, then the eventfd, which alone is kept); its number,
  // from 1, which no later ring of the connection has. A fault is counted, logged once a connection, and is the error's
  // text, "openRing: why"; the descriptors are closed then. It is read with the next turn, from where its last reader
  // stopped.
  Result<std::uint64_t> open(std::vector<UniqueDescriptor> descriptors);
  // As ShapeTable::declare(), and has the rings looked at again: a message may have waited for it. The error's text
  // begins with "declareShape: ".
  Status declareShape(const plist::Dictionary& description);

  // Reads what is published by now, then closes all rings and calls `drained`, once, which may be at once. Records that
  // have to wait for their turn or for room are waited for; messages without their shape are refused, unless it is the
  // service that ends: then a ring is read up to there, and the rest stays for the next service. No ring is opened any
  // more. To be called once.
  void end(Drained drained);

  // For the board: serves up to a turn's share, beginning with another ring each time, and lets rings that had nothing
  // for a while sleep. Whether the share was used up, so that there is more to serve
  // right now.
  bool serveTurn(std::chrono::nanoseconds now);
  // Whether a ring is awake, or waits for the recorder at least. Else the board forgets this until activate().
  bool isActive() const noexcept;
  // Whether any ring must be looked at by ourselves; the others' clients wake us.
  bool isAwake() const noexcept;
  // Whether this memory is open here, by whatever descriptor.
  bool has(const RingIdentity& identity) const noexcept;

 private:
  // Whether it went on (Served), there is no more to read (Nothing), or the next record can't be handed on now (Held).
  enum class Step : std::uint8_t { Served, Nothing, Held };

  class Run;

  // What speaks against opening; the cheap questions first. `memory` is mapped when nothing does.
  std::optional<RingFault> check(const std::vector<UniqueDescriptor>& descriptors, RingMemory& memory) const;
  Error refuse(RingFault fault);
  // True: a record is held.
  bool serveRing(RingReader& reader);
  Step serveRecord(RingReader& reader, RingOwner& owner);
  Step serveContent(RingReader& reader, RingOwner& owner, const ring::Record& record);
  Step serveMessage(RingReader& reader, RingOwner& owner, const ring::Record& record);
  ShapeTable::Decoded decodeMessage(const ring::Record& record, ShapeTable::Message& message);
  // The message and those after it; nothing is taken where that is not possible now.
  bool serveRun(RingReader& reader, RingOwner& owner, const ring::Record& record, const ShapeTable::Message& message);
  // Goes on after the record, and takes it off the share of the turn.
  void take(RingReader& reader, const ring::Record& record);
  Step serveRequest(RingReader& reader, RingOwner& owner, const ring::Record& record);
  Step serveFrame(RingReader& reader, RingOwner& owner, const ring::Record& record);
  Step refuseRecord(RingReader& reader, const ring::Record& record, tarnring_refusal reason);
  void countRefusal(RingReader& reader, tarnring_refusal reason);
  std::span<const std::byte> contentOf(const ring::Record& record) const { return {buffer_.data(), record.length}; }
  void close(RingReader& reader);
  // Lets go of rings that ended and are safe on the disk, as the client reads that off the ring; at the connection's
  // end without waiting for it. Calls drained_ after the last.
  void closeFinished();
  // Asleep once there was no record for RingLimits::awakeFor, unless one came in that moment.
  void rest(RingReader& reader, std::chrono::nanoseconds now);
  void wake(RingReader& reader);
  void follow();
  void noteDoneAfterTheWork();

  RingBoard& board_;
  std::weak_ptr<RingOwner> owner_;
  ShapeTable shapes_;
  std::vector<std::shared_ptr<RingReader>> rings_;
  std::vector<std::shared_ptr<RingReader>> served_;  // in this turn
  std::vector<std::byte> buffer_;                    // a record's content
  std::size_t share_ = 0;                            // left of the turn, in bytes of records with their heads
  std::size_t first_ = 0;                            // whose turn it is to be served first
  std::uint64_t nextNumber_ = 1;
  // Messages that found no room in rings of the connection, as their clients tell it; logged at the end.
  std::uint64_t dropped_ = 0;
  Drained drained_;
  bool ending_ = false;
  bool refusalLogged_ = false;  // one line a connection will do
};

}  // namespace tarn::linux_host
