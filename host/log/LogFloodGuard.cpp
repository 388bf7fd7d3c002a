// SPDX-License-Identifier: Apache-2.0
#include "host/log/LogFloodGuard.h"

#include <exception>

#include "host/log/PrefixedLog.h"
#include "host/system/ProcessExecutable.h"

namespace tarn::linux_host {

namespace {

constexpr std::int32_t kManyProcesses = -1;

}  // namespace

std::string describe(const LogClient& client) {
  return "connection " + std::to_string(client.connection) + " of process " + std::to_string(client.process) +
         ", uid " + std::to_string(client.user) + ", " + executableOf(client.process);
}

std::size_t LogFloodGuard::PlaceHash::operator()(const Place& place) const noexcept {
  const std::uint64_t numbers =
      (std::uint64_t{static_cast<std::uint32_t>(place.process)} << 32U) | static_cast<std::uint32_t>(place.line);
  return std::hash<const char*>()(place.module) ^ (std::hash<std::uint64_t>()(numbers * 0x9E3779B97F4A7C15U));
}

LogFloodGuard::LogFloodGuard(platform::Log& next, const platform::Clock& clock) : next_(next), clock_(clock) {
  setThreshold(next.threshold());
}

void LogFloodGuard::write(const platform::LogEntry& entry) noexcept {
  const LogClient client = LogClientScope::current();
  bool admitted = true;
  if (client.connection != 0 && entry.level >= platform::LogLevel::Default) {
    try {
      const MutexLock lock(mutex_);
      admitted = admit(entry, client);
    } catch (const std::exception&) {  // no memory to remember it
    }
  }
  if (admitted) {
    next_.write(entry);
  }
}

void LogFloodGuard::tellCounts() noexcept {
  try {
    const MutexLock lock(mutex_);
    const auto now = clock_.monotonic();
    for (auto& [place, kind] : kinds_) {
      endWindow(kind, now);
    }
  } catch (const std::exception&) {  // no memory for a line
  }
}

bool LogFloodGuard::admit(const platform::LogEntry& entry, const LogClient& client) {
  const auto now = clock_.monotonic();
  endWindows(now);
  Kind& kind = kindOf(entry, client, now);
  if (now - kind.begin >= kWindow) {
    endWindow(kind, now);
  }
  ++kind.lines;
  if (!kind.flooding && kind.lines <= kMostLines) return true;
  if (kind.leftOut++ == 0 && !kind.flooding) {
    kind.flooding = true;
    kind.who = describe(client);
    tell(kind, "too many lines like the last one from " + kind.who + "; those that follow are counted");
  }
  return false;
}

LogFloodGuard::Kind& LogFloodGuard::kindOf(const platform::LogEntry& entry, const LogClient& client,
                                           std::chrono::nanoseconds now) {
  Place place{entry.module.data(), entry.line, client.process};
  if (kinds_.size() >= kMostKinds && !kinds_.contains(place)) {
    place.process = kManyProcesses;
  }
  return kinds_.try_emplace(place, Kind{entry.category, entry.level, entry.module, entry.line, now}).first->second;
}

void LogFloodGuard::endWindow(Kind& kind, std::chrono::nanoseconds now) {
  if (kind.leftOut != 0) {
    tell(kind, std::to_string(kind.leftOut) + " lines like that from " + kind.who + " were left out");
  }
  kind.flooding = kind.lines > kMostLines;
  kind.begin = now;
  kind.lines = 0;
  kind.leftOut = 0;
}

// Tells what is over, also of clients that are silent by now, and forgets who did nothing since.
void LogFloodGuard::endWindows(std::chrono::nanoseconds now) {
  if (now < nextLook_) return;
  nextLook_ = now + kWindow;
  for (auto kind = kinds_.begin(); kind != kinds_.end();) {
    const bool isOver = now - kind->second.begin >= kWindow;
    if (isOver && kind->second.lines == 0) {
      kind = kinds_.erase(kind);
      continue;
    }
    if (isOver) {
      endWindow(kind->second, now);
    }
    ++kind;
  }
}

void LogFloodGuard::tell(const Kind& kind, const std::string& text) {
  next_.write({kind.category, kind.level, kind.module, kind.line, prefixed(kind.module, text, kind.line)});
}

}  // namespace tarn::linux_host
