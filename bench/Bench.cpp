// SPDX-License-Identifier: Apache-2.0
// tarnreportingbench: measures the service and its peers and prints one table. See docs/benchmarks.md.
#include <CLI/CLI.hpp>
#include <cmath>
#include <filesystem>
#include <iostream>
#include <string>
#include <string_view>
#include <vector>

#include "bench/Measure.h"
#include "bench/figures/Figures.h"

namespace {

using namespace tarn::bench;

struct Figure {
  std::string_view name;
  void (*measure)(const Settings& settings, Table& table);
};

constexpr Figure kFigures[] = {
    {"round-trip-pinned", &measureRoundTripOnOneProcessor},
    {"round-trip", &measureRoundTrip},
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

void measure(const Settings& settings, const std::vector<std::string>& only) {
  Table table;
  for (const Figure& figure : kFigures) {
    if (!only.empty() && std::find(only.begin(), only.end(), figure.name) == only.end()) continue;
    const double start = nowSeconds();
    std::cerr << "measuring " << figure.name << std::flush;
    figure.measure(settings, table);
    std::cerr << ", " << std::lround(nowSeconds() - start) << " s\n";
  }
  std::cout << "medians of " << settings.rounds << " rounds; recorded in " << settings.directory << " ("
            << diskOf(settings.directory) << ")\n\n";
  table.print(std::cout);
}

}  // namespace

int main(int argumentCount, char** arguments) {
  Settings settings;
  settings.directory = std::filesystem::temp_directory_path().string();
  settings.serviceFile = besideThisProgram("tarnreportingd");
  std::vector<std::string> names;
  for (const Figure& figure : kFigures) {
    names.emplace_back(figure.name);
  }
  std::vector<std::string> only;
  CLI::App app("Measures the service beside peers and limits, and prints one table.");
  app.add_flag("--quick", settings.quick, "a few seconds in all; shows that it runs, the figures mean little");
  app.add_option("--only", only, "only these figures")->check(CLI::IsMember(names));
  app.add_option("--rounds", settings.rounds, "how often each figure is measured")->check(CLI::Range(1, 1000));
  app.add_option("--directory", settings.directory, "where the services keep their state: the disk that is measured")
      ->check(CLI::ExistingDirectory);
  app.add_option("--service", settings.serviceFile, "the service's program")->check(CLI::ExistingFile);
  CLI11_PARSE(app, argumentCount, arguments);
  if (settings.quick && app.count("--rounds") == 0) {
    settings.rounds = 2;
  }
  measure(settings, only);
  return 0;
}
