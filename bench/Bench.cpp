// SPDX-License-Identifier: Apache-2.0
// tarnreportingbench: measures the service and its peers and prints one table. See docs/benchmarks.md.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "bench/Comparison.h"
#include "bench/Machine.h"
#include "bench/Measure.h"
#include "bench/figures/Figures.h"
#include "host/machine/LinuxCommandRunner.h"

namespace {

using namespace tarn::bench;

struct Figure {
  std::string_view name;
  void (*measure)(const Settings& settings, Table& table);
};

constexpr Figure kFigures[] = {
    {"round-trip-pinned", &measureRoundTripOnOneProcessor},
    {"round-trip", &measureRoundTrip},
    {"turns", &measureTurns},
    {"stream", &measureStream},
    {"gathered", &measureGathered},
    {"recorded", &measureRecorded},
    {"queries", &measureQueries},
    {"tools", &measureTools},
    {"fleet", &measureFleet},
    {"visible", &measureVisible},
    {"post", &measurePost},
    {"idle", &measureIdle},
    {"decoding", &measureDecoding},
    {"memory", &measureMemory},
    {"equality", &measureEquality},
    {"growth", &measureGrowth},
    {"signposts", &measureSignposts},
    {"stop", &measureStop},
    {"mirror", &measureMirror},
    {"diagnostics", &measureDiagnostics},
    {"trace", &measureTrace},
};

std::string besideThisProgram(const std::string& name) {
  std::error_code ignored;
  return std::filesystem::read_symlink("/proc/self/exe", ignored).replace_filename(name).string();
}

struct Request {
  Settings settings;
  std::vector<std::string> only;
  std::string jsonFile;
  std::string comparedFile;
  std::string keptFile = TARN_KEPT_SPEED;
  bool keep = false;  // this machine's speed
};

std::string dateNow() {
  const std::time_t now = std::time(nullptr);
  std::tm parts{};
  ::gmtime_r(&now, &parts);
  char text[32];
  std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", &parts);
  return text;
}

// What the measured program says of its version.
std::string versionOf(const std::string& program) {
  tarn::linux_host::LinuxCommandRunner runner;
  const auto command = runner.start("'" + program + "' --version", std::chrono::seconds(5));
  const std::optional<std::string> line = command.ok() ? command.value->readLine(256) : std::nullopt;
  return line ? line->substr(0, line->find('\n')) : program;
}

int refuse(const std::string& complaint) {
  std::cerr << "tarnreportingbench: " << complaint << '\n';
  return EXIT_FAILURE;
}

Table measureAll(const Request& request) {
  Table table;
  for (const Figure& figure : kFigures) {
    if (!request.only.empty() &&
        std::find(request.only.begin(), request.only.end(), figure.name) == request.only.end()) {
      continue;
    }
    const double start = nowSeconds();
    std::cerr << "measuring " << figure.name << std::flush;
    figure.measure(request.settings, table);
    std::cerr << ", " << std::lround(nowSeconds() - start) << " s\n";
  }
  return table;
}

// What can't be read or written is told before anything is measured.
int run(const Request& request) {
  std::string error;
  KeptRun earlier;
  if (!request.comparedFile.empty()) {
    earlier = readRun(request.comparedFile, error);
    if (!error.empty()) return refuse(error);
  }
  RunAbout about;
  about.machine.push_back(measureMachine());
  if (request.keep) {
    std::ofstream file(request.keptFile);
    file << speedJson(about.machine.front()) << '\n';
    if (!file.flush()) return refuse(request.keptFile + ": can't be written");
  }
  const MachineSpeed kept = readSpeed(request.keptFile, error);
  if (!error.empty()) return refuse(error);
  std::ofstream json;
  if (!request.jsonFile.empty()) {
    json.open(request.jsonFile);
    if (!json) return refuse(request.jsonFile + ": can't be written");
  }
  const Settings& settings = request.settings;
  const Table table = measureAll(request);
  about.machine.push_back(measureMachine());
  about.service = versionOf(settings.serviceFile);
  about.date = dateNow();
  about.rounds = settings.rounds;
  about.quick = settings.quick;
  about.disk = diskOf(settings.directory);
  std::cout << "medians of " << settings.rounds << " rounds; recorded in " << settings.directory << " (" << about.disk
            << ")\n";
  if (const std::string warning = warningOf(about.machine, kept); !warning.empty()) {
    std::cout << "warning: " << warning << '\n';
  }
  std::cout << '\n';
  table.print(std::cout);
  if (!request.comparedFile.empty()) {
    printComparison(std::cout, earlier, table);
  }
  if (json.is_open() && !(json << runJson(about, table)).flush()) {
    return refuse(request.jsonFile + ": can't be written");
  }
  return EXIT_SUCCESS;
}

}  // namespace

int main(int argumentCount, char** arguments) {
  Request request;
  Settings& settings = request.settings;
  settings.directory = std::filesystem::temp_directory_path().string();
  settings.serviceFile = besideThisProgram("tarnreportingd");
  std::vector<std::string> names;
  for (const Figure& figure : kFigures) {
    names.emplace_back(figure.name);
  }
  CLI::App app("Measures the service beside peers and limits, and prints one table.");
  app.add_flag("--quick", settings.quick, "a few seconds in all; shows that it runs, the figures mean little");
  app.add_option("--only", request.only, "only these figures")->check(CLI::IsMember(names));
  app.add_option("--rounds", settings.rounds, "how often each figure is measured")->check(CLI::Range(1, 1000));
  app.add_option("--directory", settings.directory, "where the services keep their state: the disk that is measured")
      ->check(CLI::ExistingDirectory);
  app.add_option("--service", settings.serviceFile, "the service's program")->check(CLI::ExistingFile);
  app.add_option("--json", request.jsonFile, "write the run with its numbers to this file too")->type_name("FILE");
  app.add_option("--compare", request.comparedFile, "print what changed since the run in this file, written by --json")
      ->type_name("FILE");
  app.add_option("--kept", request.keptFile, "the machine's speed that a slow or busy one is told by")
      ->type_name("FILE");
  app.add_flag("--keep", request.keep, "first write this machine's speed to that file");
  CLI11_PARSE(app, argumentCount, arguments);
  if (settings.quick && app.count("--rounds") == 0) {
    settings.rounds = 2;
  }
  return run(request);
}
