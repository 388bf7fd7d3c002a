// SPDX-License-Identifier: Apache-2.0
// NotificationCenter: named system notifications, each with a 64-bit state word. Threads: the server queue's; post()
// any.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

#include "platform/UniqueFunction.h"

namespace tarn::platform {

class WorkQueue;

// Owned by the platform. Names are shared by all processes of the device, and so is each name's state word, which stays
// when nobody is registered. A notification carries nothing else: it says that something changed.
class NotificationCenter {
 public:
  // The status of a registration that worked; other numbers are the platform's.
  static constexpr std::int32_t kStatusOk = 0;

  // What registerFor() answers.
  struct Registration {
    std::int32_t status = kStatusOk;  // kStatusOk or what went wrong
    std::int32_t token = -1;          // names the registration; -1 when it failed
  };
  // Gets the token of its registration.
  using Handler = UniqueFunction<void(std::int32_t token)>;

  virtual ~NotificationCenter() = default;
  // Calls `handler` on `queue` for every post of `name` from now on, by whatever process, this one included. Posts that
  // come close together may be delivered as one. No call begins after cancel() when cancel() is called on `queue`. A
  // name that the platform can't have, and one registration too many, fail with a status of the platform's.
  virtual Registration registerFor(std::string_view name, std::shared_ptr<WorkQueue> queue, Handler handler) = 0;
  // The state word of the token's notification as it is now; nothing for an unknown token or when it can't be read.
  virtual std::optional<std::uint64_t> state(std::int32_t token) const = 0;
  // Ends the registration. An unknown token is ignored.
  virtual void cancel(std::int32_t token) = 0;
  // Posts the notification, with its state word set first when one is given, else as it is. Whether that worked; why
  // not stands in the platform's log.
  [[nodiscard]] virtual bool post(std::string_view name, std::optional<std::uint64_t> state) = 0;
};

}  // namespace tarn::platform
