// SPDX-License-Identifier: Apache-2.0
// What the client says of sessions and their shapes.
#include <cstring>

#include "clients/c/src/Client.h"
#include "clients/c/src/Fields.h"
#include "clients/c/src/Handles.h"

using namespace tarn::reporting;

namespace {

constexpr const char* kApplicationKey = "HostApplicationDisplayID";

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

void tarnreporting_client::markEnding(Session& session) noexcept {
  if (session.ending) return;
  session.ending = true;
  for (std::size_t i = 0; i < kMostWriters; ++i) {
    session.inside |= writers_[i] != nullptr ? 1U << i : 0U;
  }
  markEnd(session);
}

// What a writer has published by then may be the session's. A call that was inside when the session was ended may still
// publish one: would the service be told of the end before it has read that, it would wait for its shape for ever.
void tarnreporting_client::markEnd(Session& session) noexcept {
  for (std::size_t i = 0; i < kMostWriters; ++i) {
    if ((session.inside & 1U << i) == 0 || isInside(*writers_[i])) continue;
    session.end.at[i] = __atomic_load_n(&writers_[i]->header->head, __ATOMIC_ACQUIRE);
    session.inside &= ~(1U << i);
  }
}

void tarnreporting_client::mark(Heads& heads) const noexcept {
  for (std::size_t i = 0; i < kMostWriters; ++i) {
    const Writer* const writer = writers_[i];
    heads.at[i] = writer != nullptr ? __atomic_load_n(&writer->header->head, __ATOMIC_ACQUIRE) : 0;
  }
}

int tarnreporting_client::declareShape(Session& session, const tarnreporting_shape_options& options,
                                       Shape** made) noexcept {
  if (const int result = checkShape(options); result != TARNREPORTING_OK) return result;
  Shape* const shape = makeShape(session, options);
  if (shape == nullptr) return TARNREPORTING_MEMORY;
  const Locked locked(*this);
  if (const int result = enter(*shape); result != TARNREPORTING_OK) {
    freeHandle(shape);
    return result;
  }
  *made = shape;
  return TARNREPORTING_OK;
}

// Null when there is no memory.
tarnreporting_shape* tarnreporting_client::makeShape(Session& session,
                                                     const tarnreporting_shape_options& options) noexcept {
  Shape* const shape = makeHandle<Shape>();
  if (shape == nullptr) return nullptr;
  shape->client = this;
  shape->session = &session;
  describe(*shape, options);
  if (!shape->keysAndKinds.failed()) return shape;
  freeHandle(shape);
  return nullptr;
}

// Gives the shape a number and tells the service of it.
int tarnreporting_client::enter(Shape& shape) noexcept {
  Session& session = *shape.session;
  if (session.ending) return TARNREPORTING_CLOSED;
  if (!takeShapeNumber(shape.number)) return TARNREPORTING_TOO_LARGE;
  shape.next = session.shapes;
  session.shapes = &shape;
  if (linked_ && session.announced) {
    announce(shape);
    wakeHelper();
  }
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

void tarnreporting_client::giveBackShapeNumber(std::uint32_t number) noexcept {
  shapeNumbers_[number / 64] &= ~(std::uint64_t{1} << (number % 64));
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

// Until the answer is there the number is no other shape's, whose messages would be read by the keys of this one.
void tarnreporting_client::forget(std::uint32_t shapeNumber) noexcept {
  forgetRequests_[shapeNumber] = link_.begin(Operation::DeclareShape, 1);
  ++forgetting_;
  putHead(link_.out(), Major::Map, 1);
  putText(link_.out(), "shape");
  putInteger(link_.out(), shapeNumber);
  link_.end();
}

void tarnreporting_client::forgotten(std::uint64_t request) noexcept {
  for (std::uint32_t number = 0; forgetting_ != 0 && number < TARNRING_MOST_SHAPES; ++number) {
    if (forgetRequests_[number] == 0 || (request != 0 && forgetRequests_[number] != request)) continue;
    forgetRequests_[number] = 0;
    --forgetting_;
    giveBackShapeNumber(number);
  }
}

void tarnreporting_client::tendSessions() noexcept {
  Session* next = nullptr;
  for (Session* session = sessions_; session != nullptr; session = next) {
    next = session->next;
    markEnd(*session);
    if (session->ending && session->inside == 0 && isDrained(session->end)) {
      if (linked_ && session->announced) {
        finish(*session);
      }
      if (session->everAnnounced) {
        remove(*session);
      }
    }
  }
}

bool tarnreporting_client::isDrained(const Heads& heads) const noexcept {
  for (std::size_t i = 0; i < kMostWriters; ++i) {
    const Writer* const writer = writers_[i];
    if (writer == nullptr || heads.at[i] == 0) continue;
    const std::uint64_t taken = __atomic_load_n(&writer->header->taken, __ATOMIC_ACQUIRE);
    if (static_cast<std::int64_t>(taken - heads.at[i]) < 0) return false;
  }
  return true;
}

void tarnreporting_client::finish(Session& session) noexcept {
  link_.begin(Operation::StopReportingSessionForID, 1);
  putInteger(link_.out(), session.reporterID);
  link_.end();
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
    removeShape(*shape);
  }
  freeHandle(&session);
}

void tarnreporting_client::removeShape(Shape& shape) noexcept {
  if (linked_ && shape.session->announced) {
    forget(shape.number);
  } else {
    giveBackShapeNumber(shape.number);
  }
  std::free(shape.lastUse);
  freeHandle(&shape);
}
