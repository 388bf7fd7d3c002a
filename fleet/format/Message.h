// SPDX-License-Identifier: Apache-2.0
// Message: a batch of records as the bytes that leave the device, and back again.
//
//   "tnf" 0x01 | zstd frame of a tarn.fleet.v1.Batch (batch.proto)
//
// Whoever reads trusts nothing: what is unpacked is bounded, and a batch whose parts don't fit together is refused.
// Threads: any; a MessagePacker is for one at a time.
#pragma once

#include <batch.pb.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "plist/Result.h"

struct ZSTD_CCtx_s;

namespace tarn::fleet {

inline constexpr std::size_t kDeviceBytes = 16;
// Of a batch before it is packed. A message is less than a server's usual limit of a mebibyte, also where nothing in it
// can be packed.
inline constexpr std::size_t kMostBatchBytes = 900'000;
// Of its records, and of each of the lists in it.
inline constexpr int kMostRecords = 4096;

// A message, and which one it is: device, ids and a hash of what is in it but the time of the look. So it is the same
// whenever it is made again of the same records, and a server that knows messages by this drops one that comes twice.
struct PackedMessage {
  std::string id;
  std::string bytes;
};

class MessagePacker {
 public:
  MessagePacker();
  ~MessagePacker();
  MessagePacker(const MessagePacker&) = delete;
  MessagePacker& operator=(const MessagePacker&) = delete;

  // The message of a batch that batchFault() has nothing against. The error is want of memory.
  // The batch is as before when it returns.
  Result<PackedMessage> pack(v1::Batch& batch);

 private:
  ZSTD_CCtx_s* context_;
  std::string plain_;
};

// What is wrong with a batch, empty when nothing is: every id of its range must be told of once and every index must
// lead to something.
std::string batchFault(const v1::Batch& batch);
// The batch of a message. The error says what is wrong with the bytes.
Result<std::unique_ptr<v1::Batch>> unpackMessage(std::string_view message);

}  // namespace tarn::fleet
