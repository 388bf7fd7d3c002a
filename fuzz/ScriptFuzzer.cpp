// SPDX-License-Identifier: Apache-2.0
// Scripts come from people and programs: no line may do more than be refused, and every step that comes out of one has
// what its operation needs.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>
#include <variant>

#include "tools/script/ScriptParser.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
  using namespace tarn::script;
  std::string_view rest(reinterpret_cast<const char*>(bytes), size);
  for (std::size_t line = 1; !rest.empty(); ++line) {
    const std::size_t end = std::min(rest.find('\n'), rest.size());
    const std::string_view text = rest.substr(0, end);
    rest.remove_prefix(std::min(end + 1, rest.size()));
    if (isBlank(text)) continue;
    const auto [step, error] = parseLine(text, line);
    const bool isSane = error.failed()
                            ? !error->text.empty()
                            : step.line == line && !step.op.empty() && !step.client.empty() && step.seconds >= 0;
    if (!isSane) {
      std::abort();
    }
  }
  return 0;
}
