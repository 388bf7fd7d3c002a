#include "client/OwnerCheck.h"

#include <cstdio>
#include <cstdlib>

namespace tarn::client {

OwnerCheck::Use::Use(OwnerCheck& check) noexcept : check_(check), outermost_(true) {
  const std::thread::id self = std::this_thread::get_id();
  std::thread::id user{};
  if (check_.user_.compare_exchange_strong(user, self, std::memory_order_acquire)) return;
  outermost_ = false;
  if (user != self) {
    std::fputs("TarnReportingClient: used by two threads at the same time\n", stderr);
    std::abort();
  }
}

OwnerCheck::Use::~Use() {
  if (outermost_) {
    check_.user_.store(std::thread::id{}, std::memory_order_release);
  }
}

void OwnerCheck::failInsideHandler(const char* operation) noexcept {
  std::fprintf(stderr, "TarnReportingClient: %s inside a reply handler\n", operation);
  std::abort();
}

}  // namespace tarn::client
