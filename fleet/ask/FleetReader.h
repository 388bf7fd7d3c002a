// SPDX-License-Identifier: Apache-2.0
// FleetReader: asks the database that the collectors fill. It changes nothing there: it says so to the server, which
// then refuses it. All answers are of one moment, whatever is written meanwhile.
//
// Every error is one line. Owner: who asks. Threads: one. It blocks on the database.
#pragma once

#include <string>
#include <vector>

#include "fleet/ask/FleetData.h"
#include "fleet/collect/Database.h"
#include "plist/Result.h"

namespace tarn::fleet {

class FleetReader {
 public:
  FleetReader() = default;
  FleetReader(const FleetReader&) = delete;
  FleetReader& operator=(const FleetReader&) = delete;

  // To be called once, before anything is asked. The error: nobody answers, or the layout isn't the one that is known.
  [[nodiscard]] Status open(const std::string& address, const char* program);
  // Whether the database answers: what failed then was refused by it.
  bool isReached() const { return database_.isOpen(); }

  // Of hours that begin within the span, and the one that it begins in.
  Result<PlayedParts> played(const Span& span);
  // The newest first.
  Result<std::vector<FleetSession>> sessions(const SessionWish& wish);
  // All that a report shows, but for when it is made. `isExact`: the account is made of the events themselves.
  Result<FleetPicture> picture(const Span& span, bool isExact);

 private:
  Result<std::vector<FleetSession>> newest(const SessionWish& wish);
  [[nodiscard]] Status addDoings(std::vector<FleetSession>& sessions);
  [[nodiscard]] Status readAccount(FleetPicture& picture);
  [[nodiscard]] Status countSessions(FleetPicture& picture);
  [[nodiscard]] Status readVolumes(FleetPicture& picture);
  [[nodiscard]] Status readIssues(FleetPicture& picture);

  Database database_;
};

}  // namespace tarn::fleet
