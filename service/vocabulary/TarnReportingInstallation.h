// What one installation of the facilities owns: the answers that are asked for once and kept while it lasts. For the
// sources of this library alone.
#pragma once

#include <memory>
#include <mutex>

namespace tarn {

namespace platform {
struct Facilities;
class WorkQueue;
}  // namespace platform

namespace detail {

struct Installation {
  explicit Installation(const platform::Facilities& installed) : facilities(installed) {}

  const platform::Facilities& facilities;
  std::once_flag internalBuildOnce;
  bool internalBuild = false;
  std::once_flag serverQueueOnce;
  std::shared_ptr<platform::WorkQueue> serverQueue;
};

// The installation that stands; ends the process when there is none.
Installation& currentInstallation() noexcept;

}  // namespace detail

}  // namespace tarn
