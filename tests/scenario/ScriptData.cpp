#include "tests/scenario/ScriptData.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <stdexcept>

namespace tarn::scenario {

std::string fileName(const std::string& path) {
  return std::filesystem::path(path).filename().string();
}

std::vector<DataLine> linesOf(const std::string& path) {
  std::ifstream file(path);
  if (!file) {
    throw std::runtime_error(path + ": can't be read");
  }
  std::vector<DataLine> lines;
  std::string text;
  for (std::size_t number = 1; std::getline(file, text); ++number) {
    if (text.find_first_not_of(" \t\r") == std::string::npos) {
      continue;
    }
    const std::string origin = fileName(path) + ":" + std::to_string(number);
    json value = json::parse(text, nullptr, false);
    if (!value.is_object()) {
      throw std::runtime_error(origin + ": not a JSON object");
    }
    lines.push_back({origin, std::move(value)});
  }
  return lines;
}

std::vector<DataLine> linesBeside(const std::string& script, const std::string& kind) {
  const std::filesystem::path path = std::filesystem::path(script).replace_extension("." + kind + ".jsonl");
  return std::filesystem::exists(path) ? linesOf(path.string()) : std::vector<DataLine>();
}

const json& member(const DataLine& line, const char* key) {
  const auto found = line.value.find(key);
  if (found == line.value.end()) {
    throw std::runtime_error(line.origin + ": has no \"" + key + "\"");
  }
  return *found;
}

void allowOnly(const DataLine& line, const std::vector<std::string>& keys) {
  for (const auto& [key, value] : line.value.items()) {
    if (std::find(keys.begin(), keys.end(), key) == keys.end()) {
      throw std::runtime_error(line.origin + ": nobody reads \"" + key + "\"");
    }
  }
}

}  // namespace tarn::scenario
