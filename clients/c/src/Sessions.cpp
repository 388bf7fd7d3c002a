// What the client says of sessions and their shapes.
#include <cstring>
#include <new>

#include "clients/c/src/Client.h"
#include "clients/c/src/Utf8.h"

using namespace tarn::reporting;

namespace {

constexpr const char* kApplicationKey = "HostApplicationDisplayID";
// By tarnreporting_kind.
constexpr const char* kKindNames[] = {"", "integer", "unsigned", "double", "date", "boolean", "text"};

int checkText(const char* text, std::size_t length, std::size_t most) noexcept {
  if (text == nullptr) return TARNREPORTING_ARGUMENT;
  if (length > most) return TARNREPORTING_TOO_LARGE;
  return isUtf8(text, length) ? TARNREPORTING_OK : TARNREPORTING_TEXT;
}

int checkKey(const char* key) noexcept {
  const int result =
      key != nullptr ? checkText(key, std::strlen(key), TARNREPORTING_MOST_KEY_BYTES) : checkText(key, 0, 0);
  return result == TARNREPORTING_OK && key[0] == '\0' ? static_cast<int>(TARNREPORTING_ARGUMENT) : result;
}

void putValue(Bytes& out, const tarnreporting_value& value) noexcept {
  switch (value.kind) {
    case TARNREPORTING_INTEGER:
      putInteger(out, value.as.integer);
      break;
    case TARNREPORTING_UNSIGNED:
      putHead(out, Major::Unsigned, value.as.unsigned_integer);
      break;
    case TARNREPORTING_DATE:
      putHead(out, Major::Tag, 1);
      putDouble(out, value.as.number);
      break;
    case TARNREPORTING_DOUBLE:
      putDouble(out, value.as.number);
      break;
    case TARNREPORTING_BOOLEAN:
      putBoolean(out, value.as.boolean != 0);
      break;
    default:
      putText(out, value.as.text != nullptr ? value.as.text : "", value.length);
      break;
  }
}

int checkField(const tarnreporting_field& field) noexcept {
  if (const int result = checkKey(field.key); result != TARNREPORTING_OK) return result;
  if (field.value.kind < TARNREPORTING_INTEGER || field.value.kind > TARNREPORTING_TEXT_VALUE) {
    return TARNREPORTING_KIND;
  }
  if (field.value.kind != TARNREPORTING_TEXT_VALUE || field.value.length == 0) return TARNREPORTING_OK;
  return checkText(field.value.as.text, field.value.length, TARNREPORTING_MOST_TEXT_BYTES);
}

int putConfiguration(Bytes& out, const tarnreporting_session_options& options) noexcept {
  if (options.configuration_count > TARNREPORTING_MOST_KEYS) return TARNREPORTING_TOO_LARGE;
  if (options.configuration == nullptr && options.configuration_count != 0) return TARNREPORTING_ARGUMENT;
  putHead(out, Major::Map, options.configuration_count + (options.application != nullptr ? 1 : 0));
  if (options.application != nullptr) {
    const std::size_t length = std::strlen(options.application);
    if (const int result = checkText(options.application, length, TARNREPORTING_MOST_TEXT_BYTES)) return result;
    putText(out, kApplicationKey);
    putText(out, options.application, length);
  }
  for (std::size_t i = 0; i < options.configuration_count; ++i) {
    if (const int result = checkField(options.configuration[i])) return result;
    putText(out, options.configuration[i].key);
    putValue(out, options.configuration[i].value);
  }
  return out.failed() ? TARNREPORTING_MEMORY : TARNREPORTING_OK;
}

int checkKeys(const tarnreporting_shape_options& options) noexcept {
  if (options.key_count > TARNREPORTING_MOST_KEYS) return TARNREPORTING_TOO_LARGE;
  if (options.type > 65535 || (options.keys == nullptr && options.key_count != 0)) return TARNREPORTING_ARGUMENT;
  for (std::size_t i = 0; i < options.key_count; ++i) {
    const tarnreporting_key& key = options.keys[i];
    if (const int result = checkKey(key.name)) return result;
    if (key.kind < TARNREPORTING_INTEGER || key.kind > TARNREPORTING_TEXT_VALUE) return TARNREPORTING_KIND;
    for (std::size_t j = 0; j < i; ++j) {
      if (std::strcmp(options.keys[j].name, key.name) == 0) return TARNREPORTING_ARGUMENT;
    }
  }
  return TARNREPORTING_OK;
}

void describe(tarnreporting_shape& shape, const tarnreporting_shape_options& options) noexcept {
  shape.category = options.category;
  shape.type = options.type;
  shape.count = static_cast<std::uint32_t>(options.key_count);
  putText(shape.keysAndKinds, "keys");
  putHead(shape.keysAndKinds, Major::Array, options.key_count);
  for (std::size_t i = 0; i < options.key_count; ++i) {
    putText(shape.keysAndKinds, options.keys[i].name);
    shape.kinds[i] = static_cast<std::uint8_t>(options.keys[i].kind);
  }
  putText(shape.keysAndKinds, "kinds");
  putHead(shape.keysAndKinds, Major::Array, options.key_count);
  for (std::size_t i = 0; i < options.key_count; ++i) {
    putText(shape.keysAndKinds, kKindNames[options.keys[i].kind]);
  }
}

template <class Handle>
Handle* makeHandle() noexcept {
  void* const memory = std::malloc(sizeof(Handle));
  return memory != nullptr ? ::new (memory) Handle : nullptr;
}

template <class Handle>
void freeHandle(Handle* handle) noexcept {
  handle->~Handle();
  std::free(handle);
}

}  // namespace

