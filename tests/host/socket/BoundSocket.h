// SPDX-License-Identifier: Apache-2.0
// A socket that listens at a path: claimed and opened to clients in one step, as the service does in two.
#pragma once

#include <string>

#include "host/socket/ListenSocket.h"

namespace tarn::testing {

inline Result<linux_host::ListenSocket> bindTo(const std::string& path,
                                               mode_t mode = linux_host::ListenSocket::kDefaultMode) {
  Result<linux_host::ListenSocket> result = linux_host::ListenSocket::claim(path);
  if (result.ok()) {
    result.error = result.value.listen(mode);
  }
  if (result.failed()) {
    result.value = linux_host::ListenSocket();
  }
  return result;
}

}  // namespace tarn::testing
