// ScriptData: what stands beside a script, in NAME.KIND.jsonl for the script NAME.jsonl: one JSON object a line.
#pragma once

#include <nlohmann/json.hpp>
#include <string>
#include <vector>

namespace tarn::scenario {

using nlohmann::json;

struct DataLine {
  std::string origin;  // FILE:LINE
  json value;          // an object
};

// The last part of a path.
std::string fileName(const std::string& path);
// The lines of `path`, without the empty ones. Throws std::runtime_error with the line for what is no JSON object, and
// for a file that can't be read.
std::vector<DataLine> linesOf(const std::string& path);
// The lines beside `script`; none when there is no such file.
std::vector<DataLine> linesBeside(const std::string& script, const std::string& kind);

// A line's member; throws std::runtime_error with the line when it is missing.
const json& member(const DataLine& line, const char* key);
// Throws std::runtime_error for a member that is none of `keys`: a misspelt one would be left out in silence.
void allowOnly(const DataLine& line, const std::vector<std::string>& keys);

}  // namespace tarn::scenario
