// SPDX-License-Identifier: Apache-2.0
// SocketConnection: one client on the socket. Cuts what it receives into frames, has them decoded, calls the exported
// object, and sends the replies.
//
// The client is not trusted. Its input is bounded by the largest frame, its unsent replies by a limit, its share of a
// turn by what FairShares gives it; a frame that can be answered is answered, one that can't ends this connection and
// no other. A frame is decoded when it is its turn, and the next one when all the work of the one before is done: so
// what waits is bytes, never requests, and long work that gives way isn't overtaken by what its client sent after it.
//
// Life: made by the listener, resumed by the delegate, then held by the loop until its end. At the end the frames that
// came whole have been handed to the object; after their work on the server queue come the interruption handler (when
// the end was not in order), the invalidation handler and the close, so replies to a client that only half-closed go
// out. Of a client that is gone altogether, what only asks is dropped.
//
// Where memory is missing: receiving and decoding a request may fail and is refused at once, with what the process
// keeps in reserve left to what was begun before; while the reserve isn't whole, requests are refused but for those
// that free memory. Work that fails takes its request along, which is refused then. A connection whose error reply
// finds no memory either is cut off. The end needs none: it is always served.
//
// Threads: the main loop's.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "host/log/LogClient.h"
#include "host/ring/ConnectionRings.h"
#include "host/socket/ConnectionHost.h"
#include "host/socket/NumbersReply.h"
#include "host/socket/QuotaUse.h"
#include "host/socket/ReplyOutput.h"
#include "host/socket/RequestDispatcher.h"
#include "host/system/MemoryReserve.h"
#include "host/system/UniqueDescriptor.h"
#include "platform/Listener.h"
#include "wire/FrameBuffer.h"

