// SPDX-License-Identifier: Apache-2.0
// The message that every figure uses: 12 keys of the kinds that clients send, about 305 bytes of CBOR. One place, so
// that the figures of all programs here can be compared.
//
// Threads: any.
#pragma once

#include <cstdint>
#include <string>

#include "plist/Dictionary.h"
#include "wire/Request.h"

namespace tarn::bench {

// The member "underrun_count" is the number of the message on top of this.
inline constexpr std::uint64_t kFirstCount = 70'000;

inline constexpr std::size_t kMessageKeys = 12;
inline constexpr std::int64_t kReporterID = 4711;

// Messages of the same content say the same; the moment shows in the three values that tell when it was sent.
plist::Dictionary makeMessage(std::uint64_t content, std::uint64_t moment);
// All different from each other, in content too.
inline plist::Dictionary makeMessage(std::uint64_t number) {
  return makeMessage(number, number);
}

// The message as a session logs it and hands it on: with the tag and the application that it adds.
plist::Dictionary makeLoggedMessage(std::uint64_t content, std::uint64_t moment);

// A sendMessage request to the one reporter. Its message is number 0.
wire::Request makeRequest();
// Turns the request's message into that of this number, in place.
void renumber(wire::Request& request, std::uint64_t number);

// The whole frame of the request of this number, and the CBOR of the message alone.
std::string makeFrame(std::uint64_t number);
std::string makeCbor(std::uint64_t number);

}  // namespace tarn::bench
