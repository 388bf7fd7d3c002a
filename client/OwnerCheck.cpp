// SPDX-License-Identifier: Apache-2.0
#include "client/OwnerCheck.h"

namespace tarn::client {

OwnerCheck::Use::Use(OwnerCheck& check) noexcept : check_(check) {
  const std::thread::id self = std::this_thread::get_id();
  std::thread::id user{};
  if (check_.user_.compare_exchange_strong(user, self, std::memory_order_acquire)) return;
  outermost_ = false;
  granted_ = user == self;
}

OwnerCheck::Use::~Use() {
  if (outermost_) {
    check_.user_.store(std::thread::id{}, std::memory_order_release);
  }
}

}  // namespace tarn::client
