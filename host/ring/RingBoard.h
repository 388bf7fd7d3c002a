// RingBoard: all rings of the service: who is looked at, when, and what was counted.
//
// While any ring is awake, all are looked at once a turn of the loop, and by one timer where nothing else makes a turn.
// A ring without records for a while sleeps; its client then wakes us. So an idle service does nothing.
//
// Owned by what the connections share; outlives the connections. Threads: the main loop's.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <vector>

#include "host/loop/MainLoop.h"
#include "host/ring/ConnectionRings.h"
#include "host/ring/RingCounts.h"
#include "host/ring/RingLimits.h"
#include "platform/Log.h"
#include "platform/UniqueFunction.h"
#include "wire/RequestDecoder.h"

namespace tarn::linux_host {

class RingBoard {
 public:
  using CommitSource = platform::UniqueFunction<CommitPoint()>;

  // Loop and log outlive the board, and the loop runs no more when the board ends.
  RingBoard(MainLoop& loop, platform::Log& log, const RingLimits& limits = {});
  RingBoard(const RingBoard&) = delete;
  RingBoard& operator=(const RingBoard&) = delete;
  ~RingBoard();

  // Without one everything counts as committed once it is taken.
  void setCommitSource(CommitSource source) { commits_ = std::move(source); }

  // The rings of a new connection.
  std::shared_ptr<ConnectionRings> connect(std::weak_ptr<RingOwner> owner);

  // For the connections.
  CommitPoint commitPoint() { return commits_ ? commits_() : CommitPoint{}; }
  bool isOpen(const RingIdentity& identity) const noexcept;
  // Looks at these rings from now on until they sleep.
  void activate(std::shared_ptr<ConnectionRings> rings);

  MainLoop& loop;
  platform::Log& log;
  const RingLimits limits;
  RingCounts counts;
  // One for all rings: it keeps nothing between records but scratch space.
  wire::RequestDecoder decoder;
  wire::DecodedRequest request;
  wire::Refusal refusal;

 private:
  void look();
  void armTimer(std::chrono::nanoseconds now);

  CommitSource commits_;
  std::vector<std::weak_ptr<ConnectionRings>> all_;
  std::vector<std::shared_ptr<ConnectionRings>> active_;
  std::vector<std::shared_ptr<ConnectionRings>> turn_;                           // those whose turn it is
  std::chrono::nanoseconds nextLook_ = std::chrono::nanoseconds::max();          // for which the timer is set
  const std::shared_ptr<RingBoard*> self_ = std::make_shared<RingBoard*>(this);  // for the timer, which may outlive us
};

}  // namespace tarn::linux_host
