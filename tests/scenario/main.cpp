// tarnreportingscenario: plays scripts against a fresh service through client processes of their own, tells what each
// back-end received and checks it against what the scripts must lead to. Exit status 0 only when all of it arrived.
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <set>
#include <stdexcept>

#include "tests/scenario/Account.h"
#include "tests/scenario/BackEnds.h"
#include "tests/scenario/Comparison.h"
#include "tests/scenario/Mirrors.h"
#include "tests/scenario/Model.h"
#include "tests/scenario/Recorded.h"
#include "tests/scenario/ScriptProcess.h"
#include "tests/scenario/SummaryFiles.h"

namespace tarn::scenario {

namespace {

constexpr double kPatienceSeconds = 30;
// Some back-ends get their events from queues of their own, after the clients have gone.
constexpr double kLateEventsSeconds = 5;
constexpr int kWrongUsage = 64;

struct Options {
  Service service;
  std::vector<std::string> together;
  std::vector<std::string> then;
  bool internalBuild = false;
};

double epochSeconds() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// A directory that goes with its owner.
class TemporaryDirectory {
 public:
  TemporaryDirectory() {
    std::string name = (std::filesystem::temp_directory_path() / "tarnscenario.XXXXXX").string();
    if (::mkdtemp(name.data()) == nullptr) {
      throw std::runtime_error("can't make a temporary directory");
    }
    path_ = name;
  }
  ~TemporaryDirectory() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryDirectory(const TemporaryDirectory&) = delete;
  TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;
  const std::string& path() const { return path_; }

