// SPDX-License-Identifier: Apache-2.0
// FileNotificationCenter: the notifications of a NotificationFolder, watched by the main loop.
//
// One write to a file is one post, by whatever process, this one included; so is another file taking its name. Each
// registration's handler is handed to its queue. Posts that come while a delivery still waits there are delivered with
// it, so a flood of posts costs one piece of work a registration. When the kernel lost count of the changes, every
// registration is called once. A folder that vanishes is made again; after that every registration is called once as
// well.
//
// Which problem cancel() solves on the queue: the delivery that already waits there finds its registration cancelled.
//
// Owner: the platform, and the loop while it watches. Bounds: 1024 registrations. Threads: post() any; the rest the
// main loop's, or before it runs, and the queues of registrations are served there.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <string_view>

#include "host/loop/MainLoop.h"
#include "host/settings/NotificationFolder.h"
#include "host/system/UniqueDescriptor.h"
#include "platform/Log.h"
#include "platform/NotificationCenter.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class FileNotificationCenter final : public platform::NotificationCenter,
                                     public EventHandler,
                                     public std::enable_shared_from_this<FileNotificationCenter> {
 public:
  // Far more than the workers make; a bound for one that registers on and on, as each post is compared with every name.
  static constexpr std::size_t kMaximumRegistrations = 1024;

  // Loop and log outlive the center. Neither folder nor descriptor is made before the first registration.
  FileNotificationCenter(std::string folder, MainLoop& loop, platform::Log& log);
  FileNotificationCenter(const FileNotificationCenter&) = delete;
  FileNotificationCenter& operator=(const FileNotificationCenter&) = delete;
  ~FileNotificationCenter() override = default;

  // The status of a failed registration is an errno value: EINVAL for a name that is no plain file name, ENOSPC beyond
  // the bound, else what the kernel said; the token is -1 then, and the next registration tries again to watch the
  // folder. A post that was made just before may be delivered too. `queue` is held as long as the registration or a
  // delivery on it.
  Registration registerFor(std::string_view name, std::shared_ptr<platform::WorkQueue> queue, Handler handler) override;
  // The word as it stands now, which may be newer than the post that is being delivered. Nothing for an unknown token
  // and for a file that is missing, short or unreadable.
  std::optional<std::uint64_t> state(std::int32_t token) const override;
  // An unknown token does nothing. The file and its word stay.
  void cancel(std::int32_t token) override;
  // Waits for other writers of the word, at most a second. A failure is logged with its reason and is false.
  [[nodiscard]] bool post(std::string_view name, std::optional<std::uint64_t> state) override;

  // The loop's call: one read of changes (16 KiB) and a delivery for each.
  void handleEvents(std::uint32_t events) override;

 private:
  // One registration. Shared with its delivery, which may outlive it on the queue.
  struct Entry {
    const std::string name;
    const std::int32_t token;
    const std::shared_ptr<platform::WorkQueue> queue;
    Handler handler;
    bool waiting = false;  // a delivery is on the queue
    bool cancelled = false;
  };

  // The kernel's watch and the loop's, once; before there is a registration neither is paid for.
  Status startWatching();
  // Makes the folder where it is missing and watches it; after an error watch_ is negative.
  Status watchFolder();
  // One change as the kernel told it: a post, the folder's end, or the word that changes were lost.
  void handleEvent(int watch, std::uint32_t mask, std::string_view name);
  // Also by itself each second until it succeeds, as whoever took the folder away may have taken its parent too.
  void renewWatch();
  // Of a name that nobody registered nothing happens.
  void deliver(std::string_view name);
  void deliverAll();
  // Puts a delivery on the entry's queue unless one waits there.
  static void handOver(const std::shared_ptr<Entry>& entry);

  const NotificationFolder folder_;
  MainLoop& loop_;
  platform::Log& log_;
  // By token; tokens are never given twice.
  std::map<std::int32_t, std::shared_ptr<Entry>> entries_;
  std::int32_t lastToken_ = 0;
  // The kernel's queue of changes, from the first registration on.
  UniqueDescriptor events_;
  bool watched_ = false;  // the loop watches events_: from the first registration on
  int watch_ = -1;        // negative while the folder can't be watched
};

}  // namespace tarn::linux_host
