// SPDX-License-Identifier: Apache-2.0
#include "host/ring/ConnectionRings.h"

#include <sys/epoll.h>

#include <algorithm>
#include <span>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "host/ring/RingBoard.h"
#include "host/system/MemoryReserve.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "ConnectionRings";

tarnring_refusal refusalOf(wire::ErrorCode code) {
  return static_cast<tarnring_refusal>(code);
}
static_assert(static_cast<int>(wire::ErrorCode::UnknownOperation) == TARNRING_UNKNOWN_OPERATION &&
              static_cast<int>(wire::ErrorCode::BadArguments) == TARNRING_BAD_ARGUMENTS &&
              static_cast<int>(wire::ErrorCode::NotPropertyList) == TARNRING_NOT_PROPERTY_LIST);

}  // namespace

// The messages of one ring from one that was looked at and decoded already, to the first record that isn't a message
// for one session or isn't to be handed on now.
class ConnectionRings::Run final : public platform::MessageRun {
 public:
  Run(ConnectionRings& rings, RingReader& reader, RingOwner& owner, const ring::Record& record,
      const ShapeTable::Message& message) noexcept
      : rings_(rings), reader_(reader), owner_(owner), record_(record), decoded_(message) {}

  const Message* next() override {
    if (std::exchange(began_, true) && !lookForMore()) return nullptr;
    // Before it is handed over: see serveRequest().
    rings_.take(reader_, record_);
    ++rings_.board_.counts.messages;
    owner_.countRingMessage();
    message_ = {decoded_.payload, decoded_.category, decoded_.type, decoded_.reporterIDs->value().front()};
    return &message_;
  }
  bool began() const noexcept { return began_; }

  static bool isFor(const ShapeTable::Message& message) noexcept {
    return *message.reporterIDs && (*message.reporterIDs)->size() == 1;
  }

 private:
  // Whether the next record is a message that belongs to the run. What is wrong with its values is refused and passed.
  bool lookForMore() {
    while (rings_.share_ != 0 && !reader_.isAtEnd() && owner_.takesMoreOfTheRun() && MemoryReserve::isWhole() &&
           reader_.consumer().next(rings_.buffer_.data(), record_) == ring::Look::Record &&
           record_.kind == TARNRING_MESSAGE) {
      switch (decode()) {
        case ShapeTable::Decoded::Ok:
          return isFor(decoded_);
        case ShapeTable::Decoded::UnknownShape:
          return false;
        case ShapeTable::Decoded::BadValues:
          rings_.refuseRecord(reader_, record_, TARNRING_BAD_VALUES);
          break;
      }
    }
    return false;
  }
  // Without the memory for it, it is left to be looked at once more after the run.
  ShapeTable::Decoded decode() {
    try {
      return rings_.decodeMessage(record_, decoded_);
    } catch (const std::bad_alloc&) {
      return ShapeTable::Decoded::UnknownShape;
    }
  }

  ConnectionRings& rings_;
  RingReader& reader_;
  RingOwner& owner_;
  ring::Record record_;
  ShapeTable::Message decoded_;
  Message message_;
  bool began_ = false;
};

ConnectionRings::ConnectionRings(RingBoard& board, std::weak_ptr<RingOwner> owner)
    : board_(board), owner_(std::move(owner)) {}

ConnectionRings::~ConnectionRings() {
  for (const auto& reader : rings_) {
    close(*reader);
  }
}

Result<std::uint64_t> ConnectionRings::open(std::vector<UniqueDescriptor> descriptors) {
  RingMemory memory;
  if (const std::optional<RingFault> fault = check(descriptors, memory)) return {0, refuse(*fault)};
  const auto reader = std::make_shared<RingReader>(std::move(memory), std::move(descriptors[1]),
                                                   static_cast<std::uint64_t>(board_.loop.clock().monotonic().count()),
                                                   [weak = weak_from_this()](RingReader& woken) {
                                                     if (const auto self = weak.lock()) {
                                                       self->wake(woken);
                                                     }
                                                   });
  // First what needs memory: from then on it is watched and closed as a whole.
  buffer_.resize(std::max<std::size_t>(buffer_.size(), reader->consumer().mostContent()));
  rings_.reserve(rings_.size() + 1);
  served_.reserve(rings_.size() + 1);
  // By the edge: nobody reads it, so it stays ready.
  if (board_.loop.watch(reader->wakeDescriptor(), EPOLLIN | EPOLLET, reader).failed()) {
    return {0, refuse(RingFault::System)};
  }
  reader->lastRecord = board_.loop.clock().monotonic();
  rings_.push_back(reader);
  ++board_.counts.open;
  ++board_.counts.opened;
  board_.counts.bytesOpen += reader->bytes();
  board_.activate(shared_from_this());
  return {nextNumber_++};
}

