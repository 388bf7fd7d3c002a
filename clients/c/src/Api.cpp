// SPDX-License-Identifier: Apache-2.0
// The C functions: arguments and sizes are checked here, the work is the client's.
#include <cstddef>
#include <cstring>
#include <new>

#include "clients/c/src/Client.h"

using namespace tarn::reporting;

namespace {

// Takes over a struct that begins with its size: of an older program it is shorter, of a newer one longer, and then
// what this library doesn't know must be 0.
template <class Options>
bool readOptions(Options& mine, const Options* theirs) noexcept {
  std::memset(static_cast<void*>(&mine), 0, sizeof mine);
  if (theirs == nullptr) return true;
  const std::size_t size = theirs->size;
  if (size < sizeof size || size > 4096) return false;
  const auto* const bytes = reinterpret_cast<const unsigned char*>(theirs);
  for (std::size_t i = sizeof mine; i < size; ++i) {
    if (bytes[i] != 0) return false;
  }
  std::memcpy(static_cast<void*>(&mine), bytes, size < sizeof mine ? size : sizeof mine);
  return true;
}

int checkAlive(const tarnreporting_client& client) noexcept {
  return client.isAlive() ? TARNREPORTING_OK : TARNREPORTING_FORKED;
}

}  // namespace

const char* tarnreporting_result_text(int result) {
  switch (result) {
    case TARNREPORTING_OK:
      return "done";
    case TARNREPORTING_DROPPED:
      return "the ring is full: dropped";
    case TARNREPORTING_ARGUMENT:
      return "a wrong argument";
    case TARNREPORTING_KIND:
      return "values that don't fit the shape";
    case TARNREPORTING_TEXT:
      return "a text that is not UTF-8";
    case TARNREPORTING_TOO_LARGE:
      return "more than the bound";
    case TARNREPORTING_CLOSED:
      return "closed";
    case TARNREPORTING_FORKED:
      return "of the parent process";
    case TARNREPORTING_BUSY:
      return "another thread posts with this writer";
    case TARNREPORTING_MEMORY:
      return "no memory";
    case TARNREPORTING_SYSTEM:
      return "refused by the system";
    case TARNREPORTING_TIMEOUT:
      return "the time is up";
    default:
      return "unknown";
  }
}

int tarnreporting_client_open(const tarnreporting_client_options* options, tarnreporting_client** client) {
  tarnreporting_client_options mine;
  if (client == nullptr || !readOptions(mine, options)) return TARNREPORTING_ARGUMENT;
  void* const memory = std::malloc(sizeof(tarnreporting_client));
  if (memory == nullptr) return TARNREPORTING_MEMORY;
  auto* const made = ::new (memory) tarnreporting_client;
  const int result = made->open(&mine);
  if (result != TARNREPORTING_OK) {
    made->~tarnreporting_client();
    std::free(memory);
    return result;
  }
  *client = made;
  return TARNREPORTING_OK;
}

int tarnreporting_client_close(tarnreporting_client* client, uint32_t timeout_ms, uint64_t* left) {
  if (client == nullptr) return TARNREPORTING_ARGUMENT;
  if (const int result = checkAlive(*client)) return result;
  bool empty = false;
  const int result = client->close(timeout_ms, left, empty);
  if (empty) {
    client->~tarnreporting_client();
    std::free(client);
  }
  return result;
}

int tarnreporting_client_flush(tarnreporting_client* client, uint32_t timeout_ms) {
  if (client == nullptr) return TARNREPORTING_ARGUMENT;
  const int result = checkAlive(*client);
  return result == TARNREPORTING_OK ? client->flush(timeout_ms) : result;
}

