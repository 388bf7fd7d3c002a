// SPDX-License-Identifier: Apache-2.0
// FlumeFiles: driver report channels in files, one driver each: the plain files "*.json" of a folder (see FlumeFile).
//
// Every reading looks at the folder and the files again, in the order of their names, so drivers may write, replace and
// remove them at any time. A file that can't be read or is broken is one complaint in the log, and the others count.
// A complaint is logged when it is new, not with every reading: sessions come and go by the thousand. What becomes a
// complaint: a file that is no plain one, too large, half-written or wrong (whole or one of its channels), a file that
// held channels and is gone, a channel that an earlier file has too, and what is beyond the bounds. A folder that isn't
// there holds no files and is nothing to complain about.
//
// Pipes, devices and sockets are never opened. Nothing is written.
//
// Owner: the platform; the log outlives it. Threads: the server queue.
#pragma once

#include <cstddef>
#include <deque>
#include <map>
#include <set>
#include <string>

#include "host/drivers/FlumeChannelIndex.h"
#include "host/drivers/FlumeFile.h"
#include "host/drivers/FlumeSource.h"
#include "platform/Log.h"
#include "plist/Result.h"

namespace tarn::linux_host {

// A reading holds the server queue up, so it stays small: it happens at the start and stop of each session, and at most
// 4 MiB are parsed in it.
struct FlumeFilesBounds {
  std::size_t files = 128;                          // those with the first names count
  std::size_t fileBytes = std::size_t{256} << 10U;  // a larger file holds no channels
  std::size_t bytes = std::size_t{4} << 20U;        // of all files; those beyond hold no channels
  std::size_t channels = 4096;                      // of all files; those beyond hold no channels
  FlumeFileBounds file;
};

class FlumeFiles final : public FlumeSource {
 public:
  // `folder` need not be there, now or ever. Nothing is read before read().
  FlumeFiles(std::string folder, platform::Log& log, const FlumeFilesBounds& bounds = {});
  FlumeFiles(const FlumeFiles&) = delete;
  FlumeFiles& operator=(const FlumeFiles&) = delete;

  // The channels of all files that are right, in the order of the files' names and then the file's own; of two known
  // alike the one in the earlier file. Logs the complaints that are new; costs a stat and a read of each file.
  platform::FlumeSamples read() override;

 private:
  // By the file's name, those of files that held channels or a complaint at the last reading; the empty name is the
  // folder.
  using Complaints = std::map<std::string, Status>;

  // What one reading has gathered. The names lie in the channels, which don't move.
  struct Gathered {
    // A deque, because growing doesn't move what is in it.
    std::deque<platform::FlumeChannel> channels;
    std::set<const platform::FlumeChannelName*, FlumeNameOrder> names;
    // Read so far, also of files that turned out wrong.
    std::size_t bytes = 0;
  };

  // Adds the file's channels; an error is the complaint about it, of the file or of a part of it. ENOENT: it is gone.
  Status readFile(const std::string& name, Gathered& gathered) const;
  // All that was read of a file, or nothing where the bound on channels is reached.
  Status takeChannels(Result<platform::FlumeSamples> reading, Gathered& gathered) const;
  // The complaints that the last reading didn't have, or had otherwise.
  void tell(const Complaints& now) const;
  void complain(const std::string& name, const Error& complaint) const;

  const std::string folder_;
  platform::Log& log_;
  const FlumeFilesBounds bounds_;
  Complaints last_;
};

}  // namespace tarn::linux_host
