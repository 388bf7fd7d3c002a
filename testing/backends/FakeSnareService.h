// SPDX-License-Identifier: Apache-2.0
// FakeSnareService: a bug capture that keeps the requests and replies as it is told: with a fresh session identifier
// ("capture-1", "capture-2", ...) until a test says otherwise.
//
// Threads: any.
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/SnareService.h"
#include "testing/backends/OrderRecord.h"
#include "testing/backends/ReplyFaults.h"

namespace tarn::testing {

class FakeSnareService final : public platform::SnareService {
 public:
  enum class Kind { RequestSnapshot, StartSession, CancelSession };
  struct Call {
    Kind kind = Kind::RequestSnapshot;
    std::size_t reporter = 0;         // which reporter asked; they count from 1
    platform::SnareRequest request;   // not of a cancel
    std::string cancelledIdentifier;  // of a cancel
    bool accepted = true;
  };

  FakeSnareService();
  ~FakeSnareService() override;
  FakeSnareService(const FakeSnareService&) = delete;
  FakeSnareService& operator=(const FakeSnareService&) = delete;

  // The interface.
  std::shared_ptr<platform::SnareReporter> createReporter() override;

  // Controls.
  void recordOrderIn(OrderRecord& record);
  // Whether requests are accepted at all.
  void setAccepts(bool accepts);
  // Replies say no, with this reason; nothing: they say yes.
  void refuseWith(std::optional<platform::SnareReason> reason);
  // The next reply is this one, or none at all.
  void replyNextWith(std::optional<plist::Dictionary> reply);
  ReplyFaults& replies();

  // Observations.
  std::vector<Call> calls() const;
  std::size_t reporters() const;  // made so far

 private:
  class Reporter;
  struct Ledger;

  const std::shared_ptr<Ledger> ledger_;
};

}  // namespace tarn::testing