std::optional<RingFault> ConnectionRings::check(const std::vector<UniqueDescriptor>& descriptors,
                                                RingMemory& memory) const {
  if (descriptors.size() != 2 || !isEventDescriptor(descriptors[1].get())) return RingFault::Descriptors;
  if (ending_ || rings_.size() >= board_.limits.maxRingsAConnection || board_.counts.open >= board_.limits.maxRings) {
    return RingFault::TooMany;
  }
  if (const std::optional<RingFault> fault = memory.map(descriptors[0].get())) return fault;
  return board_.isOpen(memory.identity()) ? std::optional(RingFault::InUse) : std::nullopt;
}

Error ConnectionRings::refuse(RingFault fault) {
  board_.counts.count(fault);
  const auto owner = owner_.lock();
  if (owner != nullptr && !std::exchange(refusalLogged_, true)) {
    logPrefixed(board_.log, kConnectionCategory, platform::LogLevel::Error, kModule,
                "refused a ring of " + owner->description() + ": " + textOf(fault));
  }
  return {0, std::string("openRing: ") + textOf(fault)};
}

Status ConnectionRings::declareShape(const plist::Dictionary& description) {
  const Status declared = shapes_.declare(description);
  if (!rings_.empty()) {
    board_.activate(shared_from_this());  // a message may have waited for it
  }
  if (declared.failed()) return Error{0, "declareShape: " + declared->text};
  return {};
}

void ConnectionRings::end(Drained drained) {
  ending_ = true;
  drained_ = std::move(drained);
  for (const auto& reader : rings_) {
    reader->endAtHead();
    wake(*reader);
  }
  closeFinished();
}

bool ConnectionRings::isActive() const noexcept {
  return std::any_of(rings_.begin(), rings_.end(),
                     [](const auto& reader) { return !reader->asleep || reader->awaitsCommit(); });
}

bool ConnectionRings::isAwake() const noexcept {
  return std::any_of(rings_.begin(), rings_.end(), [](const auto& reader) { return !reader->asleep; });
}

bool ConnectionRings::has(const RingIdentity& identity) const noexcept {
  return std::any_of(rings_.begin(), rings_.end(), [&](const auto& reader) { return reader->identity() == identity; });
}

bool ConnectionRings::serveTurn(std::chrono::nanoseconds now) {
  share_ = board_.limits.turnBytes;
  served_.clear();
  for (std::size_t i = 0; i < rings_.size(); ++i) {
    const auto reader = rings_[(first_ + i) % rings_.size()];
    if (reader->asleep) continue;
    const std::uint64_t before = reader->consumer().taken();
    const bool held = serveRing(*reader);
    const std::uint64_t dropped = reader->newlyDropped();
    dropped_ += dropped;
    board_.counts.droppedByClients += dropped;
    if (reader->consumer().taken() != before) {
      served_.push_back(reader);
    }
    if (held || reader->consumer().taken() != before) {
      reader->lastRecord = now;
    } else {
      rest(*reader, now);
    }
  }
  first_ = rings_.empty() ? 0 : (first_ + 1) % rings_.size();
  noteDoneAfterTheWork();
  follow();
  closeFinished();
  return share_ == 0;
}

// Tells what the recorder has of it, where somebody waits for that.
void ConnectionRings::follow() {
  const bool awaited =
      std::any_of(rings_.begin(), rings_.end(), [](const auto& reader) { return reader->awaitsCommit(); });
  if (awaited) {
    const CommitPoint point = board_.commitPoint();
    for (const auto& reader : rings_) {
      reader->follow(point);
    }
  }
}

