// SPDX-License-Identifier: Apache-2.0
#include "fleet/ask/AskOptions.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <limits>
#include <sstream>
#include <utility>

namespace tarn::fleet {

namespace {

constexpr const char* kProgram = "tarnreporting-fleet";
constexpr int kExitUsage = 64;
constexpr const char* kFooter = R"(
"tarnreportingctl fleet" is the same. Reads the database that tarnreporting-collect fills, and changes nothing in it.
Results go to stdout, complaints to stderr. Exit status: 0 success; 64 wrong usage; 69 the database can't be reached;
1 any other failure.

"tarnreporting-fleet QUESTION --help" tells more.)";

std::string versionText() {
  return std::string(kProgram) + " " TARN_VERSION;
}

CLI::Option* addLimit(CLI::App& command, std::size_t& limit, const std::string& what) {
  return command.add_option("--limit", limit, what)
      ->type_name("N")
      ->check(CLI::Range(1, std::numeric_limits<int>::max()));
}

void addTop(CLI::App& app, AskOptions& options) {
  TopArguments& top = options.top;
  CLI::App* command = app.add_subcommand("top", "Rank routes, releases and applications by overloads an hour of play");
  command->add_option("--by", top.by, "One table alone: route, release or application")
      ->type_name("WHAT")
      ->check(CLI::IsMember({"route", "release", "application"}));
  addLimit(*command, top.limit, "The worst so many of each (default: 10)");
  top.range.addTo(*command, "Only hours");
  command->add_flag("--json", top.asJson, "Print one object a line");
  command->footer(
      "\nReads the hours that the collectors keep; an hour that only a part of lies in the time counts whole. FROM "
      "and\n"
      "TO are the 95% interval of the rate (exact, of a Poisson count). The worst is what has the highest FROM, so\n"
      "that little play doesn't come first by chance. Without play there is no rate; such rows come last.");
  command->callback([&options] { options.question = Question::Top; });
}

void addSessions(CLI::App& app, AskOptions& options) {
  SessionsArguments& sessions = options.sessions;
  CLI::App* command = app.add_subcommand("sessions", "List the sessions of all devices, a line each, newest first");
  sessions.range.addTo(*command, "Only sessions that were there");
  command->add_option("--device", sessions.deviceGlob, "Only of devices whose name matches this (*, ?, [a-z])")
      ->type_name("GLOB");
  command
      ->add_option("--app,--application", sessions.applicationGlob,
                   "Only sessions of applications that match this (*, ?, [a-z])")
      ->type_name("GLOB");
  command->add_option("--release", sessions.releaseGlob, "Only of runs of releases that match this (*, ?, [a-z])")
      ->type_name("GLOB");
  command->add_flag("--open", sessions.open, "Only sessions that hadn't ended when they were told of");
  addLimit(*command, sessions.limit, "The newest so many (default: 100)");
  command->add_flag("--all", sessions.all, "Also those that one of another type replaced before they ever ran");
  command->add_flag("--json", sessions.asJson, "Print one object a line");
  command->footer(
      "\nTimes are local ones. RUN and SESSION are the device's own numbers, with which \"tarnreportingctl show\" "
      "tells\n"
      "more there. ACTIVE is the time between starts and stops. END says how the session ended, as far as the device\n"
      "told yet.");
  command->callback([&options] { options.question = Question::Sessions; });
}

void addReport(CLI::App& app, AskOptions& options) {
  ReportArguments& report = options.report;
  CLI::App* command =
      app.add_subcommand("report", "Make one HTML page of all devices, with pictures and their numbers");
  report.range.addTo(*command, "Only hours");
  command->add_option("-o,--output", report.file, "The page's file, replaced whole (default: stdout)")
      ->type_name("FILE.html");
  command->add_flag("--exact", report.exact,
                    "Make the account of the events themselves instead of the collectors' counts: takes long");
  command->footer("\nThe page needs no network and no scripts, and goes well on paper. Times in it are UTC.");
  command->callback([&options] { options.question = Question::Report; });
}

AskCommand refuse(std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  return {std::nullopt, {}, Error{kExitUsage, std::move(text) + " (--help tells more)"}};
}

}  // namespace

void describeAskCommand(CLI::App& app, AskOptions& options) {
  app.name(kProgram);
  app.description("Answers questions over all devices, from the database that tarnreporting-collect fills.");
  app.footer(kFooter);
  app.set_version_flag("--version", versionText(), "Print the version and exit");
  app.add_option("--db", options.database,
                 "The database, as PostgreSQL's tools take it: postgresql://... or dbname=... (default: "
                 "dbname=tarnreporting)")
      ->type_name("URL");
  app.add_option("--color", options.color, "Colours: auto (on a terminal, unless NO_COLOR is set), always or never")
      ->type_name("WHEN")
      ->check(CLI::IsMember({"auto", "always", "never"}))
      ->take_last();
  app.add_flag("-q,--quiet", options.quiet, "No headings and no remarks: results alone");
  app.require_subcommand(1);
  // The options above may also stand after the question.
  app.fallthrough();
  addTop(app, options);
  addSessions(app, options);
  addReport(app, options);
}

AskCommand parseAskCommand(int argumentCount, const char* const* arguments) {
  CLI::App app;
  // In place: the parser refers to it.
  AskCommand command{AskOptions(), {}, {}};
  describeAskCommand(app, *command.options);
  try {
    app.parse(argumentCount, arguments);
  } catch (const CLI::CallForHelp& help) {
    std::ostringstream text;
    app.exit(help, text, text);
    return {std::nullopt, text.str(), {}};
  } catch (const CLI::CallForVersion&) {
    return {std::nullopt, versionText() + "\n", {}};
  } catch (const CLI::ParseError& fault) {
    const auto unknown = app.get_subcommands().empty() ? app.remaining() : std::vector<std::string>();
    return refuse(unknown.empty() ? fault.what() : "there is no question or option " + unknown.front());
  }
  return {std::move(command.options), {}, {}};
}

}  // namespace tarn::fleet
