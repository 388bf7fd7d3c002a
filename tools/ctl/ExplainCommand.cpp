// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "dictionary/MessageDictionary.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/SimilarNames.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

using dictionary::DerivedMessage;
using dictionary::KeyPart;
using dictionary::MessageKey;
using dictionary::NamedNumber;
using Names = std::span<const NamedNumber>;

constexpr const char* kHelp = R"(
Tells what docs/messages.md says of a category, a type, a service type, a key, a message that the service derives, or a
part of the service that reads and writes keys. Whatever the name may mean is told. No service is needed.

Exit status 1 when there is nothing of this name.

Examples:
  tarnreportingctl explain KvSessionVolume
  tarnreportingctl explain 14
  tarnreportingctl explain Volume.Summary
  tarnreportingctl explain --script Volume.Summary | tarnreportingctl run)";

struct Arguments {
  std::string name;
  bool scriptAlone = false;
};

constexpr std::string_view kPartPrefix = "TarnReporting";
constexpr std::size_t kLabelWidth = 12;

std::optional<std::uint32_t> numberFrom(std::string_view text) {
  const bool isHexadecimal = text.starts_with("0x") || text.starts_with("0X");
  const std::string_view digits = isHexadecimal ? text.substr(2) : text;
  std::uint32_t number = 0;
  const auto [end, error] =
      std::from_chars(digits.data(), digits.data() + digits.size(), number, isHexadecimal ? 16 : 10);
  const bool isWhole = !digits.empty() && error == std::errc() && end == digits.data() + digits.size();
  return isWhole ? std::optional(number) : std::nullopt;
}

// Calls `take` for each name of a list.
template <class Take>
void forEach(std::string_view list, Take take) {
  while (!list.empty()) {
    const std::size_t end = std::min(list.find(", "), list.size());
    take(list.substr(0, end));
    list.remove_prefix(std::min(end + 2, list.size()));
  }
}

// Whether the name means this row, in whatever spelling: "Volume Summary" is Volume.Summary.
bool means(std::string_view name, std::string_view list) {
  bool found = false;
  forEach(list, [&](std::string_view each) { found = found || folded(each) == folded(name); });
  return found;
}

class Explanation {
 public:
  explicit Explanation(std::string_view name) : output_(STDOUT_FILENO), name_(name), number_(numberFrom(name)) {}

  int explain();
  int printScript();

 private:
  void title(std::string_view text) {
    if (found_) {
      output_.line("");
    }
    output_.line(text);
    found_ = true;
  }
  // A row with its label; nothing for an empty text.
  void row(std::string_view label, std::string_view text) {
    if (text.empty()) return;
    std::string line = "  " + std::string(label);
    line.resize(std::max(line.size() + 1, kLabelWidth + 2), ' ');
    output_.line(line + std::string(text));
  }
  void lines(std::string_view text, std::string_view indent = "    ") {
    while (!text.empty()) {
      const std::size_t end = std::min(text.find('\n'), text.size());
      output_.line(std::string(indent) + std::string(text.substr(0, end)));
      text.remove_prefix(std::min(end + 1, text.size()));
    }
  }

  void tellNumbers(std::string_view what, Names rows);
  void tellKey(const MessageKey& key);
  void tellDerived(const DerivedMessage& message);
  void tellPart(const KeyPart& part);
  int complainOfNothing() const;

  Output output_;
  std::string name_;
  std::optional<std::uint32_t> number_;
  bool found_ = false;
};

void Explanation::tellNumbers(std::string_view what, Names rows) {
  for (const NamedNumber& each : rows) {
    if (each.name != name_ && number_ != each.number) continue;
    title(std::string(each.name) + ": " + std::string(what) + " " + std::to_string(each.number));
    row("meaning", each.text);
    row("by name", each.byName ? "" : "no: scripts give the number");
  }
}

