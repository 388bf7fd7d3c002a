#include <array>
#include <charconv>
#include <cmath>
#include <nlohmann/json.hpp>

#include "host/system/JsonValues.h"
#include "plist/formats/Base64.h"

namespace tarn::linux_host {

namespace {

class Writer {
 public:
  explicit Writer(JsonLayout layout) : indented_(layout == JsonLayout::Indented) {}

  // Whether the value could be written.
  bool write(const plist::ValueView& value) {
    switch (value.kind()) {
      case plist::Kind::None:
        return false;
      case plist::Kind::Bool:
        out_ += value.boolValue() ? "true" : "false";
        return true;
      case plist::Kind::Signed:
        out_ += std::to_string(value.signedValue());
        return true;
      case plist::Kind::Unsigned:
        out_ += std::to_string(value.unsignedValue());
        return true;
      case plist::Kind::Float:
        return writeNumber(static_cast<double>(value.floatValue()));
      case plist::Kind::Double:
        return writeNumber(value.doubleValue());
      case plist::Kind::Date:
        return writeForm("$date", [&] { return writeNumber(value.dateValue().epochSeconds); });
      case plist::Kind::Text:
        return writeText(value.text());
      case plist::Kind::Data:
        return writeForm("$data", [&] {
          out_ += '"';
          plist::appendBase64(out_, value.data());
          out_ += '"';
          return true;
        });
      case plist::Kind::Array:
        return writeArray(value.array());
      case plist::Kind::Dictionary:
        return writeDictionary(value.dictionary());
    }
    return false;
  }
  std::string take() {
    if (indented_) {
      out_ += '\n';
    }
    return std::move(out_);
  }

 private:
  // The shortest digits that read back the same; never without point or exponent, so that it stays a double.
  bool writeNumber(double number) {
    if (!std::isfinite(number)) {
      return false;
    }
    std::array<char, 32> digits{};
    const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), number).ptr;
    const std::string_view written(digits.data(), static_cast<std::size_t>(end - digits.data()));
    out_ += written;
    if (written.find_first_of(".e") == std::string_view::npos) {
      out_ += ".0";
    }
    return true;
  }
  bool writeText(std::string_view text) {
    try {
      out_ += nlohmann::json(text).dump();
    } catch (const nlohmann::json::exception&) {  // not UTF-8
      return false;
    }
    return true;
  }
  template <class Write>
  bool writeForm(std::string_view name, Write write) {
    if (level_ == kMaximumJsonNesting) {
      return false;
    }
    out_ += "{\"";
    out_ += name;
    out_ += "\": ";
    const bool written = write();
    out_ += '}';
    return written;
  }
  bool writeArray(const plist::Array& array) {
    if (!open('[')) {
      return false;
    }
    bool first = true;
    for (const plist::ValueView& item : array) {
      separate(first);
      if (!write(item)) {
        return false;
      }
    }
    close(']', first);
    return true;
  }
  bool writeDictionary(const plist::Dictionary& dictionary) {
    if (!open('{') || readsAsForm(dictionary)) {
      return false;
    }
    bool first = true;
    for (const plist::Dictionary::Entry& entry : dictionary) {
      separate(first);
      if (!writeText(entry.key.text())) {
        return false;
      }
      out_ += ": ";
      if (!write(entry.value)) {
        return false;
      }
    }
    close('}', first);
    return true;
  }
  static bool readsAsForm(const plist::Dictionary& dictionary) {
    return dictionary.size() == 1 && (dictionary.contains("$date") || dictionary.contains("$data"));
  }
  bool open(char bracket) {
    out_ += bracket;
    return ++level_ <= kMaximumJsonNesting;
  }
  void separate(bool& first) {
    if (!first) {
      out_ += indented_ ? "," : ", ";
    }
    first = false;
    newLine();
  }
  void close(char bracket, bool empty) {
    --level_;
    if (!empty) {
      newLine();
    }
    out_ += bracket;
  }
  void newLine() {
    if (indented_) {
      out_ += '\n';
      out_.append(2 * level_, ' ');
    }
  }

  const bool indented_;
  std::size_t level_ = 0;
  std::string out_;
};

}  // namespace

std::optional<std::string> jsonText(const plist::ValueView& value, JsonLayout layout) {
  Writer writer(layout);
  if (!writer.write(value)) {
    return std::nullopt;
  }
  return writer.take();
}

}  // namespace tarn::linux_host
