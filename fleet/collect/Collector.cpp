// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/Collector.h"

#include <utility>

#include "fleet/collect/CleanText.h"
#include "plist/Hex.h"

namespace tarn::fleet {

namespace {

std::string clean(const std::string& text) {
  std::string made;
  return std::string(cleanText(text, made));
}

void add(const WrittenGroup& written, WrittenGroup& all) {
  all.events += written.events;
  all.records += written.records;
  all.devices.insert(all.devices.end(), written.devices.begin(), written.devices.end());
}

}  // namespace

Status Collector::keepRefused(const CollectedMessage& message, const std::string& why) {
  std::string bytes = "\\x";
  plist::appendHex(bytes, message.bytes);
  return database_
      .ask(
          "INSERT INTO refused(stream, sequence, subject, why, bytes) VALUES($1, $2::bigint, $3, $4, $5::bytea) ON "
          "CONFLICT DO NOTHING",
          {clean(message.stream), std::to_string(message.sequence), clean(message.subject), clean(why), bytes})
      .error;
}

Status Collector::writeEach(const std::vector<Unpacked>& unpacked, CollectedGroup& group) {
  for (const Unpacked& each : unpacked) {
    const Result<WrittenGroup> written = writer_.write({each.batch.get()});
    if (written.failed() && written.error.code() != kFaultOfData) return written.error;
    if (written.failed()) {
      group.refused.push_back({each.message, written.error.text()});
    }
    add(written.value, group.written);
  }
  return {};
}

Status Collector::writeAll(const std::vector<Unpacked>& unpacked, CollectedGroup& group) {
  std::vector<const v1::Batch*> batches;
  for (const Unpacked& each : unpacked) {
    batches.push_back(each.batch.get());
  }
  const Result<WrittenGroup> written = writer_.write(batches);
  // Nothing was written: one by one shows whose fault it is.
  if (written.error.code() == kFaultOfData) return writeEach(unpacked, group);
  add(written.value, group.written);
  return written.error;
}

Result<CollectedGroup> Collector::write(const std::vector<CollectedMessage>& messages) {
  Result<CollectedGroup> group;
  std::vector<Unpacked> unpacked;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    auto batch = unpackMessage(messages[i].bytes);
    if (batch.failed()) {
      group.value.refused.push_back({i, batch.error.text()});
    } else {
      unpacked.push_back({i, std::move(batch.value)});
    }
  }
  if (!unpacked.empty()) {
    group.error = writeAll(unpacked, group.value);
  }
  for (const Refusal& refusal : group.value.refused) {
    if (group.failed()) return group;
    group.error = keepRefused(messages[refusal.message], refusal.why);
  }
  return group;
}

}  // namespace tarn::fleet