int tarnreporting_client::beginSession(const tarnreporting_session_options& options, Session** made) noexcept {
  if (options.service_type > 65535) return TARNREPORTING_ARGUMENT;
  Session* const session = makeHandle<Session>();
  if (session == nullptr) return TARNREPORTING_MEMORY;
  session->client = this;
  session->serviceType = options.service_type;
  if (const int result = putConfiguration(session->configuration, options); result != TARNREPORTING_OK) {
    freeHandle(session);
    return result;
  }
  const Locked locked(*this);
  Session** last = &sessions_;
  while (*last != nullptr) {
    last = &(*last)->next;
  }
  *last = session;
  if (linked_) {
    announce(*session);
    wakeHelper();
  }
  *made = session;
  return TARNREPORTING_OK;
}

int tarnreporting_client::endSession(Session& session) noexcept {
  const Locked locked(*this);
  markEnding(session);
  wakeHelper();
  return TARNREPORTING_OK;
}

// What the writers have published by now may be the session's.
void tarnreporting_client::markEnding(Session& session) noexcept {
  if (session.ending) return;
  session.ending = true;
  for (std::size_t i = 0; i < kMostWriters; ++i) {
    const Writer* const writer = writers_[i];
    session.endHeads[i] = writer != nullptr ? __atomic_load_n(&writer->header->head, __ATOMIC_ACQUIRE) : 0;
  }
}

int tarnreporting_client::declareShape(Session& session, const tarnreporting_shape_options& options,
                                       Shape** made) noexcept {
  if (const int result = checkKeys(options); result != TARNREPORTING_OK) return result;
  Shape* const shape = makeHandle<Shape>();
  if (shape == nullptr) return TARNREPORTING_MEMORY;
  shape->client = this;
  shape->session = &session;
  describe(*shape, options);
  const Locked locked(*this);
  int result = shape->keysAndKinds.failed() ? TARNREPORTING_MEMORY : TARNREPORTING_OK;
  result = result == TARNREPORTING_OK && session.ending ? static_cast<int>(TARNREPORTING_CLOSED) : result;
  if (result == TARNREPORTING_OK && !takeShapeNumber(shape->number)) {
    result = TARNREPORTING_TOO_LARGE;
  }
  if (result != TARNREPORTING_OK) {
    freeHandle(shape);
    return result;
  }
  shape->next = session.shapes;
  session.shapes = shape;
  if (linked_ && session.announced) {
    announce(*shape);
    wakeHelper();
  }
  *made = shape;
  return TARNREPORTING_OK;
}