// Serves records until there are none, the share is used up or one is held. Whether one is.
bool ConnectionRings::serveRing(RingReader& reader) {
  const auto owner = owner_.lock();
  while (owner != nullptr && share_ != 0 && !reader.finished && !reader.isAtEnd()) {
    const Step step = serveRecord(reader, *owner);
    if (step == Step::Held) return true;
    if (step == Step::Nothing) {
      reader.finished = reader.finished || reader.ending() || reader.consumer().ended();
      return false;
    }
    owner->workOffRingRequest();
  }
  reader.finished = reader.finished || owner == nullptr || reader.isAtEnd();
  return false;
}

ConnectionRings::Step ConnectionRings::serveRecord(RingReader& reader, RingOwner& owner) {
  ring::Record record;
  const ring::Look look = reader.consumer().next(buffer_.data(), record);
  if (look == ring::Look::Broken) {
    reader.finished = true;
    board_.counts.count(RingFault::Broken);
    logPrefixed(board_.log, kConnectionCategory, platform::LogLevel::Error, kModule,
                "closed a ring of " + owner.description() + ": " + textOf(RingFault::Broken));
  }
  return look == ring::Look::Record ? serveContent(reader, owner, record) : Step::Nothing;
}

void ConnectionRings::take(RingReader& reader, const ring::Record& record) {
  reader.consumer().take(record);
  share_ -= std::min<std::size_t>(share_, TARNRING_RECORD_HEAD_BYTES + tarnring_padded(record.length));
}

ConnectionRings::Step ConnectionRings::serveContent(RingReader& reader, RingOwner& owner, const ring::Record& record) {
  if (record.kind == TARNRING_GAP) {
    ++board_.counts.gaps;
    take(reader, record);
    return Step::Served;
  }
  if (!owner.takesRingRequests()) return Step::Held;
  try {
    return record.kind == TARNRING_MESSAGE ? serveMessage(reader, owner, record) : serveFrame(reader, owner, record);
  } catch (const std::bad_alloc&) {
    return Step::Held;  // it waits in the ring until there is memory for it
  }
}

ConnectionRings::Step ConnectionRings::serveMessage(RingReader& reader, RingOwner& owner, const ring::Record& record) {
  ShapeTable::Message message;
  switch (decodeMessage(record, message)) {
    case ShapeTable::Decoded::UnknownShape:
      // It may be on its way on the socket still.
      if (!reader.ending()) return Step::Held;
      return board_.serviceEnds ? Step::Nothing : refuseRecord(reader, record, TARNRING_UNKNOWN_SHAPE);
    case ShapeTable::Decoded::BadValues:
      return refuseRecord(reader, record, TARNRING_BAD_VALUES);
    case ShapeTable::Decoded::Ok:
      break;
  }
  if (serveRun(reader, owner, record, message)) return Step::Served;
  {
    const MemoryReserve::Refusable refusable;
    board_.request = message.request();
  }
  return serveRequest(reader, owner, record);
}

ShapeTable::Decoded ConnectionRings::decodeMessage(const ring::Record& record, ShapeTable::Message& message) {
  const MemoryReserve::Refusable refusable;
  return shapes_.decode(contentOf(record), message);
}

// While the reserve isn't whole a message isn't taken before there is memory for all of it.
bool ConnectionRings::serveRun(RingReader& reader, RingOwner& owner, const ring::Record& record,
                               const ShapeTable::Message& message) {
  if (!Run::isFor(message) || !MemoryReserve::isWhole()) return false;
  Run run(*this, reader, owner, record, message);
  return owner.serveRingMessages(run) && run.began();
}

