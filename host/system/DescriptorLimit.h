// The process's limit of open descriptors.
#pragma once

#include <cstddef>

namespace tarn::linux_host {

// Raises the limit as far as the system lets it and returns it. Called once, at the start.
std::size_t raiseDescriptorLimit() noexcept;

// How many connections the limit leaves room for, the rest of the process (database, log, settings) considered.
std::size_t connectionsWithin(std::size_t descriptorLimit) noexcept;

}  // namespace tarn::linux_host