bool tarnreporting_client::takeShapeNumber(std::uint32_t& number) noexcept {
  for (number = 0; number < TARNRING_MOST_SHAPES; ++number) {
    const std::uint64_t bit = std::uint64_t{1} << (number % 64);
    if ((shapeNumbers_[number / 64] & bit) == 0) {
      shapeNumbers_[number / 64] |= bit;
      return true;
    }
  }
  return false;
}

void tarnreporting_client::announce(Session& session) noexcept {
  session.reporterID = nextReporterID_++;
  session.announced = session.everAnnounced = true;
  link_.begin(Operation::CreateReportingSession, 1);
  putInteger(link_.out(), session.reporterID);
  link_.end();
  link_.begin(Operation::SetServiceType, 2);
  putInteger(link_.out(), session.serviceType);
  putInteger(link_.out(), session.reporterID);
  link_.end();
  link_.begin(Operation::SetConfiguration, 2);
  link_.out().append(session.configuration);
  putInteger(link_.out(), session.reporterID);
  link_.end();
  link_.begin(Operation::StartReportingSessionForID, 1);
  putInteger(link_.out(), session.reporterID);
  link_.end();
  for (const Shape* shape = session.shapes; shape != nullptr; shape = shape->next) {
    announce(*shape);
  }
}

void tarnreporting_client::announce(const Shape& shape) noexcept {
  link_.begin(Operation::DeclareShape, 1);
  Bytes& out = link_.out();
  putHead(out, Major::Map, 6);
  putText(out, "shape");
  putInteger(out, shape.number);
  putText(out, "category");
  putInteger(out, shape.category);
  putText(out, "type");
  putInteger(out, shape.type);
  putText(out, "reporterIDs");
  putHead(out, Major::Array, 1);
  putInteger(out, shape.session->reporterID);
  out.append(shape.keysAndKinds);
  link_.end();
}

void tarnreporting_client::forget(std::uint32_t shapeNumber) noexcept {
  link_.begin(Operation::DeclareShape, 1);
  putHead(link_.out(), Major::Map, 1);
  putText(link_.out(), "shape");
  putInteger(link_.out(), shapeNumber);
  link_.end();
}

void tarnreporting_client::tendSessions() noexcept {
  Session* next = nullptr;
  for (Session* session = sessions_; session != nullptr; session = next) {
    next = session->next;
    if (session->ending && isDrained(*session) && !anybodyInside()) {
      if (linked_ && session->announced) {
        finish(*session);
      }
      if (session->everAnnounced) {
        remove(*session);
      }
    }
  }
}

bool tarnreporting_client::isDrained(const Session& session) const noexcept {
  for (std::size_t i = 0; i < kMostWriters; ++i) {
    const Writer* const writer = writers_[i];
    if (writer == nullptr || session.endHeads[i] == 0) continue;
    const std::uint64_t taken = __atomic_load_n(&writer->header->taken, __ATOMIC_ACQUIRE);
    if (static_cast<std::int64_t>(taken - session.endHeads[i]) < 0) return false;
  }
  return true;
}

void tarnreporting_client::finish(Session& session) noexcept {
  link_.begin(Operation::StopReportingSessionForID, 1);
  putInteger(link_.out(), session.reporterID);
  link_.end();
  for (const Shape* shape = session.shapes; shape != nullptr; shape = shape->next) {
    forget(shape->number);
  }
}

void tarnreporting_client::remove(Session& session) noexcept {
  Session** place = &sessions_;
  while (*place != &session) {
    place = &(*place)->next;
  }
  *place = session.next;
  while (session.shapes != nullptr) {
    Shape* const shape = session.shapes;
    session.shapes = shape->next;
    shapeNumbers_[shape->number / 64] &= ~(std::uint64_t{1} << (shape->number % 64));
    freeHandle(shape);
  }
  freeHandle(&session);
}
