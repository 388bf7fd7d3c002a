// SPDX-License-Identifier: Apache-2.0
// tarnreporting.hpp: the C library tarnreporting.h for C++17 and later. A header and nothing else.
//
//   tarnreporting::Client client;
//   tarnreporting::Session session = client.begin({7, "sys.oxbow.music"});
//   const tarnreporting::Shape volume = session.shape(14, 16, {{"volume", tarnreporting::Kind::Double},
//                                                              {"muted", tarnreporting::Kind::Boolean}});
//   tarnreporting::Writer writer = client.writer();
//   writer.post(volume, 0.5, false);                        // from the audio thread
//
// Handles move and end what they hold. Making one throws tarnreporting::Error where the library refuses it; posting and
// everything else is noexcept and answers a Result. A session, a shape and a writer may not outlive their client.
#pragma once

#include <tarnreporting.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <initializer_list>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

namespace tarnreporting {

// The kinds of values, as the C header has them. A message's values must be of just the kinds of their shape.
enum class Kind : std::uint32_t {
  Integer = TARNREPORTING_INTEGER,
  Unsigned = TARNREPORTING_UNSIGNED,
  Double = TARNREPORTING_DOUBLE,
  Date = TARNREPORTING_DATE,
  Boolean = TARNREPORTING_BOOLEAN,
  Text = TARNREPORTING_TEXT_VALUE,
};

// What posting, ending and waiting answer: a tarnreporting_result. Costs what an int costs. Nothing throws for a
// Result; who doesn't look at it loses nothing but the knowledge.
class Result {
 public:
  constexpr explicit Result(int code = TARNREPORTING_OK) noexcept : code_(code) {}
  constexpr bool ok() const noexcept { return code_ == TARNREPORTING_OK; }
  // Whether a message found its ring full: it is counted, and the service is told of the gap.
  constexpr bool dropped() const noexcept { return code_ == TARNREPORTING_DROPPED; }
  constexpr int code() const noexcept { return code_; }
  // In English; lives for ever.
  const char* text() const noexcept { return tarnreporting_result_text(code_); }

 private:
  int code_;
};

// What making a handle throws: the library's answer, with its text as what(). Making a session or a shape may throw
// std::bad_alloc, too.
class Error : public std::exception {
 public:
  explicit Error(int code) noexcept : result_(code) {}
  const char* what() const noexcept override { return result_.text(); }
  Result result() const noexcept { return result_; }

 private:
  Result result_;
};

// A moment as a value of its own kind, so that no number is taken for one: seconds since 1970-01-01 00:00:00 UTC, with
// fractions.
struct Date {
  double epochSeconds;
};

// A value of a message or a configuration, made by itself from what is given: bool is a boolean, signed numbers are
// integers, unsigned ones unsigned, float and double doubles, Date dates, and texts texts, in UTF-8. A text isn't
// copied: it must stay until the call that it is given to returns. Nothing here allocates or throws, so values may be
// made in real-time threads.
class Value {
 public:
  Value(bool value) noexcept : value_(tarnreporting_boolean(value ? 1 : 0)) {}
  // Any other integer type, widened to 64 bits: nothing is lost.
  template <class Number, std::enable_if_t<std::is_integral_v<Number> && !std::is_same_v<Number, bool>, int> = 0>
  Value(Number value) noexcept
      : value_(std::is_signed_v<Number> ? tarnreporting_integer(static_cast<std::int64_t>(value))
                                        : tarnreporting_unsigned(static_cast<std::uint64_t>(value))) {}
  Value(double value) noexcept : value_(tarnreporting_double(value)) {}
  Value(float value) noexcept : value_(tarnreporting_double(static_cast<double>(value))) {}
  Value(Date value) noexcept : value_(tarnreporting_date(value.epochSeconds)) {}
  // One over 4 GiB is cut, which is far over the bound of TARNREPORTING_MOST_TEXT_BYTES, so it is refused all the same.
  Value(std::string_view text) noexcept
      : value_(tarnreporting_text(text.data(),
                                  text.size() <= UINT32_MAX ? static_cast<std::uint32_t>(text.size()) : UINT32_MAX)) {}
  // Up to its zero; must not be null.
  Value(const char* text) noexcept : Value(std::string_view(text)) {}
  Value(const std::string& text) noexcept : Value(std::string_view(text)) {}
  Value(const void*) = delete;  // no pointer is a bool

  // As the C functions take it.
  const tarnreporting_value& raw() const noexcept { return value_; }

 private:
  tarnreporting_value value_;
};

// A key of a shape and the kind of its values. The name is UTF-8 of 1 to 255 bytes with a zero at its end, and is
// copied when the shape is made.
struct Key {
  const char* name;
  Kind kind;
};

// What messages of one kind look like, made by Session::shape(). A plain handle: copies are the same shape, and it may
// be used by all threads until its session ends. It owns nothing.
class Shape {
 public:
  // For the C functions, as tarnreporting_post_at().
  const tarnreporting_shape* raw() const noexcept { return shape_; }

