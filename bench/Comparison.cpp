// SPDX-License-Identifier: Apache-2.0
#include "bench/Comparison.h"

#include <cmath>
#include <cstdio>
#include <fstream>
#include <nlohmann/json.hpp>

namespace tarn::bench {

namespace {

using Json = nlohmann::ordered_json;

constexpr int kFormat = 1;

void addNumber(Json& object, const char* name, double value) {
  if (!std::isnan(value)) {
    object[name] = value;
  }
}

Json rowJson(const Row& row) {
  Json json{{"figure", row.figure}, {"text", row.ours.text}};
  addNumber(json, "value", row.ours.value);
  json["unit"] = row.ours.unit;
  if (!row.peer.name.empty()) {
    json["peer"] = row.peer.name;
    json["peer_text"] = row.peer.quantity.text + row.peer.remark;
    addNumber(json, "peer_value", row.peer.quantity.value);
  }
  if (!row.ratio.text.empty()) {
    json["ratio_text"] = row.ratio.text;
    addNumber(json, "ratio", row.ratio.value);
  }
  if (row.ratio.spread) {
    json["ratio_least"] = row.ratio.spread->least;
    json["ratio_most"] = row.ratio.spread->most;
  }
  if (row.met) {
    json["target"] = row.target;
    json["met"] = *row.met;
  }
  return json;
}

KeptRun::Figure figureOf(const nlohmann::json& row) {
  KeptRun::Figure figure;
  figure.ours.text = row.at("text").get<std::string>();
  figure.ours.value = row.value("value", figure.ours.value);
  figure.ratio.text = row.value("ratio_text", "");
  figure.ratio.value = row.value("ratio", figure.ratio.value);
  if (row.contains("ratio_least")) {
    figure.ratio.spread = {row.at("ratio_least").get<double>(), row.at("ratio_most").get<double>()};
  }
  return figure;
}

bool overlap(const Ratio& some, const Ratio& others) {
  return some.spread && others.spread && some.spread->least <= others.spread->most &&
         others.spread->least <= some.spread->most;
}

std::string differenceOf(const KeptRun::Figure& then, const Row& now) {
  const bool byRatio = !std::isnan(then.ratio.value) && !std::isnan(now.ratio.value);
  const double before = byRatio ? then.ratio.value : then.ours.value;
  const double after = byRatio ? now.ratio.value : now.ours.value;
  if (!(std::abs(before) > 0) || std::isnan(after)) return "";
  char text[48];
  std::snprintf(text, sizeof text, "%+.1f%%%s", 100 * (after / before - 1), byRatio ? "" : " (no ratio)");
  return byRatio && overlap(then.ratio, now.ratio) ? std::string(text) + ", within the spread" : text;
}

}  // namespace

std::string runJson(const RunAbout& about, const Table& table) {
  Json json{{"format", kFormat},    {"service", about.service}, {"date", about.date},       {"rounds", about.rounds},
            {"quick", about.quick}, {"disk", about.disk},       {"machine", Json::array()}, {"figures", Json::array()}};
  for (const MachineSpeed& speed : about.machine) {
    json["machine"].push_back(Json::parse(speedJson(speed)));
  }
  for (const Row& row : table.rows()) {
    json["figures"].push_back(rowJson(row));
  }
  return json.dump(1) + '\n';
}

KeptRun readRun(const std::string& file, std::string& error) {
  KeptRun run;
  std::ifstream input(file);
  try {
    const nlohmann::json json = nlohmann::json::parse(input);
    if (json.at("format").get<int>() != kFormat) {
      error = file + ": it is of another version of this program";
      return run;
    }
    run.service = json.at("service").get<std::string>();
    run.date = json.at("date").get<std::string>();
    run.quick = json.at("quick").get<bool>();
    for (const nlohmann::json& row : json.at("figures")) {
      run.figures[{row.at("figure").get<std::string>(), row.value("peer", "")}] = figureOf(row);
    }
  } catch (const nlohmann::json::exception& problem) {
    error = file + ": " + (input.is_open() ? problem.what() : "can't be read");
  }
  return run;
}

void printComparison(std::ostream& out, const KeptRun& then, const Table& now) {
  out << "\nbeside the run of " << then.date << ", " << then.service
      << (then.quick ? " (a quick one, whose figures mean little)" : "") << "\n\n";
  std::vector<std::vector<std::string>> lines{{"figure", "peer", "then", "now", "ratio then", "ratio now", "change"}};
  for (const Row& row : now.rows()) {
    const auto found = then.figures.find({row.figure, row.peer.name});
    if (found == then.figures.end()) {
      lines.push_back({row.figure, row.peer.name, "", row.ours.text, "", row.ratio.text, "new"});
      continue;
    }
    lines.push_back({row.figure, row.peer.name, found->second.ours.text, row.ours.text, found->second.ratio.text,
                     row.ratio.text, differenceOf(found->second, row)});
  }
  printAligned(out, lines);
}

}  // namespace tarn::bench
