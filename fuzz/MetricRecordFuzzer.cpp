// SPDX-License-Identifier: Apache-2.0
// Reads bytes as a metric record. Whatever was read must be written, read back and rendered, and be the same record.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "diagnostics/pylon/AudioIssueDetected.h"
#include "diagnostics/pylon/ProtobufText.h"
#include "diagnostics/pylon/TextFields.h"
#include "diagnostics/pylon/WireReader.h"
#include "diagnostics/pylon/WireWriter.h"

namespace {

using namespace pylonmetrics;

void check(bool holds) {
  if (!holds) {
    std::abort();
  }
}

void checkText(const AudioIssueDetected& record) {
  TextFields fields;
  record.formatText(fields, "record");
  check(fields.fields().size() == (record.hasTimestamp() ? 5U : 4U));
  ProtobufText lines;
  record.formatText(lines, "record");
  for (const char character : lines.text()) {
    check(character == '\n' || (character >= ' ' && character <= '~'));
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  WireReader reader(bytes);
  AudioIssueDetected record;
  const bool good = record.readFrom(reader);
  check(reader.position() <= size);
  check(good || reader.failed());

  WireWriter writer;
  record.writeTo(writer);
  WireReader again(writer.bytes());
  AudioIssueDetected copy;
  check(copy.readFrom(again) && again.atEnd());
  check(copy == record && copy.hash_value() == record.hash_value());
  checkText(record);
  return 0;
}
