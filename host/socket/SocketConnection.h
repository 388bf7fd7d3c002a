// SocketConnection: one client on the socket. Cuts what it receives into frames, has them decoded, calls the exported
// object, and sends the replies.
//
// The client is not trusted. Its input is bounded by the largest frame, its unsent replies by a limit, its share of a
// turn by one gulp; a frame that can be answered is answered, one that can't ends this connection and no other.
//
// Life: made by the listener, resumed by the delegate, then held by the loop until its end. At the end the frames that
// came whole have been handed to the object; behind their work on the server queue come the interruption handler (when
// the end was not in order), the invalidation handler and the close, so replies to a client that only half-closed go
// out.
//
// Threads: the main loop's.
#pragma once

#include <optional>
#include <string>

#include "host/log/LogClient.h"
#include "host/socket/ConnectionHost.h"
#include "host/socket/RequestDispatcher.h"
#include "host/system/UniqueDescriptor.h"
#include "platform/Listener.h"
#include "wire/FrameBuffer.h"

namespace tarn::linux_host {

class SocketConnection final : public platform::Connection,
                               public EventHandler,
                               public HeldConnection,
                               public OpenConnection,
                               public ReplySink,
                               public std::enable_shared_from_this<SocketConnection> {
 public:
  // Takes over a connected socket that doesn't block. `number` names it in logs, from 1. The host outlives the
  // connection.
  SocketConnection(ConnectionHost& host, UniqueDescriptor socket, std::uint64_t number);
  SocketConnection(const SocketConnection&) = delete;
  SocketConnection& operator=(const SocketConnection&) = delete;
  ~SocketConnection() override;

  std::int32_t processIdentifier() const override { return client_.process; }
  const LogClient& client() const noexcept { return client_; }
  // With number, process, user and executable of the client, as they were when it connected.
  std::string description() const override { return description_; }
  void setExportedObject(std::shared_ptr<platform::TarnReportingServiceProtocol> object) override;
  void setInterruptionHandler(Handler handler) override { interruptionHandler_ = std::move(handler); }
  void setInvalidationHandler(Handler handler) override { invalidationHandler_ = std::move(handler); }
  void resume() override;

  void handleEvents(std::uint32_t events) override;
  void flush() override;
  void serveHeldRequest() override;
  void endInput() override;

  void sendReply(std::uint64_t id, std::initializer_list<plist::ValueView> results) override;
  void sendNumbers(std::uint64_t id, std::span<const std::int64_t> numbers) override;
  void sendError(std::uint64_t id, const platform::RemoteError& error) override;
  void dropReply() override { ++host_.ledger.repliesDropped; }

 private:
  enum class State : std::uint8_t {
    Fresh,   // not resumed yet
    Open,    // receives and replies
    Ending,  // receives no more; replies go out until the work before the end is done
    Ended,
  };

  void watch(std::uint32_t events);
  void receive();
  void serveFrames();
  void serveFrame(std::span<const std::byte> frame);
  void serveRequest(wire::DecodedRequest& request);

  // Whether a reply can still be sent; counts it as dropped when not.
  bool takesReplies() noexcept;
  // Behind every frame that was appended to output_.
  void replyAppended();
  std::size_t unsentBytes() const noexcept { return output_.size() - sentBytes_; }
  bool sendSome();
  void dropOutput() noexcept;

  void peerEnded(bool reset);
  void cut(CutReason reason, const std::string& why);
  void beginEnd(bool interrupted);
  void finish(bool interrupted);

  ConnectionHost& host_;
  UniqueDescriptor socket_;
  LogClient client_;
  std::string description_;
  State state_ = State::Fresh;

  std::shared_ptr<platform::TarnReportingServiceProtocol> object_;
  Handler interruptionHandler_;
  Handler invalidationHandler_;

  wire::FrameBuffer frames_;
  std::optional<wire::DecodedRequest> heldRequest_;  // the head request while the gate is shut
  std::uint32_t watchedEvents_ = 0;                  // 0: not watched at all

  std::string output_;
  std::size_t sentBytes_ = 0;        // of output_
  std::uint64_t unsentReplies_ = 0;  // in output_
  bool flushAsked_ = false;
  bool outputBroken_ = false;  // the peer takes nothing more
  bool resetSeen_ = false;
};

}  // namespace tarn::linux_host
