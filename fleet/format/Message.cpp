// SPDX-License-Identifier: Apache-2.0
#include "fleet/format/Message.h"

#include <sodium.h>
#include <zstd.h>

#include <array>
#include <charconv>
#include <utility>

#include "plist/Hex.h"

namespace tarn::fleet {

namespace {

constexpr std::string_view kMark{"tnf\x01", 4};
constexpr std::size_t kNameBytes = 3;  // of it; the rest is the version
// Quick: most of what can be had comes of texts that stand there again and again.
constexpr int kCompression = 1;
constexpr std::size_t kHashBytes = 16;
// No id of a store lies beyond, so sums of ids don't either.
constexpr std::int64_t kLastId = std::int64_t{1} << 62;

std::string withoutWord(std::int64_t id) {
  return "nothing tells of the id " + std::to_string(id);
}

std::string messageIdOf(const v1::Batch& batch, std::string_view plain) {
  std::array<unsigned char, kHashBytes> hash{};
  crypto_generichash(hash.data(), hash.size(), reinterpret_cast<const unsigned char*>(plain.data()), plain.size(),
                     nullptr, 0);
  std::string id;
  plist::appendHex(id, std::string_view(batch.device()));
  id += '.' + std::to_string(batch.first()) + '-' + std::to_string(batch.last()) + '.';
  plist::appendHex(id, std::string_view(reinterpret_cast<const char*>(hash.data()), hash.size()));
  return id;
}

// Goes through events and gaps, both rising, and counts what neither has.
std::string coverFault(const v1::Batch& batch) {
  std::int64_t absent = 0;
  std::int64_t next = batch.first();
  int gap = 0;
  const auto passGapsBefore = [&](std::int64_t id) -> std::string {
    for (; gap < batch.gaps_size() && batch.gaps(gap).first() < id; ++gap) {
      const v1::Gap& each = batch.gaps(gap);
      if (each.first() < next || each.last() < each.first() || each.last() >= id) return "its gaps are out of order";
      absent += each.first() - next;
      next = each.last() + 1;
    }
    return {};
  };
  for (const v1::Event& event : batch.events()) {
    const std::int64_t id = batch.first() + event.ahead();
    if (std::string fault = passGapsBefore(id); !fault.empty()) return fault;
    if (id < next || id > batch.last()) return "its ids are out of order";
    absent += id - next;
    next = id + 1;
  }
  if (std::string fault = passGapsBefore(batch.last() + 1); !fault.empty()) return fault;
  if (gap != batch.gaps_size()) return "a gap lies beyond its ids";
  absent += batch.last() + 1 - next;
  return absent == batch.left_out() ? "" : withoutWord(next);
}

}  // namespace

MessagePacker::MessagePacker() : context_(ZSTD_createCCtx()) {}

MessagePacker::~MessagePacker() {
  ZSTD_freeCCtx(context_);
}

Result<PackedMessage> MessagePacker::pack(v1::Batch& batch) {
  v1::Batch look;
  look.set_looked_at(batch.looked_at());
  batch.clear_looked_at();
  batch.SerializeToString(&plain_);
  batch.set_looked_at(look.looked_at());
  Result<PackedMessage> packed;
  packed.value.id = messageIdOf(batch, plain_);
  // A field may stand anywhere.
  look.AppendToString(&plain_);
  std::string& message = packed.value.bytes;
  message.resize(kMark.size() + ZSTD_compressBound(plain_.size()));
  message.replace(0, kMark.size(), kMark);
  const std::size_t size = ZSTD_compressCCtx(context_, message.data() + kMark.size(), message.size() - kMark.size(),
                                             plain_.data(), plain_.size(), kCompression);
  if (ZSTD_isError(size) != 0) return {{}, Error{0, std::string("zstd: ") + ZSTD_getErrorName(size)}};
  message.resize(kMark.size() + size);
  return packed;
}

std::string batchFault(const v1::Batch& batch) {
  if (batch.device().size() != kDeviceBytes) return "its device isn't one";
  if (batch.first() < 1 || batch.last() < batch.first() - 1 || batch.last() > kLastId) return "its ids aren't a range";
  for (const int size :
       {batch.events_size(), batch.gaps_size(), batch.kinds_size(), batch.sessions_size(), batch.runs_size()}) {
    if (size > kMostRecords) return "there is too much in it";
  }
  for (const v1::Session& session : batch.sessions()) {
    if (session.run() >= static_cast<std::uint32_t>(batch.runs_size())) return "a session's run isn't in it";
  }
  for (const v1::Event& event : batch.events()) {
    if (event.kind() >= static_cast<std::uint32_t>(batch.kinds_size())) return "an event's kind isn't in it";
    if (event.session() > static_cast<std::uint32_t>(batch.sessions_size())) return "an event's session isn't in it";
  }
  return coverFault(batch);
}

Result<std::unique_ptr<v1::Batch>> unpackMessage(std::string_view message) {
  if (message.size() < kMark.size() || message.substr(0, kNameBytes) != kMark.substr(0, kNameBytes)) {
    return {{}, Error{0, "it isn't a message of a fleet"}};
  }
  if (message[kNameBytes] != kMark[kNameBytes]) {
    const auto version = static_cast<unsigned char>(message[kNameBytes]);
    return {{}, Error{0, "its version is " + std::to_string(version) + ", which isn't known here"}};
  }
  message.remove_prefix(kMark.size());
  const unsigned long long size = ZSTD_getFrameContentSize(message.data(), message.size());
  if (size > kMostBatchBytes) return {{}, Error{0, "its frame is damaged or too large"}};
  std::string plain(static_cast<std::size_t>(size), '\0');
  const std::size_t unpacked = ZSTD_decompress(plain.data(), plain.size(), message.data(), message.size());
  if (ZSTD_isError(unpacked) != 0 || unpacked != plain.size()) return {{}, Error{0, "its frame is damaged"}};
  auto batch = std::make_unique<v1::Batch>();
  if (!batch->ParseFromString(plain)) return {{}, Error{0, "it can't be parsed"}};
  if (std::string fault = batchFault(*batch); !fault.empty()) return {{}, Error{0, std::move(fault)}};
  return {std::move(batch), {}};
}

}  // namespace tarn::fleet