void Explanation::tellKey(const MessageKey& key) {
  title(std::string(key.name) + ": a key" + (key.inMessages ? " of messages" : "") +
        (key.inMessages && key.inConfigurations ? " and" : "") + (key.inConfigurations ? " of configurations" : "") +
        (key.inMessages || key.inConfigurations ? "" : " of what a back-end gets"));
  row("meaning", key.text);
  row("kind", dictionary::nameOf(key.kind));
  row("unit", key.unit);
  row("range", dictionary::rangeOf(key));
  row("values", key.values);
  row("only in", key.onlyIn);
  row("read by", key.readers.empty() ? "nobody" : key.readers);
  row("written by", key.writers.empty() ? "clients" : key.writers);
  row("derives", key.derives);
  for (const DerivedMessage& message : dictionary::derived()) {
    if (dictionary::lists(message.keys, key.name)) {
      row("in", message.name);
    }
  }
}

void Explanation::tellDerived(const DerivedMessage& message) {
  title(std::string(message.name) + ": made by the service");
  row("by", message.by);
  row("when", message.when);
  row("meaning", message.text);
  row("keys", message.keys);
  row("example", message.exampleText);
  lines(message.script);
  row("recorded", "<now>, <number>, <text> and <any> stand for what differs");
  lines(message.recorded);
}

void Explanation::tellPart(const KeyPart& part) {
  title(std::string(part.name) + ": a part of the service");
  row("meaning", part.text);
  std::string read;
  std::string written;
  for (const MessageKey& key : dictionary::keys()) {
    if (dictionary::lists(key.readers, part.name)) {
      read += (read.empty() ? "" : ", ") + std::string(key.name);
    }
    if (dictionary::lists(key.writers, part.name)) {
      written += (written.empty() ? "" : ", ") + std::string(key.name);
    }
  }
  row("reads", read);
  row("writes", written);
}

int Explanation::explain() {
  tellNumbers("category", dictionary::categories());
  tellNumbers("domain of categories", dictionary::domains());
  tellNumbers("type", dictionary::types());
  tellNumbers("service type", dictionary::serviceTypes());
  if (const MessageKey* key = dictionary::keyOf(name_)) {
    tellKey(*key);
  }
  for (const DerivedMessage& message : dictionary::derived()) {
    if (means(name_, message.name)) {
      tellDerived(message);
    }
  }
  for (const KeyPart& part : dictionary::parts()) {
    if (part.name == name_ || part.name == std::string(kPartPrefix) + name_) {
      tellPart(part);
    }
  }
  return found_ ? output_.status() : complainOfNothing();
}

int Explanation::printScript() {
  for (const DerivedMessage& message : dictionary::derived()) {
    if (means(name_, message.name)) {
      lines(message.script, "");
      return output_.status();
    }
  }
  complain("the service makes no message " + printable(name_) + " (docs/messages.md lists them)");
  return kFailure;
}

int Explanation::complainOfNothing() const {
  std::string like;
  const auto suggest = [&](std::string_view name) {
    if (areSimilar(name, name_)) {
      like += (like.empty() ? "" : ", ") + std::string(name);
    }
  };
  for (const Names rows :
       {dictionary::categories(), dictionary::domains(), dictionary::types(), dictionary::serviceTypes()}) {
    for (const NamedNumber& each : rows) {
      suggest(each.name);
    }
  }
  for (const MessageKey& key : dictionary::keys()) {
    suggest(key.name);
  }
  for (const DerivedMessage& message : dictionary::derived()) {
    forEach(message.name, suggest);
  }
  complain("nothing is called " + printable(name_) +
           (like.empty() ? "; docs/messages.md lists all names and keys" : "; did you mean " + like + "?"));
  return kFailure;
}

}  // namespace

void addExplainCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("explain", "Tell what a name or a key of messages means");
  const auto arguments = std::make_shared<Arguments>();
  command->add_option("NAME", arguments->name, "The name, key or number")->required();
  command->add_flag("--script", arguments->scriptAlone, "Print the example's script alone, to be played");
  command->footer(kHelp);
  command->callback([&context, arguments] {
    context.chosen = [arguments] {
      Explanation explanation(arguments->name);
      return arguments->scriptAlone ? explanation.printScript() : explanation.explain();
    };
  });
}

}  // namespace tarn::ctl
