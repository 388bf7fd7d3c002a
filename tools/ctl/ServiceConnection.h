// ServiceConnection: one request to the service and its answer, for the commands that need no more.
#pragma once

#include <optional>
#include <string>

#include "client/ClientConnection.h"

namespace tarn::ctl {

struct Answer {
  client::Reply reply;
  int status = 0;  // success, or the exit status to end with; what went wrong was said on stderr
};

// Connects, asks and waits for the answer.
Answer askService(const std::string& socketPath, const client::Request& request);

}  // namespace tarn::ctl
