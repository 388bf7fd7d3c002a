// Keys and values as a program gives them: whether they are in order, and what is said of them. Stateless. Threads:
// any.
#pragma once

#include <cstddef>

#include "clients/c/include/tarnreporting.h"
#include "clients/c/src/Bytes.h"
#include "clients/c/src/Writer.h"

namespace tarn::reporting {

// Each a result.
int checkText(const char* text, std::size_t length, std::size_t most) noexcept;
int checkField(const tarnreporting_field& field) noexcept;
// The type, and keys that are all different and of a kind.
int checkShape(const tarnreporting_shape_options& options) noexcept;

void putValue(Bytes& out, const tarnreporting_value& value) noexcept;
// Of checked options. Where there was no memory, shape.keysAndKinds has failed.
void describe(tarnreporting_shape& shape, const tarnreporting_shape_options& options) noexcept;

}  // namespace tarn::reporting
