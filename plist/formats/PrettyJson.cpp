#include "plist/formats/PrettyJson.h"

#include <algorithm>
#include <cmath>
#include <string_view>
#include <utility>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/EscapedText.h"
#include "plist/formats/Json.h"

namespace tarn::plist {

namespace {

// What a value is that JSON can't hold; empty when it can. Containers are looked into later.
std::string_view misfit(const ValueView& value) {
  switch (value.kind()) {
    case Kind::None:
      return "an absent value";
    case Kind::Date:
      return "a date";
    case Kind::Data:
      return "data";
    case Kind::Float:
    case Kind::Double:
      return std::isfinite(value.asDouble()) ? std::string_view() : "a number that is not finite";
    default:
      return {};
  }
}

class PrettyPrinter {
 public:
  explicit PrettyPrinter(std::string& out) : out_(out) {}

  // Whether it could be written.
  bool append(const ValueView& value, std::size_t level) {
    misfit_ = misfit(value);
    if (!misfit_.empty()) {
      return false;
    }
    if (value.kind() == Kind::Array) {
      return appendArray(value.array(), level);
    }
    if (value.kind() == Kind::Dictionary) {
      return appendDictionary(value.dictionary(), level);
    }
    appendJson(out_, value);
    return true;
  }

  // After a failure.
  std::string complaint() const {
    std::string text = "JSON can't hold ";
    text += misfit_;
    for (auto step = place_.rbegin(); step != place_.rend(); ++step) {
      text += step == place_.rbegin() ? " at " : "";
      text += *step;
    }
    return text;
  }

 private:
  void beginLine(std::size_t level, bool isFirst) {
    out_ += isFirst ? "\n" : ",\n";
    indent(level);
  }
  void indent(std::size_t level) { out_.append(2 * level, ' '); }

  bool appendArray(const Array& array, std::size_t level) {
    if (array.empty()) {
      out_ += "[]";
      return true;
    }
    out_ += '[';
    std::size_t index = 0;
    for (const ValueView& item : array) {
      beginLine(level + 1, index == 0);
      if (!append(item, level + 1)) {
        place_.push_back("[" + std::to_string(index) + "]");
        return false;
      }
      ++index;
    }
    out_ += '\n';
    indent(level);
    out_ += ']';
    return true;
  }

  bool appendDictionary(const Dictionary& dictionary, std::size_t level) {
    if (dictionary.empty()) {
      out_ += "{}";
      return true;
    }
    std::vector<std::pair<std::string_view, ValueView>> members;
    members.reserve(dictionary.size());
    for (const Dictionary::Entry& entry : dictionary) {
      members.emplace_back(entry.key.text(), entry.value);
    }
    std::sort(members.begin(), members.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
    out_ += '{';
    bool isFirst = true;
    for (const auto& [key, value] : members) {
      beginLine(level + 1, std::exchange(isFirst, false));
      appendJsonText(out_, key);
      out_ += ": ";
      if (!append(value, level + 1)) {
        std::string step = "[";
        appendJsonText(step, key);
        place_.push_back(step + "]");
        return false;
      }
    }
    out_ += '\n';
    indent(level);
    out_ += '}';
    return true;
  }

  std::string& out_;
  std::string_view misfit_;
  std::vector<std::string> place_;  // the way to what can't be written, innermost step first
};

}  // namespace

std::optional<std::string> appendPrettyJson(std::string& out, const ValueView& value, std::size_t level) {
  const std::size_t before = out.size();
  PrettyPrinter printer(out);
  if (printer.append(value, level)) {
    return std::nullopt;
  }
  out.resize(before);
  return printer.complaint();
}

}  // namespace tarn::plist