 private:
  friend class Session;
  explicit Shape(const tarnreporting_shape* shape) noexcept : shape_(shape) {}
  const tarnreporting_shape* shape_;
};

// A key with its value, of a configuration or of a message without a shape. Both must stay until the call returns.
struct Field {
  const char* key;
  Value value;
};

// A session that runs until it is ended: by end(), or with this object. The service sees it as soon as there is one,
// and again after each restart. Threads: any, one at a time.
class Session {
 public:
  // As tarnreporting_session_options. Nothing is kept of it: the library copies what it needs.
  struct Options {
    // What the session is for: a ServiceType of tarnreporting_messages.hpp.
    std::uint16_t serviceType = 0;
    // The HostApplicationDisplayID of the configuration, at most 1024 bytes of UTF-8; null: none.
    const char* application = nullptr;
    // Further fields of it, at most 64.
    std::vector<Field> configuration = {};
  };

  // Moving leaves the other one without a session; assigning swaps, so what was held here ends with the other one.
  Session(Session&& other) noexcept : session_(std::exchange(other.session_, nullptr)) {}
  Session& operator=(Session&& other) noexcept {
    std::swap(session_, other.session_);
    return *this;
  }
  ~Session() { end(); }

  // Declares a shape of these keys, all different and at most 64, whose values are then posted in this order. Throws
  // Error for what tarnreporting_shape_declare() refuses; a client has at most 1024 shapes. Allocates: not for
  // real-time threads.
  Shape shape(std::uint32_t category, std::uint16_t type, std::initializer_list<Key> keys) {
    std::vector<tarnreporting_key> list;
    for (const Key& key : keys) {
      list.push_back({key.name, static_cast<std::uint32_t>(key.kind)});
    }
    const tarnreporting_shape_options options = {sizeof options, category, type, list.data(), list.size()};
    tarnreporting_shape* made = nullptr;
    check(tarnreporting_shape_declare(session_, &options, &made));
    return Shape(made);
  }
  // Ends the session once the service has taken what was posted to it; doesn't wait for that. Its shapes may be used no
  // more. A second call does nothing and answers OK.
  Result end() noexcept {
    tarnreporting_session* const session = std::exchange(session_, nullptr);
    return Result(session != nullptr ? tarnreporting_session_end(session) : TARNREPORTING_OK);
  }
  // For the C functions; null once it is ended or moved from.
  tarnreporting_session* raw() const noexcept { return session_; }

 private:
  friend class Client;
  static void check(int code) {
    if (code != TARNREPORTING_OK) throw Error(code);
  }
  explicit Session(tarnreporting_session* session) noexcept : session_(session) {}
  tarnreporting_session* session_;
};

// A ring of memory that one thread posts into. For one thread at a time; what was posted is served also after it is
// closed.
class Writer {
 public:
  // Moving leaves the other one without a ring; assigning swaps.
  Writer(Writer&& other) noexcept : writer_(std::exchange(other.writer_, nullptr)) {}
  Writer& operator=(Writer&& other) noexcept {
    std::swap(writer_, other.writer_);
    return *this;
  }
  ~Writer() { close(); }

  // Posts a message of the shape with the time of the call, its values in the order of the shape's keys. For real-time
  // threads: no lock, no allocation, no exception, and at most one system call; see tarnreporting_post() for the
  // answers. Nothing is converted: an int where the shape says Double is TARNREPORTING_KIND.
  template <class... Values>
  Result post(const Shape& shape, const Values&... values) noexcept {
    if constexpr (sizeof...(values) == 0) {
      return Result(tarnreporting_post(writer_, shape.raw(), nullptr, 0));
    } else {
      const tarnreporting_value list[] = {Value(values).raw()...};
      return Result(tarnreporting_post(writer_, shape.raw(), list, sizeof...(values)));
    }
  }
  // Posts a message of any keys, at most 64 and all different, without a shape. Not for real-time threads, since it may
  // wait for a lock and allocate; see tarnreporting_post_fields(). A session that was ended is TARNREPORTING_ARGUMENT.
  Result post(Session& session, std::uint32_t category, std::uint16_t type,
              std::initializer_list<Field> fields) noexcept {
    if (fields.size() > TARNREPORTING_MOST_KEYS) return Result(TARNREPORTING_TOO_LARGE);
    tarnreporting_field list[TARNREPORTING_MOST_KEYS];
    std::size_t count = 0;
    for (const Field& field : fields) {
      list[count++] = {field.key, field.value.raw()};
    }
    const tarnreporting_message_options options = {sizeof options, category, type, list, count, 0};
    return Result(tarnreporting_post_fields(writer_, session.raw(), &options));
  }
  // For the C functions, as tarnreporting_post_at(); null once it is closed or moved from.
  tarnreporting_writer* raw() const noexcept { return writer_; }
  // Nobody may be posting. A second call does nothing and answers OK; posting then is TARNREPORTING_ARGUMENT.
  Result close() noexcept {
    tarnreporting_writer* const writer = std::exchange(writer_, nullptr);
    return Result(writer != nullptr ? tarnreporting_writer_close(writer) : TARNREPORTING_OK);
  }

