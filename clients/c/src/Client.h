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

inline constexpr std::size_t kMostWriters = 32;
// Shapes of a session that posting of fields made.
inline constexpr std::uint32_t kMostFieldShapes = TARNREPORTING_MOST_FIELD_SETS;

// Where each writer was at some moment; 0 where there was none.
struct Heads {
  std::uint64_t at[kMostWriters] = {};
};

}  // namespace tarn::reporting

struct tarnreporting_session {
  tarnreporting_client* client = nullptr;
  tarnreporting_session* next = nullptr;
  tarnreporting_shape* shapes = nullptr;  // those of fields in the order of their last use
  std::uint32_t fieldShapes = 0;
  std::uint32_t serviceType = 0;
  tarn::reporting::Bytes configuration;  // one map
  std::int64_t reporterID = 0;           // on this connection
  bool announced = false;                // on this connection
  bool everAnnounced = false;
  bool ending = false;
  tarn::reporting::Heads end;  // when the session was ended: what lies before belongs to it
};

namespace tarn::reporting {

// What came of writers that are gone.
struct Totals {
  std::uint64_t posted = 0;
  std::uint64_t taken = 0;
  std::uint64_t committed = 0;
  std::uint64_t dropped = 0;
  std::uint64_t refused = 0;
};

}  // namespace tarn::reporting

struct tarnreporting_client {
  using Writer = tarnreporting_writer;
  using Session = tarnreporting_session;
  using Shape = tarnreporting_shape;

  tarnreporting_client() = default;
  tarnreporting_client(const tarnreporting_client&) = delete;
  tarnreporting_client& operator=(const tarnreporting_client&) = delete;

  // Life; each a result.
  int open(const tarnreporting_client_options* options) noexcept;
  // `empty`: nobody is inside a call any more, and the client may be freed.
  int close(std::uint32_t timeoutMs, std::uint64_t* left, bool& empty) noexcept;
  bool isAlive() const noexcept { return __atomic_load_n(alive_, __ATOMIC_RELAXED) != 0; }

  int beginSession(const tarnreporting_session_options& options, Session** made) noexcept;
  int endSession(Session& session) noexcept;
  int declareShape(Session& session, const tarnreporting_shape_options& options, Shape** made) noexcept;
  int postFields(Writer& writer, Session& session, const tarnreporting_message_options& options) noexcept;
  int openWriter(std::uint32_t ringBytes, std::uint32_t flags, Writer** made) noexcept;
  int closeWriter(Writer& writer) noexcept;
  int flush(std::uint32_t timeoutMs) noexcept;
  void readState(tarnreporting_state& state) noexcept;

  // Around fork().
  void lock() noexcept { pthread_mutex_lock(&mutex_); }
  void unlock() noexcept { pthread_mutex_unlock(&mutex_); }
  void closeInChild() noexcept;

  tarnreporting_client* nextClient = nullptr;  // of the process

 private:
  static void* runHelper(void* self);
  void run() noexcept;
  void turn() noexcept;
  void connectAgain(std::int64_t now) noexcept;
  bool connectSomewhere() noexcept;
  void disconnected(std::int64_t now) noexcept;
  void take(const tarn::reporting::ReplyFront& reply) noexcept;
  void noteError(const char* text, std::size_t length) noexcept;
  void tellRefusal() noexcept;
  int waitTime(std::int64_t now) noexcept;
  void wakeHelper() noexcept;
  bool startHelper() noexcept;

  void announce(Session& session) noexcept;
  void announce(const Shape& shape) noexcept;
  void forget(std::uint32_t shapeNumber) noexcept;
  // The shape of that request is, or with 0 all are.
  void forgotten(std::uint64_t request) noexcept;
  void markEnding(Session& session) noexcept;
  void tendSessions() noexcept;
  tarnreporting_shape* makeShape(Session& session, const tarnreporting_shape_options& options) noexcept;
  int enter(Shape& shape) noexcept;
  int findFieldShape(Session& session, const tarnreporting_shape_options& options, Shape** found) noexcept;
  bool makeRoomForFieldShape(Session& session) noexcept;
  void mark(tarn::reporting::Heads& heads) const noexcept;
  bool isDrained(const tarn::reporting::Heads& heads) const noexcept;
  void finish(Session& session) noexcept;
  void remove(Session& session) noexcept;
  void removeShape(Shape& shape) noexcept;
  void tendWriters(std::int64_t now) noexcept;
  void openRing(Writer& writer) noexcept;
  void lookAfterQuietWriters() noexcept;
  void retire(Writer& writer) noexcept;
  bool anybodyInside() const noexcept;
  bool isDone() const noexcept;
  bool isAllTaken() const noexcept;
  std::uint64_t untaken() const noexcept;
  bool takeShapeNumber(std::uint32_t& number) noexcept;
  void giveBackShapeNumber(std::uint32_t number) noexcept;
  void freeAll() noexcept;

  std::uint32_t* alive_ = nullptr;  // a page that reads as zero in a child
  pthread_mutex_t mutex_ = PTHREAD_MUTEX_INITIALIZER;
  pthread_t helper_{};
  int wake_ = -1;
  char path_[tarn::reporting::Link::kMostPath] = {};  // the one asked for
  void (*onRefusal_)(void*, const char*) = nullptr;
  void* context_ = nullptr;

  tarn::reporting::Link link_;
  bool linked_ = false;  // as the sessions and writers know it
  std::uint32_t connections_ = 0;
  std::uint32_t failures_ = 0;    // to connect, since it last worked
  std::int64_t nextConnect_ = 0;  // in nanoseconds of the monotonic clock
  std::uint64_t random_ = 1;
  std::int64_t nextReporterID_ = 1;
  Session* sessions_ = nullptr;
  Writer* writers_[tarn::reporting::kMostWriters] = {};
  std::uint64_t shapeNumbers_[TARNRING_MOST_SHAPES / 64] = {};  // a bit for each that is in use
  std::uint64_t forgetRequests_[TARNRING_MOST_SHAPES] = {};     // by number: the one that isn't answered yet
  std::uint32_t forgetting_ = 0;
  tarn::reporting::Totals gone_;
  std::uint64_t requestsRefused_ = 0;
  char lastError_[sizeof(tarnreporting_state::last_error)] = {};
  bool refusalToTell_ = false;
  bool stopping_ = false;
};

namespace tarn::reporting {

class Locked {
 public:
  explicit Locked(tarnreporting_client& client) noexcept : client_(client) { client_.lock(); }
  Locked(const Locked&) = delete;
  Locked& operator=(const Locked&) = delete;
  ~Locked() { client_.unlock(); }

 private:
  tarnreporting_client& client_;
};

// Clients of the process, for fork().
void enlist(tarnreporting_client& client) noexcept;
void strike(tarnreporting_client& client) noexcept;

std::int64_t monotonicNow() noexcept;
void addTo(Totals& totals, const tarnreporting_writer& writer) noexcept;

}  // namespace tarn::reporting
