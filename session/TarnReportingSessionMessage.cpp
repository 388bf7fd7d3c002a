// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionMessage.h"

#include <algorithm>
#include <cmath>
#include <numeric>

#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSessionKeys.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSessionMessage"};

}  // namespace

TarnReportingSessionMessage::TarnReportingSessionMessage(Copy, const TarnReportingSessionMessage& original)
    : TarnReportingSessionMessage(original.message_, original.category_, original.type_) {
  kLog(LogLevel::Debug, "copyWithZone");
  isRedundant_ = original.isRedundant_;
  isSessionStarted_ = original.isSessionStarted_;
}

const TarnReportingSessionMessage::DestinationWorkers& TarnReportingSessionMessage::destinationWorkers()
    const noexcept {
  static const DestinationWorkers kEveryone;
  return destinationWorkers_ ? *destinationWorkers_ : kEveryone;
}

bool TarnReportingSessionMessage::isAddressedTo(std::string_view workerClass) const noexcept {
  return std::find(destinationWorkers_->begin(), destinationWorkers_->end(), workerClass) != destinationWorkers_->end();
}

void TarnReportingSessionMessage::setDestinationWorkers(DestinationWorkers workers) {
  destinationWorkers_ = workers.empty() ? nullptr : std::make_unique<const DestinationWorkers>(std::move(workers));
}

std::string TarnReportingSessionMessage::description() const {
  std::string text = "category=" + TarnReportingUtilityCategoryString(category_) + " type=";
  text += TarnReportingUtilityTypeString(type_);
  text += ' ';
  plist::appendDescription(text, message_);
  return text;
}

std::shared_ptr<TarnReportingSessionMessage> TarnReportingSessionMessage::copyWithZone() const {
  return std::make_shared<TarnReportingSessionMessage>(Copy{}, *this);
}

double TarnReportingSessionMessage::sortingTime() const noexcept {
  const double time = message_.get(keys::kTimestamp).asDouble();
  return std::isnan(time) ? 0 : time;  // a stamp that is no number would leave no order at all
}

bool TarnReportingSessionMessage::sortMessages(TarnReportingSessionMessages& messages) {
  // Clients nearly always send in time order: look before doing anything, and read each stamp once.
  std::vector<double> times;
  times.reserve(messages.size());
  for (const auto& message : messages) {
    times.push_back(message->sortingTime());
  }
  if (std::is_sorted(times.begin(), times.end())) return false;
  std::vector<std::uint32_t> order(messages.size());
  std::iota(order.begin(), order.end(), 0U);
  std::stable_sort(order.begin(), order.end(),
                   [&](std::uint32_t left, std::uint32_t right) { return times[left] < times[right]; });
  TarnReportingSessionMessages sorted(messages.size());  // all that is needed, before one is moved
  std::transform(order.begin(), order.end(), sorted.begin(),
                 [&](std::uint32_t index) { return std::move(messages[index]); });
  messages.swap(sorted);
  return true;
}

void TarnReportingSessionMessage::lock() const noexcept {
  while (guard_.test_and_set(std::memory_order_acquire)) {
    guard_.wait(true, std::memory_order_relaxed);
  }
}

void TarnReportingSessionMessage::unlock() const noexcept {
  guard_.clear(std::memory_order_release);
  guard_.notify_one();
}

}  // namespace tarn
