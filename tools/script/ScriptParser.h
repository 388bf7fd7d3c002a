// SPDX-License-Identifier: Apache-2.0
// ScriptParser: turns a line of a script into a checked step, or says what is wrong with it and what was expected.
//
// A line is one JSON object. "op" is the name of a remote operation, "sleep" or "disconnect"; the operation's arguments
// are members, all of them there except "reporterIDs"; "client" names the connection. Categories, types and service
// types are numbers or the names of the vocabulary's own tables; a name that the tables don't hold is an error, because
// a mistyped name would otherwise quietly become another value. A member that the operation doesn't have is an error.
//
// Stateless; throws nothing. Threads: any.
#pragma once

#include <cstddef>
#include <string_view>

#include "plist/Result.h"
#include "tools/script/ScriptStep.h"

namespace tarn::script {

// The step that `text`, line number `line` of its script, stands for, or what is wrong with it. The text of a fault has
// what is wrong and what was expected, without the line's number; the first thing that is wrong counts. Numbers keep
// their kind: an integer isn't a double.
Result<ScriptStep> parseLine(std::string_view text, std::size_t line);

// Whether the line holds nothing but white space; such lines are passed over.
bool isBlank(std::string_view text) noexcept;

}  // namespace tarn::script
