#include "recorder/store/EventBatch.h"

#include <utility>

namespace tarn::recorder {

std::size_t EventBatch::add(std::string_view backend, std::string_view name, plist::Dictionary payload,
                            plist::Dictionary detail, double time) {
  std::size_t bytes = sizeof(Event) + name.size();
  if (events_.empty() || !events_.back().payload.sharesStorageWith(payload)) {
    bytes += payload.storageBytes();
  }
  if (!detail.empty()) {
    bytes += detail.storageBytes();
  }
  events_.push_back(Event{backend, time, names_.size(), name.size(), bytes, std::move(payload), std::move(detail)});
  names_.append(name);
  bytes_ += bytes;
  return bytes;
}

void EventBatch::clear() noexcept {
  events_.clear();
  names_.clear();
  bytes_ = 0;
}

void EventBatch::swap(EventBatch& other) noexcept {
  events_.swap(other.events_);
  names_.swap(other.names_);
  std::swap(bytes_, other.bytes_);
}

}  // namespace tarn::recorder
