// SPDX-License-Identifier: Apache-2.0
// Collector: writes messages to the database, a group at a time. What can't be unpacked, or isn't what a database can
// hold, goes to the table of the refused, and holds nothing else up.
//
// Owner: a program with its connection. Threads: one.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "fleet/collect/GroupWriter.h"

namespace tarn::fleet {

// A message as it came. `stream` and `sequence` tell it from all others.
struct CollectedMessage {
  std::string stream;
  std::uint64_t sequence = 0;
  std::string subject;
  std::string_view bytes;
};

// One that nothing could be made of.
struct Refusal {
  std::size_t message = 0;  // its index
  std::string why;
};

struct CollectedGroup {
  WrittenGroup written;
  std::vector<Refusal> refused;
};

class Collector {
 public:
  explicit Collector(Database& database) : database_(database), writer_(database) {}

  // After the connection was opened.
  [[nodiscard]] Status begin() { return writer_.begin(); }
  // When it returns without an error, all of the messages were written or refused, and that is committed. With one the
  // database isn't there or can't, and the same group may be tried again.
  Result<CollectedGroup> write(const std::vector<CollectedMessage>& messages);
  // See GroupWriter.
  Result<int> forgetBefore(const std::string& day) { return writer_.forgetBefore(day); }

 private:
  struct Unpacked {
    std::size_t message = 0;
    std::unique_ptr<v1::Batch> batch;
  };

  [[nodiscard]] Status writeAll(const std::vector<Unpacked>& unpacked, CollectedGroup& group);
  [[nodiscard]] Status writeEach(const std::vector<Unpacked>& unpacked, CollectedGroup& group);
  [[nodiscard]] Status keepRefused(const CollectedMessage& message, const std::string& why);

  Database& database_;
  GroupWriter writer_;
};

}  // namespace tarn::fleet
