// SPDX-License-Identifier: Apache-2.0
// tarnreporting-collect: options, configuration, then what they ask for. docs/fleet.md is its manual.
#include <cstdio>

#include "fleet/collect/CollectOptions.h"
#include "fleet/collect/CollectProgram.h"

namespace {

constexpr int kExitUsage = 64;
constexpr int kExitConfiguration = 78;

int refuse(const tarn::Error& error, int status) {
  std::fprintf(stderr, "tarnreporting-collect: %s\n", error.text.c_str());
  return status;
}

}  // namespace

int main(int argumentCount, char** arguments) {
  using namespace tarn::fleet;
  const CollectCommand command = parseCollectCommand(argumentCount, arguments);
  if (command.usage.failed()) return refuse(*command.usage, kExitUsage);
  if (!command.options) {
    std::fputs(command.output.c_str(), stdout);
    return 0;
  }
  const auto configuration = readCollectConfiguration(*command.options);
  if (configuration.failed()) return refuse(*configuration.error, kExitConfiguration);
  return runCollect(*command.options, configuration.value);
}
