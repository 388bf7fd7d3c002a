// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/Reporter.h"

#include <tarnreporting.h>

#include <utility>
#include <vector>

namespace tarn::streams {

namespace {

// What a message waits for at the most, once the library remembers as many shapes as it may.
constexpr std::uint32_t kRoomMilliseconds = 100;

tarnreporting_value valueOf(const FieldValue& value) {
  if (const bool* const boolean = std::get_if<bool>(&value)) return tarnreporting_boolean(*boolean ? 1 : 0);
  if (const std::int64_t* const integer = std::get_if<std::int64_t>(&value)) return tarnreporting_integer(*integer);
  if (const double* const number = std::get_if<double>(&value)) return tarnreporting_double(*number);
  const std::string& text = std::get<std::string>(value);
  return tarnreporting_text(text.data(), static_cast<std::uint32_t>(text.size()));
}

tarnreporting_state stateOf(tarnreporting_client* client) {
  tarnreporting_state state{};
  state.size = sizeof state;
  tarnreporting_client_state(client, &state);
  return state;
}

// Keys are texts of the program, with a zero at their ends.
std::vector<tarnreporting_field> fieldsOf(const Fields& fields) {
  std::vector<tarnreporting_field> made;
  made.reserve(fields.size());
  for (const Field& field : fields) {
    made.push_back({field.key.data(), valueOf(field.value)});
  }
  return made;
}

}  // namespace

Reporter::~Reporter() {
  close(0);
}

Status Reporter::open(const std::string& socket) {
  tarnreporting_client_options options{};
  options.size = sizeof options;
  options.socket_path = socket.empty() ? nullptr : socket.c_str();
  int result = tarnreporting_client_open(&options, &client_);
  if (result == TARNREPORTING_OK) {
    result = tarnreporting_writer_open(client_, nullptr, &writer_);
  }
  if (result == TARNREPORTING_OK) return {};
  close(0);
  return Error{result, tarnreporting_result_text(result)};
}

void Reporter::carryOut(const Actions& actions) {
  for (const Action& action : actions) {
    std::visit([this](const auto& one) { carryOut(one); }, action);
  }
}

std::uint64_t Reporter::close(std::uint32_t milliseconds) {
  std::uint64_t left = 0;
  if (client_ != nullptr) {
    tarnreporting_client_close(std::exchange(client_, nullptr), milliseconds, &left);
  }
  sessions_.clear();
  return left;
}

void Reporter::carryOut(const BeginSession& begin) {
  Session& session = sessions_.insert_or_assign(begin.stream, Session(begin)).first->second;
  if (!this->begin(session)) {
    ++counts_.leftOut;
  }
}

void Reporter::carryOut(const PostMessage& post) {
  const auto found = sessions_.find(post.stream);
  if (found == sessions_.end()) return;
  Session& session = found->second;
  const Standing now = standing();
  if (session.handle == nullptr && now.isConnected) {
    begin(session);
    session.connection = 0;
  }
  if (session.handle != nullptr && std::exchange(session.connection, now.connection) != now.connection) {
    if (const auto restated = session.memory.restatement()) {
      send(session, *restated);
    }
  }
  session.memory.remember(post);
  if (session.handle != nullptr) {
    send(session, post);
  }
}

void Reporter::carryOut(const EndSession& end) {
  const auto found = sessions_.find(end.stream);
  if (found == sessions_.end()) return;
  if (found->second.handle != nullptr) {
    tarnreporting_session_end(found->second.handle);
  }
  sessions_.erase(found);
}

bool Reporter::begin(Session& session) {
  const Standing now = standing();
  waiting_ = now.isConnected ? 0 : waiting_ + 1;
  if (waiting_ > kMostWaiting) return false;
  const BeginSession& begin = session.memory.begin();
  const std::vector<tarnreporting_field> configuration = fieldsOf(begin.configuration);
  tarnreporting_session_options options{};
  options.size = sizeof options;
  options.service_type = begin.serviceType;
  options.application = begin.application.c_str();
  options.configuration = configuration.data();
  options.configuration_count = configuration.size();
  session.connection = now.connection;
  const int result = tarnreporting_session_begin(client_, &options, &session.handle);
  if (result != TARNREPORTING_OK) {
    counts_.lastRefusal = tarnreporting_result_text(result);
    return false;
  }
  ++counts_.sessions;
  return true;
}

void Reporter::send(const Session& session, const PostMessage& post) {
  const std::vector<tarnreporting_field> fields = fieldsOf(post.fields);
  tarnreporting_message_options options{};
  options.size = sizeof options;
  options.category = post.category;
  options.type = post.type;
  options.fields = fields.data();
  options.field_count = fields.size();
  options.stamp_ns = static_cast<std::uint64_t>(post.stamp);
  int result = tarnreporting_post_fields(writer_, session.handle, &options);
  if (result == TARNREPORTING_TOO_LARGE && standing().isConnected) {
    tarnreporting_client_flush(client_, kRoomMilliseconds);
    result = tarnreporting_post_fields(writer_, session.handle, &options);
  }
  if (result == TARNREPORTING_OK) {
    ++counts_.messages;
  } else {
    ++counts_.lost;
    counts_.lastRefusal = tarnreporting_result_text(result);
  }
}

std::uint64_t Reporter::refused() const {
  return stateOf(client_).refused;
}

std::string Reporter::lastError() const {
  const tarnreporting_state state = stateOf(client_);
  return state.last_error;
}

Reporter::Standing Reporter::standing() const {
  const tarnreporting_state state = stateOf(client_);
  const bool isConnected = state.connection == TARNREPORTING_CONNECTED;
  return {isConnected, state.connections + (isConnected ? std::uint64_t{0} : std::uint64_t{1})};
}

}  // namespace tarn::streams