int tarnreporting_client_state(tarnreporting_client* client, tarnreporting_state* state) {
  if (client == nullptr || state == nullptr || state->size < sizeof state->size || state->size > 4096) {
    return TARNREPORTING_ARGUMENT;
  }
  if (const int result = checkAlive(*client)) return result;
  tarnreporting_state mine;
  std::memset(&mine, 0, sizeof mine);
  client->readState(mine);
  mine.size = state->size;
  std::memcpy(state, &mine, state->size < sizeof mine ? state->size : sizeof mine);
  return TARNREPORTING_OK;
}

int tarnreporting_session_begin(tarnreporting_client* client, const tarnreporting_session_options* options,
                                tarnreporting_session** session) {
  tarnreporting_session_options mine;
  if (client == nullptr || session == nullptr || !readOptions(mine, options)) return TARNREPORTING_ARGUMENT;
  const int result = checkAlive(*client);
  return result == TARNREPORTING_OK ? client->beginSession(mine, session) : result;
}

int tarnreporting_session_end(tarnreporting_session* session) {
  if (session == nullptr) return TARNREPORTING_ARGUMENT;
  const int result = checkAlive(*session->client);
  return result == TARNREPORTING_OK ? session->client->endSession(*session) : result;
}

int tarnreporting_shape_declare(tarnreporting_session* session, const tarnreporting_shape_options* options,
                                tarnreporting_shape** shape) {
  tarnreporting_shape_options mine;
  if (session == nullptr || options == nullptr || shape == nullptr || !readOptions(mine, options)) {
    return TARNREPORTING_ARGUMENT;
  }
  const int result = checkAlive(*session->client);
  return result == TARNREPORTING_OK ? session->client->declareShape(*session, mine, shape) : result;
}

int tarnreporting_writer_open(tarnreporting_client* client, const tarnreporting_writer_options* options,
                              tarnreporting_writer** writer) {
  tarnreporting_writer_options mine;
  if (client == nullptr || writer == nullptr || !readOptions(mine, options)) return TARNREPORTING_ARGUMENT;
  const uint32_t bytes = mine.ring_bytes != 0 ? mine.ring_bytes : 262144;
  if (bytes < TARNRING_LEAST_DATA_BYTES || bytes > TARNRING_MOST_DATA_BYTES || (bytes & (bytes - 1)) != 0 ||
      (mine.flags & ~TARNREPORTING_NO_SYSTEM_CALL) != 0) {
    return TARNREPORTING_ARGUMENT;
  }
  const int result = checkAlive(*client);
  return result == TARNREPORTING_OK ? client->openWriter(bytes, mine.flags, writer) : result;
}

int tarnreporting_writer_close(tarnreporting_writer* writer) {
  if (writer == nullptr) return TARNREPORTING_ARGUMENT;
  const int result = checkAlive(*writer->client);
  return result == TARNREPORTING_OK ? writer->client->closeWriter(*writer) : result;
}

int tarnreporting_post(tarnreporting_writer* writer, const tarnreporting_shape* shape,
                       const tarnreporting_value* values, size_t count) {
  if (writer == nullptr || shape == nullptr || (values == nullptr && count != 0)) return TARNREPORTING_ARGUMENT;
  return post(*writer, *shape, nullptr, values, count);
}

int tarnreporting_post_at(tarnreporting_writer* writer, const tarnreporting_shape* shape, uint64_t stamp_ns,
                          const tarnreporting_value* values, size_t count) {
  if (writer == nullptr || shape == nullptr || (values == nullptr && count != 0)) return TARNREPORTING_ARGUMENT;
  return post(*writer, *shape, &stamp_ns, values, count);
}

int tarnreporting_post_fields(tarnreporting_writer* writer, tarnreporting_session* session,
                              const tarnreporting_message_options* options) {
  tarnreporting_message_options mine;
  if (writer == nullptr || session == nullptr || options == nullptr || !readOptions(mine, options)) {
    return TARNREPORTING_ARGUMENT;
  }
  const int result = checkAlive(*session->client);
  return result == TARNREPORTING_OK ? session->client->postFields(*writer, *session, mine) : result;
}