 private:
  std::string path_;
};

std::string contentOf(const std::string& path) {
  std::ifstream file(path);
  return {std::istreambuf_iterator<char>(file), {}};
}

std::vector<json> jsonLines(const std::string& path) {
  std::vector<json> lines;
  std::ifstream file(path);
  for (std::string text; std::getline(file, text);) {
    lines.push_back(json::parse(text));
  }
  return lines;
}

// Starts all of them, then waits for all. Whether every one succeeded.
bool play(const std::vector<std::string>& scripts, const Service& service, const std::string& directory) {
  std::vector<ScriptProcess> processes;
  processes.reserve(scripts.size());
  for (const std::string& script : scripts) {
    processes.emplace_back(service, script, directory);
  }
  bool succeeded = true;
  for (ScriptProcess& process : processes) {
    const int status = process.wait();
    if (status != 0) {
      succeeded = false;
      std::fprintf(stderr, "scenario: %s ended with status %d: %s\n", process.script().c_str(), status,
                   contentOf(process.complaintsPath()).c_str());
    }
  }
  return succeeded;
}

std::vector<Expectation> expectationsOf(const Options& options) {
  std::vector<Expectation> expectations;
  for (const std::string& script : options.together) {
    expectations.push_back(expectationOf(script, {options.together.size() == 1, options.internalBuild}));
  }
  for (const std::string& script : options.then) {
    expectations.push_back(expectationOf(script, {true, options.internalBuild}));
  }
  // A message goes to every client's session of an ID.
  std::set<std::int64_t> known;
  for (const Expectation& expectation : expectations) {
    for (const std::int64_t id : expectation.reporterIDs) {
      if (!known.insert(id).second) {
        throw std::runtime_error(expectation.script + ": another script has a session " + std::to_string(id) + " too");
      }
    }
  }
  return expectations;
}

std::vector<BackEndLine> backEndLinesOf(const Options& options) {
  std::vector<BackEndLine> lines;
  for (const auto* scripts : {&options.together, &options.then}) {
    for (const std::string& script : *scripts) {
      const auto more = backEndLines(script);
      lines.insert(lines.end(), more.begin(), more.end());
    }
  }
  return lines;
}

// Those that follow from the scripts themselves, with one of each connection's end.
std::size_t expectedEvents(const std::vector<Expectation>& expectations) {
  std::size_t count = mirrorEvents(expectations);
  for (const Expectation& expectation : expectations) {
    count += expectation.connections.size();
    for (const auto& [application, events] : expectation.events) {
      count += events.size();
    }
  }
  return count;
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

int conclude(const std::vector<std::string>& differences, bool played, std::size_t matched, std::size_t events,
             const Circumstances& circumstances) {
  printDifferences(differences);
  const double seconds = circumstances.endedAt - circumstances.startedAt;
  if (!played || !differences.empty()) {
    std::printf("scenario: NOT all of it arrived: %zu differences, %zu of %zu events in their places, %.1f s\n",
                differences.size(), matched, events, seconds);
    return EXIT_FAILURE;
  }
  std::printf("scenario: all of it arrived, in order, and nothing else: %zu events in %.1f s\n", events, seconds);
  return EXIT_SUCCESS;
}

int run(const Options& options) {
  const TemporaryDirectory directory;
  const std::vector<Expectation> expectations = expectationsOf(options);
  BackEndComparison backEnds(backEndLinesOf(options));
  ServiceWatch service(options.service.socket, kPatienceSeconds);
  Circumstances circumstances;
  circumstances.clientProcessName = std::filesystem::path(options.service.ctl).filename().string();
  circumstances.startedAt = epochSeconds();
  std::printf("scenario: %zu clients at once, then %zu alone%s\n", options.together.size(), options.then.size(),
              options.internalBuild ? ", on an internal build" : "");
  bool played = play(options.together, options.service, directory.path());
  for (const std::string& script : options.then) {
    service.ledgerAtRest(kPatienceSeconds);
    played = play({script}, options.service, directory.path()) && played;
  }
  service.ledgerAtRest(kPatienceSeconds);
  const json ledger = service.ledgerAtRest(kLateEventsSeconds, expectedEvents(expectations) + backEnds.expected());
  circumstances.endedAt = epochSeconds();
  const std::vector<RecordedEvent> events = recordedEvents(options.service.stateDirectory);
  SummaryFiles files(options.service.stateDirectory);
  printBackends(events);
  printSessions(expectations, events);
  MirrorComparison mirrors(expectations, PayloadRules(circumstances), options.internalBuild);
  mirrors.compare(events);
  mirrors.print();
  files.print();

  Comparison comparison(expectations, circumstances);
  comparison.compareEvents(events);
  comparison.compareLedger(ledger, events.size());
  for (const Expectation& expectation : expectations) {
    comparison.compareReplies(expectation, jsonLines(directory.path() + "/" + expectation.script + ".replies"));
  }
  backEnds.compare(events);
  files.compare(expectations, events);
  std::vector<std::string> differences = comparison.differences();
  for (const auto* more : {&mirrors.differences(), &backEnds.differences(), &files.differences()}) {
    differences.insert(differences.end(), more->begin(), more->end());
  }
  return conclude(differences, played, comparison.matched() + mirrors.matched() + backEnds.matched(), events.size(),
                  circumstances);
}

}  // namespace

}  // namespace tarn::scenario

int main(int argc, char** argv) {
  CLI::App app("Plays scripts against a fresh service and checks what its recorder received.", "tarnreportingscenario");
  tarn::scenario::Options options;
  app.add_option("--ctl", options.service.ctl, "The tarnreportingctl that plays the scripts")->required();
  app.add_option("--socket", options.service.socket, "The service's socket")->required();
  app.add_option("--state-dir", options.service.stateDirectory, "The service's state directory")->required();
  app.add_option("--then", options.then, "Scripts to play after the others, each alone")
      ->allow_extra_args(false)
      ->type_name("SCRIPT");
  app.add_flag("--internal-build", options.internalBuild, "The service's device properties say so");
  app.add_option("SCRIPT", options.together, "Scripts to play at once, each in a process of its own")->required();
  try {
    app.parse(argc, argv);
    return tarn::scenario::run(options);
  } catch (const CLI::ParseError& error) {
    return app.exit(error) == 0 ? EXIT_SUCCESS : tarn::scenario::kWrongUsage;
  } catch (const std::exception& trouble) {
    std::cout.flush();
    std::cerr << "scenario: " << trouble.what() << '\n';
    return EXIT_FAILURE;
  }
}