 private:
  friend class Client;
  explicit Writer(tarnreporting_writer* writer) noexcept : writer_(writer) {}
  tarnreporting_writer* writer_;
};

// The connection to the service and its helper thread, which connects by itself and again. Owns everything that is made
// from it, so sessions, shapes and writers must be gone before. Threads: any.
class Client {
 public:
  using State = tarnreporting_state;

  // Connects to this socket, or to the one that the library finds. Doesn't wait for the service, whose absence is no
  // error. Throws Error for a path over 107 bytes and where the system has no descriptor, memory or thread.
  explicit Client(const char* socketPath = nullptr) {
    tarnreporting_client_options options = {};
    options.size = sizeof options;
    options.socket_path = socketPath;
    check(tarnreporting_client_open(&options, &client_));
  }
  // Moving leaves the other one without a client; assigning swaps.
  Client(Client&& other) noexcept : client_(std::exchange(other.client_, nullptr)) {}
  Client& operator=(Client&& other) noexcept {
    std::swap(client_, other.client_);
    return *this;
  }
  // Waits at most a second for the service to take what is left; close() takes another time and tells how that went.
  ~Client() { close(std::chrono::seconds(1)); }

  // Begins a session, to which messages may be posted at once. Throws Error for a configuration that isn't in order:
  // empty keys, texts that aren't UTF-8 or are too long, more than 64 fields.
  Session begin(const Session::Options& options) {
    std::vector<tarnreporting_field> fields;
    for (const Field& field : options.configuration) {
      fields.push_back({field.key, field.value.raw()});
    }
    tarnreporting_session_options raw = {};
    raw.size = sizeof raw;
    raw.service_type = options.serviceType;
    raw.application = options.application;
    raw.configuration = fields.data();
    raw.configuration_count = fields.size();
    tarnreporting_session* session = nullptr;
    check(tarnreporting_session_begin(client_, &raw, &session));
    return Session(session);
  }
  // Makes a ring of `ringBytes`, a power of two from 4096 to 1048576; 0: 262144. Its memory is touched and locked now,
  // so this is not for real-time threads. Without `maySystemCall` a post never wakes the service: the helper thread
  // looks every 50 ms instead. Throws Error; a client has at most 32 writers.
  Writer writer(std::uint32_t ringBytes = 0, bool maySystemCall = true) {
    const tarnreporting_writer_options options = {sizeof options, ringBytes,
                                                  maySystemCall ? 0U : TARNREPORTING_NO_SYSTEM_CALL};
    tarnreporting_writer* writer = nullptr;
    check(tarnreporting_writer_open(client_, &options, &writer));
    return Writer(writer);
  }
  // Waits until the service has taken all that was posted: OK, or TARNREPORTING_TIMEOUT.
  Result flush(std::chrono::milliseconds timeout) noexcept {
    return Result(tarnreporting_client_flush(client_, milliseconds(timeout)));
  }
  // Whether there is a connection, and how many messages were posted, taken, committed, dropped and refused. All 0
  // after close().
  State state() const noexcept {
    State state = {};
    state.size = sizeof state;
    static_cast<void>(tarnreporting_client_state(client_, &state));
    return state;
  }
  // Ends everything and waits at most so long until the service has taken what was posted: how many messages it had not
  // taken by then. The client's sessions and writers must be gone before. A second call does nothing.
  std::uint64_t close(std::chrono::milliseconds timeout) noexcept {
    std::uint64_t left = 0;
    if (tarnreporting_client* const client = std::exchange(client_, nullptr)) {
      static_cast<void>(tarnreporting_client_close(client, milliseconds(timeout), &left));
    }
    return left;
  }

 private:
  static void check(int code) {
    if (code != TARNREPORTING_OK) throw Error(code);
  }
  // Held to what the C functions take: 0 to some 49 days.
  static std::uint32_t milliseconds(std::chrono::milliseconds time) noexcept {
    return time.count() < 0 ? 0 : time.count() > UINT32_MAX ? UINT32_MAX : static_cast<std::uint32_t>(time.count());
  }
  tarnreporting_client* client_ = nullptr;
};

}  // namespace tarnreporting
