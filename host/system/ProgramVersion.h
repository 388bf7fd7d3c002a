// SPDX-License-Identifier: Apache-2.0
// What --version tells: the version, the commit that the source is of, and the identifier that the linker gave this
// very build, by which its debug symbols are found.
//
// The commit is told by programs alone (programCommit, of a source that the build writes), so that a new commit links
// two programs and compiles nothing else. Threads: any.
#pragma once

#include <string>
#include <string_view>

namespace tarn::linux_host {

// Twelve hexadecimal digits; empty when the source is of no commit that anybody knows, as from an archive.
std::string_view programCommit() noexcept;
// That of the running program, in hexadecimal digits; empty when it was linked without one.
std::string buildIdentifier();
// "PROGRAM VERSION (commit COMMIT, build IDENTIFIER)", without what there isn't.
std::string programVersion(std::string_view program, std::string_view commit, std::string_view build);
// The same of the program that runs.
inline std::string versionOf(std::string_view program) {
  return programVersion(program, programCommit(), buildIdentifier());
}

}  // namespace tarn::linux_host
