// SPDX-License-Identifier: Apache-2.0
// Whether bytes are well-formed CBOR, whatever they mean. Asked only about frames that were found wanting, to tell
// whether they can be answered. Internal to wire/.
//
//   80       well-formed: an empty array      1C 00    "a reserved item head"
//   82 01    "the frame ends inside an item"  01 02    "bytes behind the array"
//
// Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "wire/CborReader.h"

namespace tarn::wire {

// Moves over one whole item, nested ones included. Null when it is well-formed, else the reason (a text that lives for
// ever). Takes no stack; four bytes of memory for each container that is open with more to come, of which there can't
// be more than half as many as there are bytes.
const char* skipItem(CborReader& in);

// Null when the bytes are exactly one well-formed item, else the reason: a static text. It costs time in proportion to
// the bytes, whatever they are.
const char* checkOneItem(std::span<const std::byte> bytes);

}  // namespace tarn::wire
