// SPDX-License-Identifier: Apache-2.0
// FakeNotificationCenter: named notifications in memory, delivered on the queues that were given.
//
// A name has no state word until one is set or it is posted (a post without a word makes it 0); reading one that isn't
// there fails. Every post is delivered by itself. Threads: any.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/NotificationCenter.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

class FakeNotificationCenter final : public platform::NotificationCenter, public Recorded {
 public:
  struct Posted {
    std::string name;
    std::optional<std::uint64_t> state;  // as the poster gave it
    friend bool operator==(const Posted&, const Posted&) = default;
  };

  FakeNotificationCenter();
  ~FakeNotificationCenter() override;
  FakeNotificationCenter(const FakeNotificationCenter&) = delete;
  FakeNotificationCenter& operator=(const FakeNotificationCenter&) = delete;

  // The interface.
  Registration registerFor(std::string_view name, std::shared_ptr<platform::WorkQueue> queue, Handler handler) override;
  std::optional<std::uint64_t> state(std::int32_t token) const override;
  void cancel(std::int32_t token) override;
  [[nodiscard]] bool post(std::string_view name, std::optional<std::uint64_t> state) override;

  // Controls.
  // The next registration fails with this status.
  void failNextRegistration(std::int32_t status);
  // While true, no state word can be read.
  void failReads(bool fail);
  // While true, posts are refused.
  void failPosts(bool fail);
  // Sets a state word without posting.
  void setState(std::string_view name, std::uint64_t state);

  // Observations.
  // The token of the first registration for `name` that is not cancelled; nothing when there is none.
  std::optional<std::int32_t> tokenFor(std::string_view name) const;
  // The names of the registrations that are not cancelled, in order.
  std::vector<std::string> registeredNames() const;
  std::vector<std::int32_t> cancelledTokens() const;
  std::vector<Posted> posted() const;

 private:
  struct Listening;

  mutable std::mutex mutex_;  // guards all below
  std::map<std::int32_t, std::shared_ptr<Listening>> listening_;
  std::map<std::string, std::uint64_t, std::less<>> states_;
  std::int32_t nextToken_ = 1;
  std::optional<std::int32_t> failNextRegistration_;
  bool readsFail_ = false;
  bool postsFail_ = false;
  std::vector<std::int32_t> cancelled_;
  std::vector<Posted> posted_;
};

}  // namespace tarn::testing
