// SPDX-License-Identifier: Apache-2.0
#include "fleet/ask/TopAnswer.h"

#include <vector>

#include "tools/ctl/terminal/JsonObject.h"
#include "tools/ctl/terminal/TextTable.h"

namespace tarn::fleet {

namespace {

constexpr double kHour = 3600;

struct Ranked {
  const char* by;
  const char* heading;
  const std::vector<Played>* all;
};

std::string rowJson(const char* by, const Rated& rated) {
  const Played& played = rated.played;
  std::optional<double> value, low, high;
  if (rated.rate) {
    value = rated.rate->value;
    low = rated.rate->between.low;
    high = rated.rate->between.high;
  }
  ctl::JsonObject object;
  object.add("by", by).add("name", played.name).add("segments", played.segments).add("play_seconds", played.seconds);
  object.add("overloads", played.overloads).addOptional("overloads_per_hour", value);
  return object.addOptional("from", low).addOptional("to", high).text();
}

void addRow(ctl::TextTable& table, const Rated& rated) {
  const Played& played = rated.played;
  const auto rate = [&rated](auto number) { return rated.rate ? rateText(number(*rated.rate)) : std::string("-"); };
  table.add({{played.name.empty() ? "-" : played.name},
             {ctl::durationText(played.seconds)},
             {std::to_string(played.overloads), played.overloads > 0 ? ctl::Paint::Yellow : ctl::Paint::Plain},
             {rate([](const Rate& each) { return each.value; })},
             {rate([](const Rate& each) { return each.between.low; })},
             {rate([](const Rate& each) { return each.between.high; })}});
}

void printTable(const Ranked& ranked, std::size_t limit, ctl::Output& output, const ctl::Terminal& terminal) {
  ctl::TextTable table({{ranked.heading, false, true},
                        {"PLAYED", true},
                        {"OVERLOADS", true},
                        {"AN HOUR", true},
                        {"FROM", true},
                        {"TO", true}});
  for (const Rated& rated : worstOf(*ranked.all, limit)) {
    addRow(table, rated);
  }
  table.print(output, terminal);
}

}  // namespace

void printTop(const PlayedParts& parts, const TopArguments& wished, ctl::Output& output,
              const ctl::Terminal& terminal) {
  const Ranked rankings[] = {{"route", "ROUTE", &parts.routes},
                             {"release", "RELEASE", &parts.releases},
                             {"application", "APPLICATION", &parts.applications}};
  bool isFirst = true;
  for (const Ranked& ranked : rankings) {
    if (!wished.by.empty() && wished.by != ranked.by) continue;
    if (wished.asJson) {
      for (const Rated& rated : worstOf(*ranked.all, wished.limit)) {
        if (!output.line(rowJson(ranked.by, rated))) return;
      }
      continue;
    }
    if (!isFirst && !ranked.all->empty()) {
      output.line("");
    }
    isFirst = isFirst && ranked.all->empty();
    printTable(ranked, wished.limit, output, terminal);
  }
}

}  // namespace tarn::fleet
