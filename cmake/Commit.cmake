# SPDX-License-Identifier: Apache-2.0
# Writes OUTPUT, a source that tells the commit of SOURCE, when that isn't what it tells already. The commit is what
# packaging/commit names, which an archive of git and the making of packages fill in, else what git says; without both
# it is empty. Nothing else of the surroundings goes in, so builds of one commit are the same.
file(STRINGS "${SOURCE}/packaging/commit" commit REGEX "^[0-9a-f]+$" LIMIT_COUNT 1)
if(NOT commit AND EXISTS "${SOURCE}/.git")
  execute_process(COMMAND git -C "${SOURCE}" rev-parse HEAD OUTPUT_VARIABLE commit ERROR_QUIET
    OUTPUT_STRIP_TRAILING_WHITESPACE)
endif()
string(SUBSTRING "${commit}" 0 12 commit)
file(CONFIGURE OUTPUT "${OUTPUT}" @ONLY CONTENT [[
#include "host/system/ProgramVersion.h"

std::string_view tarn::linux_host::programCommit() noexcept {
  return "@commit@";
}
]])