// The record is taken before it is handed over: the recorder may commit what comes of it while this turn goes on, and a
// service that is killed then must not leave it in the ring for the next one. Once it is handed over it can't be taken
// back to be tried again.
ConnectionRings::Step ConnectionRings::serveRequest(RingReader& reader, RingOwner& owner, const ring::Record& record) {
  board_.counts.messages += board_.request.operation == wire::Operation::SendMessage ? 1 : 0;
  take(reader, record);
  const bool served =
      MemoryReserve::orGiveUp(MemoryReserve::Loss::Request, [&] { owner.serveRingRequest(board_.request); });
  if (!served) {
    countRefusal(reader, TARNRING_OUT_OF_MEMORY);
  }
  return Step::Served;
}

ConnectionRings::Step ConnectionRings::serveFrame(RingReader& reader, RingOwner& owner, const ring::Record& record) {
  switch (board_.decoder.decode(contentOf(record), board_.request, board_.refusal)) {
    case wire::DecodeVerdict::Unreadable:
      return refuseRecord(reader, record, TARNRING_UNREADABLE);
    case wire::DecodeVerdict::Refused:
      if (board_.refusal.code == wire::ErrorCode::OutOfMemory) return Step::Held;  // it waits until there is some
      return refuseRecord(reader, record, refusalOf(board_.refusal.code));
    case wire::DecodeVerdict::Ok:
      break;
  }
  if (board_.request.operation == wire::Operation::DeclareShape) {
    if (shapes_.declare(board_.request.dictionary).failed()) {
      return refuseRecord(reader, record, TARNRING_BAD_ARGUMENTS);
    }
    take(reader, record);
    return Step::Served;
  }
  if (wire::rowOf(board_.request.operation).servedBy == wire::ServedBy::Host) {
    return refuseRecord(reader, record, TARNRING_UNKNOWN_OPERATION);
  }
  if (!owner.mayAskFor(board_.request.operation)) return refuseRecord(reader, record, TARNRING_ADMIN_ONLY);
  return serveRequest(reader, owner, record);
}

// Counted, and gone on with.
ConnectionRings::Step ConnectionRings::refuseRecord(RingReader& reader, const ring::Record& record,
                                                    tarnring_refusal reason) {
  countRefusal(reader, reason);
  take(reader, record);
  return Step::Served;
}

void ConnectionRings::countRefusal(RingReader& reader, tarnring_refusal reason) {
  board_.counts.count(reason);
  reader.consumer().refuse(reason);
}

// Once the work that the records became has run, the recorder has got what comes of it.
void ConnectionRings::noteDoneAfterTheWork() {
  const auto owner = owner_.lock();
  for (const auto& reader : served_) {
    if (owner == nullptr) return;
    owner->afterRingRequests([reader, position = reader->consumer().taken(),
                              messages = reader->consumer().takenMessages()] { reader->noteDone(position, messages); });
    reader->noteAsked();
  }
}

void ConnectionRings::rest(RingReader& reader, std::chrono::nanoseconds now) {
  if (!reader.finished && now - reader.lastRecord >= board_.limits.awakeFor) {
    reader.asleep = reader.consumer().prepareToSleep();
  }
}

void ConnectionRings::wake(RingReader& reader) {
  if (std::exchange(reader.asleep, false)) {
    reader.consumer().awake();
  }
  reader.lastRecord = board_.loop.clock().monotonic();
  board_.activate(shared_from_this());
}

void ConnectionRings::closeFinished() {
  const auto last = std::stable_partition(rings_.begin(), rings_.end(), [](const auto& reader) {
    return !reader->finished || (!reader->ending() && reader->awaitsCommit());
  });
  for (auto reader = last; reader != rings_.end(); ++reader) {
    close(**reader);
  }
  rings_.erase(last, rings_.end());
  if (!ending_ || !rings_.empty() || !drained_) return;
  const auto owner = owner_.lock();
  if (dropped_ != 0 && owner != nullptr) {
    MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] {
      logPrefixed(
          board_.log, kConnectionCategory, platform::LogLevel::Default, kModule,
          owner->description() + " dropped " + std::to_string(dropped_) + " messages for want of room in its rings");
    });
  }
  std::exchange(drained_, {})();
}

void ConnectionRings::close(RingReader& reader) {
  board_.loop.unwatch(reader.wakeDescriptor());
  --board_.counts.open;
  board_.counts.bytesOpen -= reader.bytes();
}

}  // namespace tarn::linux_host
