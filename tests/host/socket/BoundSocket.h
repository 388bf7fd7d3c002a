// A socket that listens at a path: claimed and opened to clients in one step, as the service does in two.
#pragma once

#include <string>

#include "host/socket/ListenSocket.h"

namespace tarn::testing {

inline linux_host::ListenSocket::Result bindTo(const std::string& path,
                                               mode_t mode = linux_host::ListenSocket::kDefaultMode) {
  linux_host::ListenSocket::Result result = linux_host::ListenSocket::claim(path);
  if (result.error.empty()) {
    result.error = result.socket.listen(mode);
  }
  if (!result.error.empty()) {
    result.socket = linux_host::ListenSocket();
  }
  return result;
}

}  // namespace tarn::testing
