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

enum class Kind : std::uint32_t {
  Integer = TARNREPORTING_INTEGER,
  Unsigned = TARNREPORTING_UNSIGNED,
  Double = TARNREPORTING_DOUBLE,
  Date = TARNREPORTING_DATE,
  Boolean = TARNREPORTING_BOOLEAN,
  Text = TARNREPORTING_TEXT_VALUE,
};

class Result {
 public:
  constexpr explicit Result(int code = TARNREPORTING_OK) noexcept : code_(code) {}
  constexpr bool ok() const noexcept { return code_ == TARNREPORTING_OK; }
  constexpr bool dropped() const noexcept { return code_ == TARNREPORTING_DROPPED; }
  constexpr int code() const noexcept { return code_; }
  const char* text() const noexcept { return tarnreporting_result_text(code_); }

 private:
  int code_;
};

class Error : public std::exception {
 public:
  explicit Error(int code) noexcept : result_(code) {}
  const char* what() const noexcept override { return result_.text(); }
  Result result() const noexcept { return result_; }

 private:
  Result result_;
};

// Seconds since 1970 UTC.
struct Date {
  double epochSeconds;
};

// A value of a message or a configuration. A text must stay until the call that it is given to returns.
class Value {
 public:
  Value(bool value) noexcept : value_(tarnreporting_boolean(value ? 1 : 0)) {}
  template <class Number, std::enable_if_t<std::is_integral_v<Number> && !std::is_same_v<Number, bool>, int> = 0>
  Value(Number value) noexcept
      : value_(std::is_signed_v<Number> ? tarnreporting_integer(static_cast<std::int64_t>(value))
                                        : tarnreporting_unsigned(static_cast<std::uint64_t>(value))) {}
  Value(double value) noexcept : value_(tarnreporting_double(value)) {}
  Value(float value) noexcept : value_(tarnreporting_double(static_cast<double>(value))) {}
  Value(Date value) noexcept : value_(tarnreporting_date(value.epochSeconds)) {}
  Value(std::string_view text) noexcept
      : value_(tarnreporting_text(text.data(),
                                  text.size() <= UINT32_MAX ? static_cast<std::uint32_t>(text.size()) : UINT32_MAX)) {}
  Value(const char* text) noexcept : Value(std::string_view(text)) {}
  Value(const std::string& text) noexcept : Value(std::string_view(text)) {}
  Value(const void*) = delete;  // no pointer is a bool

  const tarnreporting_value& raw() const noexcept { return value_; }

 private:
  tarnreporting_value value_;
};

struct Key {
  const char* name;
  Kind kind;
};

// Of a session that lives; copies are the same shape.
class Shape {
 public:
  const tarnreporting_shape* raw() const noexcept { return shape_; }

 private:
  friend class Session;
  explicit Shape(const tarnreporting_shape* shape) noexcept : shape_(shape) {}
  const tarnreporting_shape* shape_;
};

struct Field {
  const char* key;
  Value value;
};

class Session {
 public:
  struct Options {
    std::uint16_t serviceType = 0;
    const char* application = nullptr;
    std::vector<Field> configuration = {};
  };

  Session(Session&& other) noexcept : session_(std::exchange(other.session_, nullptr)) {}
  Session& operator=(Session&& other) noexcept {
    std::swap(session_, other.session_);
    return *this;
  }
  ~Session() { end(); }

  // Of keys that are all different.
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
  // Once what was posted to it is taken; its shapes may be used no more.
  Result end() noexcept {
    tarnreporting_session* const session = std::exchange(session_, nullptr);
    return Result(session != nullptr ? tarnreporting_session_end(session) : TARNREPORTING_OK);
  }
  tarnreporting_session* raw() const noexcept { return session_; }

 private:
  friend class Client;
  static void check(int code) {
    if (code != TARNREPORTING_OK) throw Error(code);
  }
  explicit Session(tarnreporting_session* session) noexcept : session_(session) {}
  tarnreporting_session* session_;
};

// For one thread at a time.
class Writer {
 public:
  Writer(Writer&& other) noexcept : writer_(std::exchange(other.writer_, nullptr)) {}
  Writer& operator=(Writer&& other) noexcept {
    std::swap(writer_, other.writer_);
    return *this;
  }
  ~Writer() { close(); }

  // For real-time threads: see tarnreporting_post().
  template <class... Values>
  Result post(const Shape& shape, const Values&... values) noexcept {
    if constexpr (sizeof...(values) == 0) {
      return Result(tarnreporting_post(writer_, shape.raw(), nullptr, 0));
    } else {
      const tarnreporting_value list[] = {Value(values).raw()...};
      return Result(tarnreporting_post(writer_, shape.raw(), list, sizeof...(values)));
    }
  }
  // Of any keys, without a shape: not for real-time threads, see tarnreporting_post_fields().
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
  tarnreporting_writer* raw() const noexcept { return writer_; }
  Result close() noexcept {
    tarnreporting_writer* const writer = std::exchange(writer_, nullptr);
    return Result(writer != nullptr ? tarnreporting_writer_close(writer) : TARNREPORTING_OK);
  }

 private:
  friend class Client;
  explicit Writer(tarnreporting_writer* writer) noexcept : writer_(writer) {}
  tarnreporting_writer* writer_;
};

class Client {
 public:
  using State = tarnreporting_state;

  // To this socket, or to the one that the library finds.
  explicit Client(const char* socketPath = nullptr) {
    tarnreporting_client_options options = {};
    options.size = sizeof options;
    options.socket_path = socketPath;
    check(tarnreporting_client_open(&options, &client_));
  }
  Client(Client&& other) noexcept : client_(std::exchange(other.client_, nullptr)) {}
  Client& operator=(Client&& other) noexcept {
    std::swap(client_, other.client_);
    return *this;
  }
  // Gives the service a second to take what is left; close() tells how that went.
  ~Client() { close(std::chrono::seconds(1)); }

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
  // Of 262144 bytes unless said otherwise.
  Writer writer(std::uint32_t ringBytes = 0, bool maySystemCall = true) {
    const tarnreporting_writer_options options = {sizeof options, ringBytes,
                                                  maySystemCall ? 0U : TARNREPORTING_NO_SYSTEM_CALL};
    tarnreporting_writer* writer = nullptr;
    check(tarnreporting_writer_open(client_, &options, &writer));
    return Writer(writer);
  }
  Result flush(std::chrono::milliseconds timeout) noexcept {
    return Result(tarnreporting_client_flush(client_, milliseconds(timeout)));
  }
  State state() const noexcept {
    State state = {};
    state.size = sizeof state;
    static_cast<void>(tarnreporting_client_state(client_, &state));
    return state;
  }
  // The messages that the service had not taken by then. The client's sessions and writers must be gone before.
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
  static std::uint32_t milliseconds(std::chrono::milliseconds time) noexcept {
    return time.count() < 0 ? 0 : time.count() > UINT32_MAX ? UINT32_MAX : static_cast<std::uint32_t>(time.count());
  }
  tarnreporting_client* client_ = nullptr;
};

}  // namespace tarnreporting
