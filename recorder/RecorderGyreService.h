// SPDX-License-Identifier: Apache-2.0
// RecorderGyreService: the stack-sampling service as the recorder stands in for it: requests are recorded under
// back-end "gyre", and no stack is sampled. The message copy is the payload; who asked, why and with which options is
// the detail.
//
// Owner: the platform. Threads: the server queue.
#pragma once

#include "platform/Clock.h"
#include "platform/GyreService.h"

namespace tarn::recorder {

class Recorder;

class RecorderGyreService : public platform::GyreService {
 public:
  // Both outlive this.
  RecorderGyreService(Recorder& recorder, const platform::Clock& clock) : recorder_(recorder), clock_(clock) {}

  // Recorded at once; there is no reply, and nothing fails.
  void requestGyre(const platform::GyreRequest& request) override;

 private:
  Recorder& recorder_;
  const platform::Clock& clock_;
};

}  // namespace tarn::recorder
