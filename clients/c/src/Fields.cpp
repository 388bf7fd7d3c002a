// SPDX-License-Identifier: Apache-2.0
#include "clients/c/src/Fields.h"

#include <cstring>

#include "clients/c/src/Cbor.h"
#include "clients/c/src/Utf8.h"

namespace tarn::reporting {

namespace {

// By tarnreporting_kind.
constexpr const char* kKindNames[] = {"", "integer", "unsigned", "double", "date", "boolean", "text"};

int checkKey(const char* key) noexcept {
  const int result =
      key != nullptr ? checkText(key, std::strlen(key), TARNREPORTING_MOST_KEY_BYTES) : checkText(key, 0, 0);
  return result == TARNREPORTING_OK && key[0] == '\0' ? static_cast<int>(TARNREPORTING_ARGUMENT) : result;
}

}  // namespace

int checkText(const char* text, std::size_t length, std::size_t most) noexcept {
  if (text == nullptr) return TARNREPORTING_ARGUMENT;
  if (length > most) return TARNREPORTING_TOO_LARGE;
  return isUtf8(text, length) ? TARNREPORTING_OK : TARNREPORTING_TEXT;
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

int checkShape(const tarnreporting_shape_options& options) noexcept {
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

}  // namespace tarn::reporting
