// SPDX-License-Identifier: Apache-2.0
// SubDeviceBook: what changed of ALSA's open sub-devices from look to look, as events of the StreamBook. A sub-device
// that a process has open is a stream of that process, linked to a device of the sub-device's name.
//
// A look is later than what it finds; the kernel tells when a sub-device was last started, stopped or paused, and so a
// run begins and ends then. Only of a sub-device that was closed nothing is left to read: it ends with the look. One
// that was opened by another process meanwhile is another stream.
//
// What is out of sound (XRUN) still runs, and misses cycles until it is started again. Without a counter of them in the
// kernel's text those between two looks can't be told from a pause. Owned by the program. Threads: one at a time.
#pragma once

#include <map>
#include <string>
#include <vector>

#include "adapters/alsa/AlsaTree.h"
#include "adapters/pipewire/core/StreamBook.h"

namespace tarn::streams {

class SubDeviceBook {
 public:
  explicit SubDeviceBook(StreamBook& book) : book_(book) {}
  SubDeviceBook(const SubDeviceBook&) = delete;
  SubDeviceBook& operator=(const SubDeviceBook&) = delete;

  // All that is open `at` this moment.
  void looked(const std::vector<OpenSubDevice>& open, Moment at);

 private:
  struct Known {
    ObjectId device = 0, stream = 0, link = 0;
    OpenSubDevice last;
    bool runs = false;
    bool isDry = false;  // runs out of sound
  };

  Known& enter(const OpenSubDevice& now, Moment at);
  void leave(const Known& known, Moment at);
  void follow(Known& known, const OpenSubDevice& now, Moment at);
  void followRun(Known& known, const OpenSubDevice& now, Moment since);
  void setState(Known& known, bool runs, Moment at);
  void tellCycle(const Known& known, bool isMet, Moment at);

  StreamBook& book_;
  std::map<std::string, Known> known_;
  ObjectId lastId_ = 0;
};

}  // namespace tarn::streams
