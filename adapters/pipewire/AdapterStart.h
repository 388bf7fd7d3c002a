// SPDX-License-Identifier: Apache-2.0
// What an adapter's program does before its work: options, configuration, signals.
#pragma once

#include <csignal>
#include <functional>

#include "adapters/pipewire/AdapterOptions.h"
#include "adapters/pipewire/core/Rules.h"

namespace tarn::streams {

// Those that end it. They are blocked while it works, for it to take, before any thread is there that they could go to.
sigset_t endSignals();

// `work` with what the command line and the configuration say, or what they ask for instead. The exit status.
int startAdapter(Adapter adapter, int argumentCount, char** arguments,
                 const std::function<int(const AdapterOptions&, const Rules&)>& work);

}  // namespace tarn::streams
