// SPDX-License-Identifier: Apache-2.0
// tarnreporting-pipewire: options, configuration, then the program. docs/pipewire.md is its manual.
#include <pipewire/pipewire.h>

#include <cstdlib>

#include "adapters/pipewire/AdapterStart.h"
#include "adapters/pipewire/Program.h"

int main(int argumentCount, char** arguments) {
  using namespace tarn::streams;
  return startAdapter(Adapter::PipeWire, argumentCount, arguments,
                      [](const AdapterOptions& options, const Rules& rules) {
                        pw_init(nullptr, nullptr);
                        if (std::getenv("PIPEWIRE_DEBUG") == nullptr) {
                          // It warns of modules and ranks that aren't wanted here.
                          pw_log_set_level(SPA_LOG_LEVEL_ERROR);
                        }
                        const int status = Program(options, rules).run();
                        pw_deinit();
                        return status;
                      });
}
