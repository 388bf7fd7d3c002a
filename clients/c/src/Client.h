// SPDX-License-Identifier: Apache-2.0
// tarnreporting_client: what the handles are, and the helper thread that speaks with the service for them.
//
// Everything here is under the client's lock but for what a writer's post() touches. The helper holds the lock while it
// works, never while it waits.
#pragma once

#include <pthread.h>

#include <cstddef>
#include <cstdint>

#include "clients/c/include/tarnreporting.h"
#include "clients/c/src/Link.h"
#include "clients/c/src/Writer.h"

namespace tarn::reporting {

// As many as the service opens rings for one connection. Places of a fixed array, so that nothing is allocated to mark
// where each writer is.
inline constexpr std::size_t kMostWriters = 32;  // a session has a bit for each
// Shapes of a session that posting of fields made. A program that makes up keys would else use up the client's 1024.
inline constexpr std::uint32_t kMostFieldShapes = TARNREPORTING_MOST_FIELD_SETS;

// Positions in the writers' rings at some moment, by their places; 0 where there was no writer. What was posted before
// that moment is taken once each ring's `taken` has come so far.
struct Heads {
  std::uint64_t at[kMostWriters] = {};
};

}  // namespace tarn::reporting

// A session as the program made it. It outlives connections: on each new one it is announced again under a new reporter
// ID, with its configuration and shapes. Owned by the client; after its end it stays until what was posted to it is
// taken.
struct tarnreporting_session {
  tarnreporting_client* client = nullptr;
  tarnreporting_session* next = nullptr;
  tarnreporting_shape* shapes = nullptr;  // those of fields in the order of their last use
  std::uint32_t fieldShapes = 0;
  // As the program gave it, 0 to 65535.
  std::uint32_t serviceType = 0;
  tarn::reporting::Bytes configuration;  // one map
  // By which the service knows it: a new one each time it is announced, counted from a random start so that clients
  // don't meet.
  std::int64_t reporterID = 0;  // on this connection
  bool announced = false;       // on this connection
  // An ended session that no service ever saw is kept until one has, so that what was posted to it is served.
  bool everAnnounced = false;
  // Nothing more is posted to it; `end` counts.
  bool ending = false;
  // A bit for each writer where `end` isn't known yet: what a call publishes that was inside is the session's, too.
  std::uint32_t inside = 0;
  tarn::reporting::Heads end;  // when the session was ended: what lies before belongs to it
};

namespace tarn::reporting {

// What came of messages, as tarnreporting_state tells it: of writers that are gone, or of all.
struct Totals {
  // Messages, by what became of them.
  std::uint64_t posted = 0;
  std::uint64_t taken = 0;
  std::uint64_t committed = 0;
  std::uint64_t dropped = 0;
  std::uint64_t refused = 0;
};

}  // namespace tarn::reporting

// Life: open() starts the helper, close() ends and joins it. Every public call but post() takes the lock for
// microseconds; close(), flush() and closeWriter() look every few milliseconds whether what they wait for has come, and
// let go of it in between.
struct tarnreporting_client {
  using Writer = tarnreporting_writer;
  using Session = tarnreporting_session;
  using Shape = tarnreporting_shape;

  tarnreporting_client() = default;
  tarnreporting_client(const tarnreporting_client&) = delete;
  tarnreporting_client& operator=(const tarnreporting_client&) = delete;

  // Each a result. `options` may be null. Starts the helper thread, with every signal blocked; on failure nothing is
  // left.
  int open(const tarnreporting_client_options* options) noexcept;
  // Shuts the writers, ends the sessions, waits at most `timeoutMs` (and a second more for calls that are inside), then
  // joins the helper. TARNREPORTING_OK or TARNREPORTING_TIMEOUT. `left`, if not null: messages that weren't taken.
  // `empty`: nobody is inside a call any more, and the client may be freed; else its memory is left to whoever is.
  int close(std::uint32_t timeoutMs, std::uint64_t* left, bool& empty) noexcept;
  // False in a forked child. Costs a load.
  bool isAlive() const noexcept { return __atomic_load_n(alive_, __ATOMIC_RELAXED) != 0; }

