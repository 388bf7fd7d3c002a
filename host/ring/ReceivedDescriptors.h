// Receives bytes with the descriptors that a client may send beside them. Stateless. Threads: any.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <span>
#include <vector>

#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

// As recv() without waiting. When descriptors came with the bytes they take the place of those in `descriptors`; of
// more than two none is kept.
ssize_t receiveWithDescriptors(int socket, std::span<std::byte> space, std::vector<UniqueDescriptor>& descriptors);

}  // namespace tarn::linux_host
