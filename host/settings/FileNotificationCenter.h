// FileNotificationCenter: named notifications as files, notifications/NAME: 8 bytes, little-endian, the state word.
//
// One write to the file is one post, by whatever process, this one included; so is another file taking its name. A
// thread of its own watches the folder and hands each registration's handler to its queue. Posts that come while a
// delivery still waits there are delivered with it, so a flood of posts costs one piece of work a registration. When
// the kernel lost count of the changes, every registration is called once. A folder that vanishes is made anew; after
// that every registration is called once as well.
//
// Which problem cancel() solves on the queue: the delivery that already waits there finds its registration cancelled.
//
// Bounds: 1024 registrations. Threads: any; the thread starts with the first registration and ends with the object.
#pragma once

#include <atomic>
#include <cstddef>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "host/system/UniqueDescriptor.h"
#include "platform/Log.h"
#include "platform/NotificationCenter.h"

namespace tarn::linux_host {

class FileNotificationCenter final : public platform::NotificationCenter {
 public:
  static constexpr std::size_t kMaximumRegistrations = 1024;

  // `folder` holds the notifications' files; it is made when it is needed. The log must outlive the center.
  FileNotificationCenter(std::string folder, platform::Log& log);
  FileNotificationCenter(const FileNotificationCenter&) = delete;
  FileNotificationCenter& operator=(const FileNotificationCenter&) = delete;
  ~FileNotificationCenter() override;

  // The status of a failed registration is an errno value: EINVAL for a name that is no plain file name, ENOSPC beyond
  // the bound, else what the kernel said. A post that was made just before may be delivered too.
  Registration registerFor(std::string_view name, std::shared_ptr<platform::WorkQueue> queue, Handler handler) override;
  // Nothing for an unknown token and for a file that is missing, short or unreadable.
  std::optional<std::uint64_t> state(std::int32_t token) const override;
  void cancel(std::int32_t token) override;
  // Writers of a state word take turns, each waiting at most a second. A failure is logged.
  [[nodiscard]] bool post(std::string_view name, std::optional<std::uint64_t> state) override;

  // Sets the word, if given, and posts; empty, or what went wrong. Nothing is logged.
  [[nodiscard]] std::string write(std::string_view name, std::optional<std::uint64_t> state) const;

 private:
  struct Entry {
    Entry(std::string itsName, std::int32_t itsToken, std::shared_ptr<platform::WorkQueue> itsQueue,
          Handler itsHandler);
    const std::string name;
    const std::int32_t token;
    const std::shared_ptr<platform::WorkQueue> queue;
    Handler handler;                   // called on the queue only
    std::atomic<bool> waiting{false};  // a delivery is on the queue
    std::atomic<bool> cancelled{false};
  };

  int startWatching();
  int watchFolder();
  void watch();
  bool readEvents();
  void handleEvent(int watch, std::uint32_t mask, std::string_view name);
  void renewWatch();
  void deliver(std::string_view name);
  void deliverAll();
  static void handOver(const std::vector<std::shared_ptr<Entry>>& entries);

  const std::string folder_;
  platform::Log& log_;
  mutable std::mutex mutex_;
  std::map<std::int32_t, std::shared_ptr<Entry>> entries_;  // guarded by mutex_, as is lastToken_
  std::int32_t lastToken_ = 0;
  UniqueDescriptor events_;  // made before the thread starts, as are stop_ and the first watch_
  UniqueDescriptor stop_;
  int watch_ = -1;      // the thread's own once it runs; negative while the folder can't be watched
  std::thread thread_;  // guarded by mutex_
};

}  // namespace tarn::linux_host
