// SPDX-License-Identifier: Apache-2.0
// Receives bytes with the descriptors that a client may send beside them. Stateless. Threads: any; one socket one at a
// time.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <span>
#include <vector>

#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

// As recv() without waiting: the bytes, 0 at the peer's end, -1 with errno (EAGAIN when there is nothing). When
// descriptors came with the bytes they take the place of those in `descriptors`, which are closed; of more than two
// none is kept, as no request takes more. They are close-on-exec, and of a kind that nobody has checked. Costs no more
// than recv() where there are none.
ssize_t receiveWithDescriptors(int socket, std::span<std::byte> space, std::vector<UniqueDescriptor>& descriptors);

}  // namespace tarn::linux_host
