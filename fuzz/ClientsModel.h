// SPDX-License-Identifier: Apache-2.0
// The slow and obvious model of a service with several clients: who has which session, what lies in its log, which
// replies come and what the two workers of ClientsFuzzer see, all of it in one list in its order.
//
// It knows nothing of the service's code beside the values of a property list. Work is done when run() is called, as
// the service does it on its queue.
#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "plist/Value.h"

namespace tarn::fuzzing {

using Payload = std::map<std::string, plist::Value>;
using Identifiers = std::optional<std::vector<std::int64_t>>;

// A message, or one as it lies in a log.
struct ModelRecord {
  Payload payload;
  std::uint32_t category = 0;
  std::uint16_t type = 0;
};

struct ModelSession {
  std::int64_t reporterID = 0;
  bool isSingle = false;
  bool started = false;
  int type = 65535;
  Payload configuration;
  std::vector<ModelRecord> log;
  Payload previous;
  std::int64_t total = 0;
  std::optional<int> heldReply;
  bool earlyRuns = false;
  bool lateExists = false;
  bool lateRuns = false;
};

struct ModelClient {
  std::vector<std::shared_ptr<ModelSession>> sessions;  // in the order of their first making
};

class ClientsModel {
 public:
  using Client = std::shared_ptr<ModelClient>;

  explicit ClientsModel(bool isInternal) : isInternal_(isInternal) {}

  // Each operation of the remote interface, with the number of its reply.
  void create(const Client& client, std::int64_t reporterID, int reply);
  void retype(const Client& client, int type, std::int64_t reporterID, int reply);
  void askType(const Client& client, std::int64_t reporterID, int reply);
  void configure(const Client& client, const Payload& configuration, std::int64_t reporterID, int reply);
  void start(const Client& client, std::int64_t reporterID, int reply);
  void send(ModelRecord message, const Identifiers& reporterIDs, int reply);
  void stop(const Client& client, std::int64_t reporterID, int reply);
  void destroy(const Client& client, std::int64_t reporterID, int reply);
  void validate(const Client& client, std::int64_t reporterID, int reply);
  void askReporters(int reply);

  Client connect();
  void lose(const Client& client);
  void setReportingEnabled(bool enabled) { isEnabled_ = enabled; }
  void run();
  void advance(std::int64_t nanoseconds);

  double now() const { return 1750000000.0 + static_cast<double>(nanoseconds_) / 1e9; }
  const std::vector<Client>& clients() const { return clients_; }
  const std::vector<std::string>& trail() const { return trail_; }

  static std::string textOf(const Payload& payload);

 private:
  using Session = std::shared_ptr<ModelSession>;

  void later(std::function<void()> work) { work_.push_back(std::move(work)); }
  void note(std::string text) { trail_.push_back(std::move(text)); }
  void answer(int reply, const std::string& text) { note("reply " + std::to_string(reply) + ": " + text); }
  void finishStart(ModelSession& session);

  static Session own(const ModelClient& client, std::int64_t reporterID);
  Session anywhere(const ModelClient& client, std::int64_t reporterID) const;
  Session listed(std::int64_t reporterID) const;
  Session make(std::int64_t reporterID, bool isSingle);
  std::vector<Session> receivers(const Identifiers& reporterIDs);
  void checkSingle();

  void startSession(ModelSession& session);
  void stopSession(ModelSession& session);
  void take(ModelSession& session, ModelRecord message);
  void mark(ModelSession& session, bool isStart) const;
  void stamp(Payload& payload) const;

  const bool isInternal_;
  bool isEnabled_ = true;
  std::int64_t nanoseconds_ = 0;
  std::deque<std::function<void()>> work_;
  std::vector<Client> clients_;
  Session single_;
  std::int64_t singleUsed_ = 0;
  std::optional<std::int64_t> nextCheck_;
  std::vector<std::string> trail_;
};

}  // namespace tarn::fuzzing
