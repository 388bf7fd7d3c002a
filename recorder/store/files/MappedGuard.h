// SPDX-License-Identifier: Apache-2.0
// MappedGuard: keeps the process alive when a file that it has mapped is cut by somebody else.
//
// Which problem: touching a page beyond a file's end is answered with SIGBUS, and SQLite maps the index of its log,
// which any process with the right to write can cut. How: a guarded range gets zeros in place of what isn't there any
// more, and is known to be torn from then on; whoever owns it looks and maps it again. Other SIGBUS go where they went.
//
// SQLite's own mappings are guarded from guardSqlite() on. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tarn::recorder {

class MappedGuard {
 public:
  // Guards a mapping until forget(); false when there are too many (1024). Installs the signal's handler the first
  // time.
  static bool guard(void* memory, std::size_t size) noexcept;
  // Before it is unmapped. Memory that isn't guarded is no fault.
  static void forget(void* memory) noexcept;
  // From now on SQLite's mappings are guarded. Once is enough; safe to repeat.
  static void guardSqlite() noexcept;
  // How many times a guarded page was gone, since the start of the process; whoever remembers it from before knows
  // whether that happened since, to anybody's mapping.
  static std::uint64_t torn() noexcept;
};

}  // namespace tarn::recorder