namespace tarn::linux_host {

class SocketConnection final : public platform::Connection,
                               public EventHandler,
                               public OpenConnection,
                               public ShareHolder,
                               public HalfFrames::Holder,
                               public ReplySink,
                               public RingOwner,
                               public std::enable_shared_from_this<SocketConnection> {
 public:
  // Takes over a connected socket that doesn't block. `number` names it in logs, from 1. The host outlives the
  // connection. Asks the kernel who the client is; nothing is received yet.
  SocketConnection(ConnectionHost& host, UniqueDescriptor socket, std::uint64_t number,
                   Access access = Access::Everything);
  SocketConnection(const SocketConnection&) = delete;
  SocketConnection& operator=(const SocketConnection&) = delete;
  ~SocketConnection() override;

  std::int32_t processIdentifier() const override { return client_.process; }
  // As the log's lines have it.
  std::int64_t number() const override { return static_cast<std::int64_t>(client_.connection); }
  std::uint32_t user() const noexcept override { return party().user; }
  const LogClient& client() const noexcept { return client_; }
  // With number, process, user and executable of the client, as they were when it connected: the client may have become
  // another program since.
  std::string description() const override { return description_; }
  // What requests are called on; set before resume() and held until the end's handlers have run.
  void setExportedObject(std::shared_ptr<platform::TarnReportingServiceProtocol> object) override;
  // Called at an end that was not in order, before the invalidation handler; both at most once, on the server queue,
  // after the work of all requests.
  void setInterruptionHandler(Handler handler) override { interruptionHandler_ = std::move(handler); }
  void setInvalidationHandler(Handler handler) override { invalidationHandler_ = std::move(handler); }
  // Begins to receive and counts as open. Once; does nothing when it was resumed.
  void resume() override;
  // For a user that has as many connections as it may: instead of setting it up and resuming it. It answers every
  // request but `status` with this text (error 4) until the client ends it, so that a client learns why.
  void refuse(std::string why);

  // The socket became ready: asks for a turn, or while requests aren't taken looks only for a `status` at the head.
  void handleEvents(std::uint32_t events) override;
  // Sends what is there, or puts that off by some turns while more replies are about to come.
  void flush() override;
  // Shuts the socket's reading side; the end then comes the way it always does.
  void endInput() override;
  void noteLogBytes() override;
  void leaveHost() noexcept override;
  Turn takeTurn(std::int64_t credit) override;
  void finishWork() override;
  // Cuts the connection off.
  void endHalfFrame(const std::string& why) override;

  void sendReply(std::uint64_t id, std::initializer_list<plist::ValueView> results) override;
  void sendNumbers(std::uint64_t id, std::vector<std::int64_t> numbers) override;
  void sendError(std::uint64_t id, const platform::RemoteError& error) override;
  void dropReply() override { output_.countDropped(); }
  void refuseForMemory(std::uint64_t id) noexcept override;

  bool mayAskFor(wire::Operation operation) const noexcept override {
    return access_ == Access::Everything || operation != wire::Operation::KillService;
  }
  bool takesRingRequests() override { return object_ != nullptr && host_.takesFrom(&party()); }
  void serveRingRequest(wire::DecodedRequest& request) override;
  bool serveRingMessages(platform::MessageRun& run) override;
  bool takesMoreOfTheRun() override { return lane_.hasTurn() && takesRingRequests(); }
  void countRingMessage() override { ++host_.ledger.messagesReceived; }
  void workOffRingRequest() override;
  void afterRingRequests(platform::Work work) override;

 private:
  enum class State : std::uint8_t {
    Fresh,   // not resumed yet
    Open,    // receives and replies
    Ending,  // receives no more; replies go out until the work before the end is done
    Ended,
  };

  std::shared_ptr<ShareHolder> self() { return shared_from_this(); }
  // Which events the loop is to tell; 0 for none. Asks the system only when that changes.
  void watch(std::uint32_t events);
  // One gulp into the frame buffer; whether bytes came. The client's end shows here.
  bool receive();
  // Does the next thing that is to be done, in this order: work of the lane, the held request, the next whole frame,
  // more bytes; whether there was one.
  bool serveNext();
  // The next frame of those that are received; false when there is no whole one. A frame that is too long ends the
  // connection.
  bool serveNextFrame();
  // Decodes one whole frame: a request, one that is answered with a refusal, or the end of the connection.
  void serveFrame(std::span<const std::byte> frame);
  // What memory is missing for is refused at once.
  wire::DecodeVerdict decode(std::span<const std::byte> frame);
  // Refuses it where memory is missing before it is handed over.
  void serveRequest(wire::DecodedRequest& request, std::size_t frameBytes) noexcept;
  void takeRequest(wire::DecodedRequest& request, std::size_t frameBytes);
  void handOver(wire::DecodedRequest& request);
  // Work in the lane ahead of the turn, which is charged for it.
  void runLaneAhead();
  // The work in the lane. A piece that memory is missing for is given up.
  void runLane();
  void hold(wire::DecodedRequest& request, std::size_t frameBytes);
  // Answers once all that this connection sent before is committed.
  void settle(std::uint64_t id);
  // Whose sessions it may see; nothing: everybody's.
  std::optional<std::uint32_t> onlyUser() const noexcept {
    return access_ == Access::OwnSessions ? std::optional(user()) : std::nullopt;
  }
  // Why the request is beyond a quota; empty when it is not.
  std::string quotaRefusal(const wire::Request& request);
  void refuseRequest(std::uint64_t id, wire::ErrorCode code, std::string why) noexcept;
  // Keeps what is known of the use of quotas in step.
  void countSessions();
  void countWaitingBytes(std::size_t half);
  // While the gate is shut: answers `status` and stops at the first other request. At most one gulp is received for
  // that, so what else the client sends waits with the system and stops it.
  void stopAtHead(std::uint32_t events);
  // openRing takes the descriptors that came last; declareShape is answered at once. Both also while the gate is shut:
  // they hand nothing on.
  void serveRingOperation(const wire::DecodedRequest& request);
  void answerRingOperation(std::uint64_t id, plist::ValueView result, const Status& done);

  // Sends the reply, or counts it as dropped when nobody can get it any more.
  template <class Content>
  void reply(std::uint64_t id, Content& content) noexcept;
  // In the place of a reply that is too large for the memory that there is.
  void replyShortly(std::uint64_t id) noexcept;
  // With the turn's end, or at once when much waits.
  void flushSoon() noexcept;
  // In pieces, ahead of the connection's next request.
  void sendRest(NumbersReply numbers) noexcept;
  // Bytes that the next flush sends.
  std::size_t sentAtOnce() const noexcept;
  // Whether the replies had better go out with those of the next turns.
  bool gathersReplies();

  // The client closed, or is gone: inside a frame that is a cut, else an end in order or a reset.
  void peerEnded(bool reset);
  // `why()` is the text that tells the reason.
  template <class Why>
  void cut(CutReason reason, const Why& why) noexcept {
    if (!countCut(reason)) return;
    const bool told =
        MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] { tellCut("cut off " + description_ + ": " + why()); });
    if (!told) {
      tellCut(description_);
    }
    beginEnd(true);
  }
  // False when it ends already: then nobody waits for its replies any more.
  bool countCut(CutReason reason) noexcept;
  void tellQuota(std::string_view why) noexcept;
  void tellCut(std::string_view line) noexcept;
  // Made without memory: it is short enough for the string itself.
  static std::string outOfMemoryText() noexcept { return std::string(wire::kOutOfMemory); }
  void beginEnd(bool interrupted);
  // The handlers, the close, and the place of the end given back after what the handlers left to be done.
  void finish(bool interrupted);
  void leave() noexcept;

  // What it stands in, who it is, and what is called at its end.
  ConnectionHost& host_;
  UniqueDescriptor socket_;
  const Access access_;
  LogClient client_;
  std::string description_;
  // Only ever goes on to a later one.
  State state_ = State::Fresh;

  // Until the end's handlers have run; null before setExportedObject() too.
  std::shared_ptr<platform::TarnReportingServiceProtocol> object_;
  Handler interruptionHandler_;
  Handler invalidationHandler_;

  // What came in and is not served yet, and the work that was handed over for it.
  wire::FrameBuffer frames_;
  bool inputWaits_ = false;  // the socket may have bytes
  bool peerGone_ = false;    // nobody will read a reply
  ConnectionEnds::Place end_;
  WorkLane lane_;
  std::int64_t ringCost_ = 0;                        // of work for its rings ahead of its turn, not charged yet
  std::vector<UniqueDescriptor> descriptors_;        // that came last, for openRing
  std::shared_ptr<ConnectionRings> rings_;           // once it has any
  std::optional<wire::DecodedRequest> heldRequest_;  // the head request while the gate is shut
  std::size_t heldBytes_ = 0;                        // of its frame
  bool mayTake_ = false;                             // takesFrom() said so in this turn, and no work was done since
  bool handedOver_ = false;                          // the request that is served, and its reply with it
  std::string refusal_;                              // the answer to every request; empty: they are served
  // What it takes of its user's share.
  QuotaUse use_;
  HalfFrames::Place halfFrame_;
  bool quotaTold_ = false;           // that a request was over quota: one line a connection will do
  bool framesTaken_ = false;         // since the half frame was noted
  std::uint32_t watchedEvents_ = 0;  // 0: not watched at all

  // What goes out; a flush that was asked for, and how often in a row it was put off.
  ReplyOutput output_;
  bool flushAsked_ = false;
  int flushesPutOff_ = 0;
};

}  // namespace tarn::linux_host
