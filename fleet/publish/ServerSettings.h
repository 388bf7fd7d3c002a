// SPDX-License-Identifier: Apache-2.0
// How a program of the fleet comes to its servers. Plain data.
#pragma once

#include <cstdint>
#include <string>

namespace tarn::fleet {

struct ServerSettings {
  std::string urls = "nats://127.0.0.1:4222";  // several with commas
  std::string subject = "tarnreporting";       // messages of a device have this and the device's name
  std::int64_t answerSeconds = 10;             // for an acknowledgement
  std::int64_t longestPauseSeconds = 60;       // after failures, before the next try
  std::string credentialsFile;
  std::string authorityFile, certificateFile, keyFile;  // of TLS
};

}  // namespace tarn::fleet
