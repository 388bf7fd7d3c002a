// SPDX-License-Identifier: Apache-2.0
#include "wire/Encoder.h"

#include <bit>
#include <cmath>
#include <concepts>

#include "plist/Dictionary.h"
#include "wire/CborReader.h"
#include "wire/Utf8.h"

namespace tarn::wire {

namespace {

constexpr char kNull = static_cast<char>(0xF6);
constexpr char kFalse = static_cast<char>(0xF4);
constexpr char kFloat = static_cast<char>(0xFA);
constexpr char kDouble = static_cast<char>(0xFB);
constexpr char kDateTag = static_cast<char>(0xC1);

template <std::size_t kBytes>
void appendBigEndian(std::string& out, char first, std::uint64_t value) {
  char bytes[1 + kBytes];
  bytes[0] = first;
  for (std::size_t i = kBytes; i > 0; --i) {
    bytes[i] = static_cast<char>(value & 0xFFU);
    value >>= 8U;
  }
  out.append(bytes, sizeof bytes);
}

void appendHead(std::string& out, Major major, std::uint64_t argument) {
  const unsigned type = static_cast<unsigned>(major) << 5U;
  if (argument < kInfoOneByte) {
    out.push_back(static_cast<char>(type | argument));
  } else if (argument <= 0xFF) {
    appendBigEndian<1>(out, static_cast<char>(type | 24U), argument);
  } else if (argument <= 0xFFFF) {
    appendBigEndian<2>(out, static_cast<char>(type | 25U), argument);
  } else if (argument <= 0xFFFFFFFF) {
    appendBigEndian<4>(out, static_cast<char>(type | 26U), argument);
  } else {
    appendBigEndian<8>(out, static_cast<char>(type | 27U), argument);
  }
}

void appendSigned(std::string& out, std::int64_t value) {
  if (value >= 0) {
    appendHead(out, Major::Unsigned, static_cast<std::uint64_t>(value));
  } else {
    appendHead(out, Major::Negative, ~static_cast<std::uint64_t>(value));
  }
}

void appendString(std::string& out, Major major, std::string_view bytes) {
  appendHead(out, major, bytes.size());
  out.append(bytes);
}

void appendDouble(std::string& out, double value) {
  appendBigEndian<8>(out, kDouble, std::bit_cast<std::uint64_t>(value));
}

void appendDate(std::string& out, double seconds) {
  out.push_back(kDateTag);
  // Beyond 2^53 an integer would claim a precision that the double doesn't have; -0.0 isn't an integer's zero.
  constexpr double kExact = 0x1p53;
  const bool integral = seconds >= -kExact && seconds <= kExact && std::trunc(seconds) == seconds &&
                        !(seconds == 0 && std::signbit(seconds));
  if (integral) {
    appendSigned(out, static_cast<std::int64_t>(seconds));
  } else {
    appendDouble(out, seconds);
  }
}

void appendArray(std::string& out, const plist::Array& array) {
  appendHead(out, Major::Array, array.size());
  for (const plist::ValueView item : array) {
    appendValue(out, item);
  }
}

void appendDictionary(std::string& out, const plist::Dictionary& dictionary) {
  appendHead(out, Major::Map, dictionary.size());
  for (const plist::Dictionary::Entry entry : dictionary) {
    appendString(out, Major::Text, entry.key.text());
    appendValue(out, entry.value);
  }
}

void appendNumbers(std::string& out, std::span<const std::int64_t> numbers) {
  appendHead(out, Major::Array, numbers.size());
  for (const std::int64_t number : numbers) {
    appendSigned(out, number);
  }
}

void appendArgument(std::string& out, std::int64_t number) {
  appendSigned(out, number);
}

template <std::unsigned_integral Number>
void appendArgument(std::string& out, Number number) {
  appendHead(out, Major::Unsigned, number);
}

void appendArgument(std::string& out, const plist::Dictionary& dictionary) {
  appendDictionary(out, dictionary);
}

void appendArgument(std::string& out, const ReporterIDs& reporterIDs) {
  if (reporterIDs) {
    appendNumbers(out, *reporterIDs);
  } else {
    out.push_back(kNull);
  }
}

}  // namespace

void appendValue(std::string& out, const plist::ValueView& value) {
  switch (value.kind()) {
    case plist::Kind::None:
      out.push_back(kNull);
      return;
    case plist::Kind::Bool:
      out.push_back(static_cast<char>(kFalse + (value.boolValue() ? 1 : 0)));
      return;
    case plist::Kind::Signed:
      appendSigned(out, value.signedValue());
      return;
    case plist::Kind::Unsigned:
      appendHead(out, Major::Unsigned, value.unsignedValue());
      return;
    case plist::Kind::Float:
      appendBigEndian<4>(out, kFloat, std::bit_cast<std::uint32_t>(value.floatValue()));
      return;
    case plist::Kind::Double:
      appendDouble(out, value.doubleValue());
      return;
    case plist::Kind::Date:
      appendDate(out, value.dateValue().epochSeconds);
      return;
    case plist::Kind::Text:
      appendString(out, Major::Text, value.text());
      return;
    case plist::Kind::Data:
      appendString(out, Major::Bytes, value.data());
      return;
    case plist::Kind::Array:
      appendArray(out, value.array());
      return;
    case plist::Kind::Dictionary:
      appendDictionary(out, value.dictionary());
      return;
  }
}

std::size_t Encoder::beginFrame() {
  const std::size_t header = out_.size();
  out_.append(kFrameHeaderBytes, '\0');
  return header;
}

void Encoder::endFrame(std::size_t header, std::size_t bytesToCome) {
  std::size_t length = out_.size() - header - kFrameHeaderBytes + bytesToCome;
  for (std::size_t i = 0; i < kFrameHeaderBytes; ++i, length >>= 8U) {
    out_[header + i] = static_cast<char>(length & 0xFFU);
  }
}

void Encoder::request(std::uint64_t id, const Request& request) {
  const ArgumentList& arguments = rowOf(request.operation).arguments;
  const std::size_t header = beginFrame();
  appendHead(out_, Major::Array, 2 + arguments.size());
  appendHead(out_, Major::Unsigned, id);
  appendHead(out_, Major::Unsigned, numberOf(request.operation));
  for (const Argument argument : arguments) {
    std::visit([&](auto member) { appendArgument(out_, request.*member); }, rowOf(argument).member);
  }
  endFrame(header);
}

void Encoder::reply(std::uint64_t id, std::initializer_list<plist::ValueView> results) {
  const std::size_t header = beginFrame();
  appendHead(out_, Major::Array, 2 + results.size());
  appendHead(out_, Major::Unsigned, id);
  out_.push_back(kNull);
  for (const plist::ValueView& result : results) {
    appendValue(out_, result);
  }
  endFrame(header);
}

void Encoder::replyWithNumbers(std::uint64_t id, std::size_t count, std::size_t bytes) {
  const std::size_t header = beginFrame();
  appendHead(out_, Major::Array, 3);
  appendHead(out_, Major::Unsigned, id);
  out_.push_back(kNull);
  appendHead(out_, Major::Array, count);
  endFrame(header, bytes);
}

void Encoder::numbers(std::span<const std::int64_t> numbers) {
  for (const std::int64_t number : numbers) {
    appendSigned(out_, number);
  }
}

void Encoder::errorReply(std::uint64_t id, std::string_view domain, std::int64_t code, std::string_view text) {
  const std::size_t header = beginFrame();
  appendHead(out_, Major::Array, 2);
  appendHead(out_, Major::Unsigned, id);
  appendHead(out_, Major::Array, 3);
  appendString(out_, Major::Text, domain);
  appendSigned(out_, code);
  std::string mended;
  appendMendedUtf8(mended, text);
  appendString(out_, Major::Text, mended);
  endFrame(header);
}

}  // namespace tarn::wire
