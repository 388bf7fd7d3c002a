// SPDX-License-Identifier: Apache-2.0
// Posting of fields: a message whose shape nobody declared. The library declares one for each set of keys and kinds
// that comes up and keeps it, so that the message is served after a restart of the service like any other.
#include <cstring>

#include "clients/c/src/Client.h"
#include "clients/c/src/Fields.h"
#include "clients/c/src/Handles.h"

using namespace tarn::reporting;

namespace {

bool isSame(const tarnreporting_shape& one, const tarnreporting_shape& other) noexcept {
  const Bytes& bytes = one.keysAndKinds;
  return one.category == other.category && one.type == other.type && bytes.size() == other.keysAndKinds.size() &&
         std::memcmp(bytes.data(), other.keysAndKinds.data(), bytes.size()) == 0;
}

void putFirst(tarnreporting_session& session, tarnreporting_shape& shape, tarnreporting_shape** place) noexcept {
  *place = shape.next;
  shape.next = session.shapes;
  session.shapes = &shape;
}

}  // namespace

int tarnreporting_client::postFields(Writer& writer, Session& session,
                                     const tarnreporting_message_options& options) noexcept {
  if (session.client != this || (options.fields == nullptr && options.field_count != 0)) return TARNREPORTING_ARGUMENT;
  if (options.field_count > TARNREPORTING_MOST_KEYS) return TARNREPORTING_TOO_LARGE;
  tarnreporting_key keys[TARNREPORTING_MOST_KEYS];
  tarnreporting_value values[TARNREPORTING_MOST_KEYS];
  for (std::size_t i = 0; i < options.field_count; ++i) {
    const tarnreporting_field& field = options.fields[i];
    if (const int result = checkField(field); result != TARNREPORTING_OK) return result;
    keys[i] = {field.key, field.value.kind};
    values[i] = field.value;
  }
  const tarnreporting_shape_options shapeOptions = {sizeof shapeOptions, options.category, options.type, keys,
                                                    options.field_count};
  if (const int result = checkShape(shapeOptions); result != TARNREPORTING_OK) return result;
  const Locked locked(*this);
  Shape* shape = nullptr;
  if (const int result = findFieldShape(session, shapeOptions, &shape); result != TARNREPORTING_OK) return result;
  const std::uint64_t* const stamp = options.stamp_ns != 0 ? &options.stamp_ns : nullptr;
  const int result = post(writer, *shape, stamp, values, options.field_count);
  mark(*shape->lastUse);
  return result;
}

int tarnreporting_client::findFieldShape(Session& session, const tarnreporting_shape_options& options,
                                         Shape** found) noexcept {
  if (session.ending) return TARNREPORTING_CLOSED;
  Shape* const wanted = makeShape(session, options);
  if (wanted == nullptr) return TARNREPORTING_MEMORY;
  for (Shape** place = &session.shapes; *place != nullptr; place = &(*place)->next) {
    Shape& shape = **place;
    if (shape.lastUse == nullptr || !isSame(shape, *wanted)) continue;
    freeHandle(wanted);
    putFirst(session, shape, place);
    *found = &shape;
    return TARNREPORTING_OK;
  }
  wanted->lastUse = makeHandle<Heads>();
  int result = wanted->lastUse != nullptr ? TARNREPORTING_OK : TARNREPORTING_MEMORY;
  if (result == TARNREPORTING_OK) {
    result = makeRoomForFieldShape(session) ? enter(*wanted) : static_cast<int>(TARNREPORTING_TOO_LARGE);
  }
  if (result != TARNREPORTING_OK) {
    std::free(wanted->lastUse);
    freeHandle(wanted);
    return result;
  }
  ++session.fieldShapes;
  *found = wanted;
  return TARNREPORTING_OK;
}

// Where there are too many, the one goes whose last use is the longest ago, once nothing of it waits in a ring.
bool tarnreporting_client::makeRoomForFieldShape(Session& session) noexcept {
  if (session.fieldShapes < kMostFieldShapes) return true;
  Shape** oldest = nullptr;
  for (Shape** place = &session.shapes; *place != nullptr; place = &(*place)->next) {
    if ((*place)->lastUse != nullptr) {
      oldest = place;
    }
  }
  if (oldest == nullptr || !isDrained(*(*oldest)->lastUse)) return false;
  Shape& shape = **oldest;
  *oldest = shape.next;
  removeShape(shape);
  --session.fieldShapes;
  return true;
}
