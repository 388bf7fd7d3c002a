// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/TarnReportingSessionMemoryLogWorker.h"

#include <algorithm>
#include <array>
#include <string>
#include <utility>

#include "diagnostics/TarnReportingMemoryLogLimiter.h"
#include "platform/Clock.h"
#include "platform/CommandRunner.h"
#include "platform/Condition.h"
#include "platform/Facilities.h"
#include "platform/WorkQueue.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

using Worker = TarnReportingSessionMemoryLogWorker;

// These lines are read by programs that look for the tag at their beginning: no module stands before it.
constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, {}};
constexpr std::string_view kTag = "wiredlog:";
constexpr std::size_t kLineBytes = 2047;
constexpr std::size_t kBlockBytes = 512;
// What a log entry holds beside its head.
constexpr std::size_t kEntryBytes = kTarnReportingMostLogBytes - 64;

bool holds(std::string_view line, std::string_view part) {
  return line.find(part) != std::string_view::npos;
}

// Of the resources of each task those that tell about memory and time, without the tasks that wire nothing.
bool isResourceLine(std::string_view line) {
  if (holds(line, " wired_mem ")) return !holds(line, "wired_mem          0           0           0        none");
  constexpr std::array<std::string_view, 4> kWanted{" cpu_time ", " phys_mem ", " phys_footprint ", "RESOURCE"};
  return std::any_of(kWanted.begin(), kWanted.end(), [line](std::string_view part) { return holds(line, part); });
}

struct Tool {
  std::string_view command;
  std::string_view queueName;
  bool (*keeps)(std::string_view line);
};

constexpr Tool kResources{"/usr/local/bin/restop", "sys.oxbow.tarnkit.reporting.memorylog.resources", isResourceLine};
constexpr Tool kZones{"/usr/bin/zonetally -l", "sys.oxbow.tarnkit.reporting.memorylog.zones",
                      [](std::string_view) { return true; }};

struct Output {
  std::string kept;
  bool none = true;  // nothing was read
  bool cut = false;  // there was more
};

Output readOutput(platform::RunningCommand& running, const Tool& tool) {
  Output output;
  std::size_t bytesRead = 0;
  while (const auto line = running.readLine(kLineBytes)) {
    if (bytesRead >= Worker::kMostBytesRead || output.kept.size() >= Worker::kMostBytesKept) {
      output.cut = true;
      break;
    }
    bytesRead += line->size();
    output.none = false;
    if (tool.keeps(*line)) {
      output.kept.append(kTag).append(1, ' ').append(*line);
    }
  }
  return output;
}

// The shell starts whether or not there is such a tool, and tells by its exit status that there is none.
bool wasNotExecuted(const platform::CommandEnd& end) {
  return end.kind == platform::CommandEnd::Kind::Exited &&
         (end.status == platform::CommandEnd::kNotExecutable || end.status == platform::CommandEnd::kNotFound);
}

// Runs the tool to its end; what it printed, as far as it is wanted.
std::string runTool(const Tool& tool) {
  kLog(LogLevel::Error, "%s requesting '%s'", kTag, tool.command);
  const auto started = TarnReportingFacilities().commandRunner.start(tool.command, Worker::kToolTimeLimit);
  if (started.failed()) {
    kLog(LogLevel::Error, "%s unable to execute '%s'", kTag, tool.command);
    return {};
  }
  Output output = readOutput(*started.value, tool);
  const platform::CommandEnd end = started.value->close();
  if (output.none && wasNotExecuted(end)) {
    kLog(LogLevel::Error, "%s unable to execute '%s'", kTag, tool.command);
    return {};
  }
  if (output.cut) {
    kLog(LogLevel::Error, "%s output of '%s' cut", kTag, tool.command);
  }
  kLog(LogLevel::Error, "%s request %s captured", kTag, tool.command);
  return std::move(output.kept);
}

// A tool on its way, shared by its thread and the one that waits.
struct ToolRun {
  const std::shared_ptr<platform::Condition> condition = TarnReportingFacilities().conditions.makeCondition();
  bool finished = false;  // guarded by the condition
  std::string text;       // the tool's until then
};

std::shared_ptr<ToolRun> startTool(const Tool& tool) {
  auto run = std::make_shared<ToolRun>();
  TarnReportingFacilities()
      .workQueues.makeSerialQueue(tool.queueName, platform::QualityOfService::UserInitiated)
      ->async([run, &tool] {
        run->text = runTool(tool);
        TarnReportingUtilitySignal(*run->condition, run->finished);
      });
  return run;
}

// Waits until `deadline` on the monotonic clock.
std::string textOf(ToolRun& run, const Tool& tool, std::chrono::nanoseconds deadline) {
  if (!TarnReportingUtilityWait(*run.condition, deadline - TarnReportingFacilities().clock.monotonic(), run.finished)) {
    kLog(LogLevel::Error, "%s gave up waiting for '%s'", kTag, tool.command);
    return {};
  }
  return std::move(run.text);  // the tool's thread is through with it
}

// How long the next block is: it ends with the first line that ends after the least size.
std::size_t blockLength(std::string_view text) {
  const std::size_t newline = text.find('\n', kBlockBytes);
  return newline == std::string_view::npos ? std::min(kBlockBytes, text.size()) : newline + 1;
}

// How much of the block the next entry takes; it doesn't end inside a character, as far as these are characters.
std::size_t pieceLength(std::string_view block) {
  constexpr std::size_t kLongestCharacter = 4;
  std::size_t length = std::min(kEntryBytes, block.size());
  while (length < block.size() && length > kEntryBytes - kLongestCharacter &&
         (static_cast<unsigned char>(block[length]) & 0xC0U) == 0x80U) {
    --length;
  }
  return length;
}

// The log cuts an entry that is too long, so a block that a very long line made goes there in several entries, all
// under the block's number: what stands after their heads is the block.
void logBlock(std::size_t number, std::string_view block) {
  while (!block.empty()) {
    const std::string_view piece = block.substr(0, pieceLength(block));
    kLog(LogLevel::Error, "WIRED LOG BLOCK %zu\n%s", number, piece);
    block.remove_prefix(piece.size());
  }
}

void logInBlocks(std::string_view text) {
  for (std::size_t number = 1; !text.empty(); ++number) {
    const std::size_t length = blockLength(text);
    logBlock(number, text.substr(0, length));
    text.remove_prefix(length);
  }
}

}  // namespace

std::unique_ptr<TarnReportingSessionMemoryLogWorker> TarnReportingSessionMemoryLogWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  if (session->serviceType() != AudioServiceType::Test && !TarnReportingUtilityIsInternalBuild()) return nullptr;
  return std::make_unique<TarnReportingSessionMemoryLogWorker>(session);
}

void TarnReportingSessionMemoryLogWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  if (message->type() != AudioEventType::MemoryLog) return;
  const platform::Clock& clock = TarnReportingFacilities().clock;
  if (!ProcessState::of<TarnReportingMemoryLogLimiter>()->claim(clock.monotonic())) return;
  const auto zones = startTool(kZones);
  const auto resources = startTool(kResources);
  const auto deadline = clock.monotonic() + kPatience;
  logInBlocks(textOf(*zones, kZones, deadline));
  logInBlocks(textOf(*resources, kResources, deadline));
}

}  // namespace tarn
