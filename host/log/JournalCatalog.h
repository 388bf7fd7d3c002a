// SPDX-License-Identifier: Apache-2.0
// JournalCatalog: the conditions that a person acts on, with the MESSAGE_ID that the journal keeps with their entries
// and what `journalctl --catalog` says of them. packaging/systemd/tarnreporting.catalog is made of this table.
//
// An identifier never changes and is never used for something else. Stateless. Threads: any.
#pragma once

#include <span>
#include <string>
#include <string_view>

#include "platform/LogCondition.h"

namespace tarn::linux_host {

struct CatalogEntry {
  platform::LogCondition condition;
  std::string_view messageId;  // 128 bits, as 32 hexadecimal digits
  std::string_view subject;
  std::string_view text;  // what it means and what to do, in lines
};

// Each condition but None once.
std::span<const CatalogEntry> journalCatalog() noexcept;
// Empty for None.
std::string_view messageIdOf(platform::LogCondition condition) noexcept;
// As the journal reads its catalogues.
std::string catalogText();

}  // namespace tarn::linux_host
