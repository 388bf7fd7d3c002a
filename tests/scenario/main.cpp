// SPDX-License-Identifier: Apache-2.0
// tarnreportingscenario: plays scripts against a fresh service through client processes of their own and compares what
// arrived with what stands beside the scripts. Exit status 0 only when all of it arrived, in order, and nothing else.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <stdexcept>

#include "tests/scenario/Comparison.h"
#include "tests/scenario/PassReport.h"
#include "tests/scenario/ScriptPlayer.h"
#include "tests/scenario/Update.h"

namespace tarn::scenario {

namespace {

constexpr double kPatienceSeconds = 30;
// Some back-ends get their events from queues of their own, after the clients have gone.
constexpr double kLateEventsSeconds = 5;
constexpr double kSettlingSeconds = 2;
constexpr int kWrongUsage = 64;

struct Options {
  Service service;
  std::vector<std::string> together;
  std::vector<std::string> then;
  std::string directory;
  std::string title = "scenario";
  std::string details;
  bool update = false;
};

double epochSeconds() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

std::vector<std::string> scriptsOf(const Options& options) {
  std::vector<std::string> scripts = options.together;
  scripts.insert(scripts.end(), options.then.begin(), options.then.end());
  return scripts;
}

template <class Item>
void append(std::vector<Item>& items, const std::vector<Item>& more) {
  items.insert(items.end(), more.begin(), more.end());
}

// By the recorder, as replies and files aren't.
bool isRecorded(const ExpectedEvent& event) {
  return event.backend != kReplies && event.backend != kSummaryFiles;
}

void printDifferences(const std::vector<std::string>& differences) {
  constexpr std::size_t kMostShown = 40;
  for (std::size_t index = 0; index < differences.size() && index < kMostShown; ++index) {
    std::fprintf(stderr, "scenario: %s\n", differences[index].c_str());
  }
  if (differences.size() > kMostShown) {
    std::fprintf(stderr, "scenario: and %zu more\n", differences.size() - kMostShown);
  }
}

std::string summaryOf(const Options& options, bool succeeded, std::size_t differences, std::size_t events,
                      const Playing& playing) {
  char seconds[32];
  std::snprintf(seconds, sizeof seconds, "%.1f", playing.endedAt - playing.startedAt);
  const std::size_t clients = scriptsOf(options).size();
  return options.title + ": " + std::to_string(clients) + (clients == 1 ? " client, " : " clients, ") +
         std::to_string(events) + " events in " + seconds + " s, " +
         (succeeded ? "each as expected" : "NOT as expected: " + std::to_string(differences) + " differences");
}

int check(const Options& options) {
  std::vector<ExpectedEvent> expected;
  std::size_t messages = 0;
  ScriptPlayer player(options.service, options.directory);
  for (const std::string& script : scriptsOf(options)) {
    append(expected, readExpectations(script));
    messages += player.messagesOf(script);
  }
  ServiceWatch service(options.service.socket, kPatienceSeconds);
  Playing playing{epochSeconds(), 0};
  bool succeeded = player.play(options.together);
  for (const std::string& script : options.then) {
    service.ledgerAtRest(kPatienceSeconds);
    succeeded = player.play({script}) && succeeded;
  }
  service.ledgerAtRest(kPatienceSeconds);
  const auto awaited = std::count_if(expected.begin(), expected.end(), isRecorded);
  const json ledger = service.ledgerAtRest(kLateEventsSeconds, static_cast<std::size_t>(awaited));
  playing.endedAt = epochSeconds();

  std::vector<RecordedEvent> events = recordedEvents(options.service.stateDirectory);
  const std::size_t recorded = events.size();
  append(events, summaryFiles(options.service.stateDirectory));
  for (const std::string& script : scriptsOf(options)) {
    append(events, player.replies(script));
  }
  events = withoutDirectory(std::move(events), options.directory);
  Comparison comparison(expected, playing);
  comparison.compare(events);
  comparison.compareLedger(ledger, messages, recorded);
  const auto& differences = comparison.differences();
  succeeded = succeeded && differences.empty();
  const std::string summary = summaryOf(options, succeeded, differences.size(), recorded, playing);
  if (!options.details.empty()) {
    writeDetails(options.details, summary, differences, events, comparison.matches());
  }
  printDifferences(differences);
  printPassReport(summary, events);
  return succeeded ? EXIT_SUCCESS : EXIT_FAILURE;
}

// Plays the scripts one after the other, so that all that arrives meanwhile is the script's.
int update(const Options& options) {
  ScriptPlayer player(options.service, options.directory);
  ServiceWatch service(options.service.socket, kPatienceSeconds);
  std::int64_t lastEvent = 0;
  std::vector<RecordedEvent> earlierFiles;
  bool succeeded = true;
  for (const std::string& script : scriptsOf(options)) {
    Playing playing{epochSeconds(), 0};
    succeeded = player.play({script}) && succeeded;
    service.ledgerAtRest(kPatienceSeconds);
    service.ledgerAtRest(kSettlingSeconds, SIZE_MAX);
    playing.endedAt = epochSeconds();
    std::vector<RecordedEvent> events = recordedEvents(options.service.stateDirectory, lastEvent);
    lastEvent = events.empty() ? lastEvent : events.back().id;
    const auto files = summaryFiles(options.service.stateDirectory);
    std::copy_if(files.begin(), files.end(), std::back_inserter(events), [&](const RecordedEvent& file) {
      return std::none_of(earlierFiles.begin(), earlierFiles.end(), [&](const RecordedEvent& earlier) {
        return earlier.name == file.name && earlier.payload == file.payload;
      });
    });
    earlierFiles = files;
    for (RecordedEvent& event : events) {
      event.script = fileName(script);
    }
    append(events, player.replies(script));
    events = withoutDirectory(std::move(events), options.directory);
    writeExpectations(script, updated(readExpectations(script), events, playing));
    std::printf("%s: %zu events\n", fileName(expectationFile(script)).c_str(), events.size());
  }
  return succeeded ? EXIT_SUCCESS : EXIT_FAILURE;
}

}  // namespace

}  // namespace tarn::scenario

int main(int argc, char** argv) {
  CLI::App app("Plays scripts against a fresh service and checks what arrived.", "tarnreportingscenario");
  tarn::scenario::Options options;
  app.add_option("--ctl", options.service.ctl, "The tarnreportingctl that plays the scripts")->required();
  app.add_option("--socket", options.service.socket, "The service's socket")->required();
  app.add_option("--state-dir", options.service.stateDirectory, "The service's state directory")->required();
  app.add_option("--then", options.then, "Scripts to play after the others, each alone")
      ->allow_extra_args(false)
      ->type_name("SCRIPT");
  app.add_option("--directory", options.directory, "What @DIRECTORY@ in scripts stands for");
  app.add_option("--title", options.title, "How the account calls it");
  app.add_option("--details", options.details, "A file to add each event to, with the line that it matched");
  app.add_flag("--update", options.update, "Write what arrived beside the scripts instead, each played alone");
  app.add_option("SCRIPT", options.together, "Scripts to play at once, each in a process of its own")->required();
  try {
    app.parse(argc, argv);
    return options.update ? tarn::scenario::update(options) : tarn::scenario::check(options);
  } catch (const CLI::ParseError& error) {
    return app.exit(error) == 0 ? EXIT_SUCCESS : tarn::scenario::kWrongUsage;
  } catch (const std::exception& trouble) {
    std::cout.flush();
    std::cerr << "scenario: " << trouble.what() << '\n';
    return EXIT_FAILURE;
  }
}