  // The functions of the C interface, with arguments that are there and options in this library's size. Each a result;
  // what they check and answer stands in tarnreporting.h. Handles are given out only with TARNREPORTING_OK.
  int beginSession(const tarnreporting_session_options& options, Session** made) noexcept;
  int endSession(Session& session) noexcept;
  int declareShape(Session& session, const tarnreporting_shape_options& options, Shape** made) noexcept;
  int postFields(Writer& writer, Session& session, const tarnreporting_message_options& options) noexcept;
  int openWriter(std::uint32_t ringBytes, std::uint32_t flags, Writer** made) noexcept;
  int closeWriter(Writer& writer) noexcept;
  int flush(std::uint32_t timeoutMs) noexcept;
  void readState(tarnreporting_state& state) noexcept;

  // Around fork(): all clients' locks are held over it, so that the child finds nothing half changed. closeInChild()
  // closes the child's copies of the descriptors; the memory of its handles is left alone.
  void lock() noexcept { pthread_mutex_lock(&mutex_); }
  void unlock() noexcept { pthread_mutex_unlock(&mutex_); }
  void closeInChild() noexcept;

  tarnreporting_client* nextClient = nullptr;  // of the process

 private:
  // The helper thread. run() holds the lock but for its wait for descriptors; a turn of it connects, reads replies,
  // opens rings, ends what is drained and sends.
  static void* runHelper(void* self);
  void run() noexcept;
  void turn() noexcept;
  // Tries to connect and announces everything, or sets the moment of the next attempt: after 10 ms, doubled up to two
  // and a half seconds, and up to half of it more at random.
  void connectAgain(std::int64_t now) noexcept;
  // Whether one of the paths led to a service; errno says why the last one didn't.
  bool connectSomewhere() noexcept;
  // Forgets what only held on the connection that is over.
  void disconnected(std::int64_t now) noexcept;
  // What a reply means: a ring is open or was refused, a shape's number is free again, an error is to be told.
  void take(const tarn::reporting::ReplyFront& reply) noexcept;
  // For tarnreporting_state.last_error; longer texts are cut.
  void noteError(const char* text, std::size_t length) noexcept;
  // Calls the program's function, with the lock let go meanwhile, once for all refusals since the last time.
  void tellRefusal() noexcept;
  // How long the helper may sleep: for ever unless something must be looked at that no descriptor tells.
  int waitTime(std::int64_t now) noexcept;
  // Makes the helper's next turn come now; from any thread.
  void wakeHelper() noexcept;
  // False when the system has no thread to give.
  bool startHelper() noexcept;

  // All that the service must know of the session or the shape, as requests on the link.
  void announce(Session& session) noexcept;
  void announce(const Shape& shape) noexcept;
  // Frees a shape's number once the service has answered that it knows the shape no more.
  void forget(std::uint32_t shapeNumber) noexcept;
  // The shape of that request is, or with 0 all are.
  void forgotten(std::uint64_t request) noexcept;
  // Notes that the session is ended. A second time does nothing.
  void markEnding(Session& session) noexcept;
  // For the writers that everybody has left since: where they are.
  void markEnd(Session& session) noexcept;
  // Ends and frees the sessions whose messages are all taken.
  void tendSessions() noexcept;
  // A shape that isn't known to the session yet. Null when there is no memory.
  tarnreporting_shape* makeShape(Session& session, const tarnreporting_shape_options& options) noexcept;
  // Gives the shape a number and lists it with its session. TOO_LARGE when no number is free, CLOSED when the session
  // ends.
  int enter(Shape& shape) noexcept;
  // The session's shape of these keys and kinds, made if there is none. It is the first of the list afterwards, so that
  // the last of its kind is the one whose use is the longest ago.
  int findFieldShape(Session& session, const tarnreporting_shape_options& options, Shape** found) noexcept;
  // Whether there is room for one more shape of fields; drops the oldest one if the service has taken all of its
  // messages.
  bool makeRoomForFieldShape(Session& session) noexcept;
  // Where all writers are now; and whether the service has come so far since.
  void mark(tarn::reporting::Heads& heads) const noexcept;
  bool isDrained(const tarn::reporting::Heads& heads) const noexcept;
  // Asks the service to stop the session.
  void finish(Session& session) noexcept;
  // Unlinks and frees a session with its shapes, or a shape.
  void remove(Session& session) noexcept;
  void removeShape(Shape& shape) noexcept;
  // Asks for rings that the service doesn't read yet, and frees the places of closed writers that are drained.
  void tendWriters(std::int64_t now) noexcept;
  // Sends openRing with the writer's descriptors.
  void openRing(Writer& writer) noexcept;
  // Wakes the service for writers that may make no system call.
  void lookAfterQuietWriters() noexcept;
  // Adds its numbers to those of the writers that are gone, and frees it.
  void retire(Writer& writer) noexcept;
  // Whether a thread is inside a post; whether a close need wait no longer; whether every ring is read to its end; how
  // many messages are in rings still.
  bool anybodyInside() const noexcept;
  bool isDone() const noexcept;
  bool isAllTaken() const noexcept;
  std::uint64_t untaken() const noexcept;
  // The lowest number that is free; false when all 1024 are in use.
  bool takeShapeNumber(std::uint32_t& number) noexcept;
  void giveBackShapeNumber(std::uint32_t number) noexcept;
  // Frees everything that the client owns. The helper must be gone, and nobody inside.
  void freeAll() noexcept;

