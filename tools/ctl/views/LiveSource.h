// SPDX-License-Identifier: Apache-2.0
// LiveSource: looks at the real service and at the real store. The connection to the service is kept over the looks and
// made anew when it is lost; the store is opened for each look, since another file may have taken its place. Owner: the
// command. Threads: one.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "client/ClientConnection.h"
#include "plist/Result.h"
#include "tools/ctl/ServiceConnection.h"
#include "tools/ctl/views/TopSample.h"
#include "tools/report/StoreMoment.h"

namespace tarn::ctl {

class LiveSource final : public TopSource {
 public:
  LiveSource(const ServiceAddress& address, std::string store) : address_(address), store_(std::move(store)) {}

  TopSample look() override;

 private:
  // The last message of a session that is known.
  struct Last {
    std::string name;
    double time = 0;
  };

  void askStatus(TopSample& sample);
  [[nodiscard]] Status readSessions(TopSample& sample);
  // Counts what was recorded since the last look, by session.
  [[nodiscard]] Status readMessages(report::StoreMoment& store, std::map<std::int64_t, std::int64_t>& counts);
  [[nodiscard]] Status readOpen(report::StoreMoment& store, const std::map<std::int64_t, std::int64_t>& counts,
                                TopSample& sample);

  const ServiceAddress address_;
  const std::string store_;
  std::unique_ptr<client::ClientConnection> client_;
  std::string socket_;  // where it leads
  // The id up to which events were counted; nothing before the first look and in a file that began anew.
  std::optional<std::int64_t> countedTo_;
  std::int64_t newest_ = 0;            // at this look
  std::map<std::int64_t, Last> last_;  // of open sessions
};

}  // namespace tarn::ctl
