// SPDX-License-Identifier: Apache-2.0
// Keys and values as a program gives them: whether they are in order, and what is said of them. Stateless. Threads:
// any.
#pragma once

#include <cstddef>

#include "clients/c/include/tarnreporting.h"
#include "clients/c/src/Bytes.h"
#include "clients/c/src/Writer.h"

namespace tarn::reporting {

// Each a result, TARNREPORTING_OK when everything is in order. Of a text: ARGUMENT for a null pointer, TOO_LARGE for
// more than `most` bytes, TEXT for what isn't UTF-8. It costs a look at each byte.
int checkText(const char* text, std::size_t length, std::size_t most) noexcept;
// Of a key: what checkText() says, and ARGUMENT for an empty one. Of a value: KIND for a kind that there isn't, and of
// a text what checkText() says; an empty text may be a null pointer.
int checkField(const tarnreporting_field& field) noexcept;
// The type in its range, at most 64 keys, each of a kind that there is, all different. The comparison is quadratic,
// which 64 keys bear.
int checkShape(const tarnreporting_shape_options& options) noexcept;

// A checked value in CBOR, as configurations have it.
void putValue(Bytes& out, const tarnreporting_value& value) noexcept;
// Of checked options. Where there was no memory, shape.keysAndKinds has failed.
void describe(tarnreporting_shape& shape, const tarnreporting_shape_options& options) noexcept;

}  // namespace tarn::reporting
