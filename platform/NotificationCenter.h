// NotificationCenter: named system notifications, each with a 64-bit state word. Threads: the queue's, but post() any.
// server queue's.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

#include "platform/UniqueFunction.h"

namespace tarn::platform {

class WorkQueue;

class NotificationCenter {
 public:
  static constexpr std::int32_t kStatusOk = 0;

  struct Registration {
    std::int32_t status = kStatusOk;  // kStatusOk or what went wrong
    std::int32_t token = -1;          // names the registration; -1 when it failed
  };
  using Handler = UniqueFunction<void(std::int32_t token)>;

  virtual ~NotificationCenter() = default;
  // Calls `handler` on `queue` for every post of `name` from now on. Posts that come close together may be delivered as
  // one. No call begins after cancel() when cancel() is called on `queue`.
  virtual Registration registerFor(std::string_view name, std::shared_ptr<WorkQueue> queue, Handler handler) = 0;
  // The state word of the token's notification; nothing when it can't be read.
  virtual std::optional<std::uint64_t> state(std::int32_t token) const = 0;
  // Ends the registration. An unknown token is ignored.
  virtual void cancel(std::int32_t token) = 0;
  // Posts the notification, with its state word set first when one is given. Whether that worked.
  [[nodiscard]] virtual bool post(std::string_view name, std::optional<std::uint64_t> state) = 0;
};

}  // namespace tarn::platform
