// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionMessage.h"

#include <utility>

#include "service/vocabulary/TarnReportingVocabulary.h"
#include "tools/ctl/sessions/SessionEvents.h"

namespace tarn::ctl {

namespace {

constexpr std::string_view kEventPrefix = "sys.oxbow.";

// "Playback.Start" of "sys.oxbow.tarnkit.Playback.Start"; empty for what is named otherwise.
std::string_view kindOf(std::string_view name) {
  if (!name.starts_with(kEventPrefix)) return {};
  const std::size_t source = name.find('.', kEventPrefix.size());
  const bool hasType = source != std::string_view::npos && name.rfind('.') != source;
  return hasType ? name.substr(source + 1) : std::string_view();
}

}  // namespace

std::optional<SessionMessage> messageOf(const recorder::EventRow& row) {
  const std::string_view kind = row.backend == "tally" ? kindOf(row.name) : std::string_view();
  const auto read = kind.empty() ? std::nullopt : report::Message::from(kind, row.time, row.payload);
  if (!read) return std::nullopt;
  SessionMessage message;
  message.event = row.id;
  message.handedOver = row.time;
  message.stamp = read->stamp().value_or(row.time);
  message.category = read->category();
  message.type = read->type();
  message.payload = read->fields();
  message.meaning = read->kind();
  message.isDerived = read->isDerived();
  return message;
}

Result<std::vector<SessionMessage>> messagesOf(const std::filesystem::path& file, std::int64_t session,
                                               const std::vector<recorder::PeriodRow>& periods,
                                               const ProgressHandler& progress) {
  Result<std::vector<SessionMessage>> found;
  MessageSieve sieve;
  EventProgress told(periods, progress);
  found.error = eachEvent(file, session, 0, [&](recorder::EventRow&& row) {
    told.at(row.id);
    auto message = sieve.letsThrough(row) ? messageOf(row) : std::nullopt;
    if (message) {
      found.value.push_back(std::move(*message));
    }
    return true;
  });
  return found;
}

std::optional<std::uint32_t> categoryNumber(std::string_view name) {
  constexpr std::uint32_t kNoDomain = 0;
  constexpr std::uint32_t kUnknownDomain = 0x00010000;
  constexpr auto kLast = static_cast<std::uint32_t>(AudioEventCategory::Tessels);
  for (const std::uint32_t domain : {kNoDomain, static_cast<std::uint32_t>(AudioEventCategory::DomainMIDI),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainSession),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainDSP),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainHAL),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainRouting),
                                     static_cast<std::uint32_t>(AudioEventCategory::DomainToolbox), kUnknownDomain}) {
    for (std::uint32_t low = 0; low <= kLast; ++low) {
      if (TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(domain | low)) == name) {
        return domain | low;
      }
    }
  }
  return std::nullopt;
}

std::optional<std::uint16_t> typeNumber(std::string_view name) {
  if (name == TarnReportingUtilityTypeString(AudioEventType::Unknown)) {
    return static_cast<std::uint16_t>(AudioEventType::Unknown);
  }
  for (std::uint16_t number = 0; number <= static_cast<std::uint16_t>(AudioEventType::MemoryLog); ++number) {
    if (TarnReportingUtilityTypeString(static_cast<AudioEventType>(number)) == name) return number;
  }
  return std::nullopt;
}

}  // namespace tarn::ctl