  std::uint32_t* alive_ = nullptr;  // a page that reads as zero in a child
  pthread_mutex_t mutex_ = PTHREAD_MUTEX_INITIALIZER;
  pthread_t helper_{};
  // An eventfd by which callers end the helper's wait.
  int wake_ = -1;
  char path_[tarn::reporting::Link::kMostPath] = {};  // the one asked for
  // The program's function and what it wants to be handed; null: nobody is told.
  void (*onRefusal_)(void*, const char*) = nullptr;
  void* context_ = nullptr;

  tarn::reporting::Link link_;
  // The link may be closed already while this is true: then disconnected() is still to be called.
  bool linked_ = false;  // as the sessions and writers know it
  std::uint32_t connections_ = 0;
  std::uint32_t failures_ = 0;    // to connect, since it last worked
  std::int64_t nextConnect_ = 0;  // in nanoseconds of the monotonic clock
  // State of a small generator, never 0, which spreads the attempts to connect of many clients.
  std::uint64_t random_ = 1;
  std::int64_t nextReporterID_ = 1;
  // A list in the order of their beginning, so that they are announced in that order again.
  Session* sessions_ = nullptr;
  Writer* writers_[tarn::reporting::kMostWriters] = {};
  std::uint64_t shapeNumbers_[TARNRING_MOST_SHAPES / 64] = {};  // a bit for each that is in use
  std::uint64_t forgetRequests_[TARNRING_MOST_SHAPES] = {};     // by number: the one that isn't answered yet
  std::uint32_t forgetting_ = 0;
  // Of writers that were retired.
  tarn::reporting::Totals gone_;
  // Errors that came instead of results.
  std::uint64_t requestsRefused_ = 0;
  // With a zero at its end. Kept over later successes.
  char lastError_[sizeof(tarnreporting_state::last_error)] = {};
  // lastError_ is a refusal that onRefusal_ hasn't heard of.
  bool refusalToTell_ = false;
  // The helper ends with its next look.
  bool stopping_ = false;
};

namespace tarn::reporting {

// Holds the client's lock as long as it lives.
class Locked {
 public:
  explicit Locked(tarnreporting_client& client) noexcept : client_(client) { client_.lock(); }
  Locked(const Locked&) = delete;
  Locked& operator=(const Locked&) = delete;
  ~Locked() { client_.unlock(); }

 private:
  tarnreporting_client& client_;
};

// The list of the process's clients, for fork(). The first call asks the system to be told of forks.
void enlist(tarnreporting_client& client) noexcept;
void strike(tarnreporting_client& client) noexcept;

// Nanoseconds since some moment; never goes back.
std::int64_t monotonicNow() noexcept;
// Adds a writer's numbers as its ring's header has them now. What is taken counts as posted too, though the posting
// thread may just be about to count it.
void addTo(Totals& totals, const tarnreporting_writer& writer) noexcept;

}  // namespace tarn::reporting
