// SPDX-License-Identifier: Apache-2.0
// The requests of SocketConnection: what is done with one that was decoded, until its work waits in the lane.
#include <new>
#include <utility>

#include "host/socket/SocketConnection.h"
#include "host/system/MemoryReserve.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kAdminOnly = "only over the admin socket";
// Of an answer to `status`, in units of cost.
constexpr std::size_t kStatusCost = 24;

// What needs memory that it doesn't give back. The rest is served also when there is none to be spared.
bool takesMemory(wire::Operation operation) {
  return operation != wire::Operation::StopReportingSessionForID &&
         operation != wire::Operation::DestroyReportingSession && operation != wire::Operation::Settle &&
         operation != wire::Operation::KillService;
}

}  // namespace

void SocketConnection::serveRequest(wire::DecodedRequest& request, std::size_t frameBytes) noexcept {
  const std::uint64_t id = request.id;
  handedOver_ = false;
  try {
    takeRequest(request, frameBytes);
  } catch (const std::bad_alloc&) {
    if (!handedOver_) {  // else whoever had the reply has refused it
      refuseForMemory(id);
    }
  }
}

void SocketConnection::takeRequest(wire::DecodedRequest& request, std::size_t frameBytes) {
  if (peerGone_ && onlyAsks(request.operation)) {
    lane_.spend(1);
    ++host_.ledger.questionsDropped;
    return;
  }
  if (request.operation == wire::Operation::Status) {
    // At once: whoever asks how the service is must not wait for its work.
    lane_.spend(kStatusCost);
    sendReply(request.id, {host_.status(onlyUser())});
    return;
  }
  if (!refusal_.empty()) {
    refuseRequest(request.id, wire::ErrorCode::OverQuota, refusal_);
    return;
  }
  if (!mayAskFor(request.operation)) {
    refuseRequest(request.id, wire::ErrorCode::AdminOnly, std::string(kAdminOnly));
    return;
  }
  if (!MemoryReserve::isWhole() && takesMemory(request.operation)) [[unlikely]] {
    refuseForMemory(request.id);
    return;
  }
  if (request.operation == wire::Operation::OpenRing || request.operation == wire::Operation::DeclareShape) {
    lane_.spend(costOf(request, frameBytes));
    serveRingOperation(request);
    return;
  }
  if (!std::exchange(mayTake_, false) && !host_.takesFrom(&party())) {
    hold(request, frameBytes);
    return;
  }
  lane_.spend(costOf(request, frameBytes));
  const bool isMessage = request.operation == wire::Operation::SendMessage;
  if (std::string why = quotaRefusal(request); !why.empty()) [[unlikely]] {
    host_.ledger.messagesReceived += isMessage ? 1 : 0;
    host_.ledger.messagesOverQuota += isMessage ? 1 : 0;
    refuseRequest(request.id, wire::ErrorCode::OverQuota, std::move(why));
  } else if (request.operation == wire::Operation::Settle) {
    settle(request.id);
  } else {
    host_.ledger.messagesReceived += isMessage ? 1 : 0;
    handOver(request);
  }
}

// What it takes until it waits in the lane may be refused.
void SocketConnection::handOver(wire::DecodedRequest& request) {
  const WorkLane::Scope scope(&lane_);
  const MemoryReserve::Refusable refusable;
  handedOver_ = true;
  dispatchRequest(request, *object_, weak_from_this());
}

// The request stays here until it can be served. Only one of a connection does, but there may be many connections.
void SocketConnection::hold(wire::DecodedRequest& request, std::size_t frameBytes) {
  if (std::string why = use_.refusalOfWaitingBytes(frameBytes); !why.empty()) {
    refuseRequest(request.id, wire::ErrorCode::OverQuota, std::move(why));
    return;
  }
  heldRequest_ = std::move(request);
  heldBytes_ = frameBytes;
  host_.gate.countHeld();
  host_.shares.ready(self());
  countWaitingBytes(0);
}

// All that was sent before it is dealt with by now; what that handed over is to be committed.
void SocketConnection::settle(std::uint64_t id) {
  host_.settle(
      [sink = weak_from_this(), id] {
        if (const auto connection = sink.lock()) {
          connection->sendReply(id, {});
        }
      },
      [sink = weak_from_this(), id] {
        if (const auto connection = sink.lock()) {
          connection->refuseForMemory(id);
        }
      });
}

std::string SocketConnection::quotaRefusal(const wire::Request& request) {
  if (request.operation == wire::Operation::SendMessage) {
    noteLogBytes();
    if (std::string why = use_.refusalOfLog(); !why.empty()) return why;
    if (!use_.limitsMessages()) return {};
    const auto now = host_.loop.clock().monotonic();
    return use_.refusalOfMessage(std::chrono::duration_cast<std::chrono::seconds>(now).count());
  }
  if (request.operation == wire::Operation::CreateReportingSession && !object_->hasSession(request.reporterID)) {
    countSessions();
    return use_.refusalOfSession();
  }
  return {};
}

void SocketConnection::serveRingOperation(const wire::DecodedRequest& request) {
  if (rings_ == nullptr) {
    rings_ = host_.rings.connect(weak_from_this());
  }
  if (request.operation == wire::Operation::OpenRing) {
    const Result<std::uint64_t> opened = rings_->open(std::exchange(descriptors_, {}));
    answerRingOperation(request.id, opened.value, opened.error);
  } else {
    answerRingOperation(request.id, true, rings_->declareShape(request.dictionary));
  }
}

void SocketConnection::answerRingOperation(std::uint64_t id, plist::ValueView result, const Status& done) {
  if (done.ok()) {
    sendReply(id, {result});
    return;
  }
  refuseRequest(id, wire::ErrorCode::BadArguments, done->text);
}

// In the connection's own line, after what it sent over the socket before.
void SocketConnection::serveRingRequest(wire::DecodedRequest& request) {
  if (request.operation == wire::Operation::SendMessage) {
    ++host_.ledger.messagesReceived;
  }
  const WorkLane::Scope scope(&lane_);
  dispatchRequest(request, *object_, {});
}

bool SocketConnection::serveRingMessages(platform::MessageRun& run) {
  if (!lane_.empty() || ringCost_ >= FairShares::kQuantum) return false;
  host_.loop.queue()->asyncIn(lane_, [this, &run] { object_->sendMessages(run); });
  runLaneAhead();
  return true;
}

// Ahead of the connection's turn while that is cheap, and charged to it: what one message needs for a moment is then
// in the cache still when the next one needs it. Work that waits for its turn is not overtaken.
void SocketConnection::workOffRingRequest() {
  if (lane_.pieces() == 1 && ringCost_ < FairShares::kQuantum) {
    runLaneAhead();
  }
  if (!lane_.empty()) {
    host_.shares.ready(self());
  }
}

void SocketConnection::runLaneAhead() {
  const LogClientScope scope(client_);
  lane_.beginTurn(FairShares::kQuantum - ringCost_);
  runLane();
  ringCost_ += lane_.spent();
}

void SocketConnection::afterRingRequests(platform::Work work) {
  host_.loop.queue()->asyncIn(lane_, std::move(work));
  host_.shares.ready(self());
}

}  // namespace tarn::linux_host
