// SPDX-License-Identifier: Apache-2.0
#include "fleet/publish/JetStreamPublisher.h"

#include <unordered_map>
#include <utility>

#include "fleet/publish/NatsConnection.h"
#include "plist/ThreadSafety.h"

namespace tarn::fleet {

namespace {

constexpr std::int64_t kAnswerMilliseconds = 8000;
constexpr std::int64_t kMostPending = 4096;
// For the library's threads to end.
constexpr std::int64_t kCloseMilliseconds = 5000;

}  // namespace

// What the library's threads reach. They are over before it is.
class JetStreamPublisher::Link {
 public:
  NatsOwned<natsConnection> connection;
  NatsOwned<jsCtx> context;

  ~Link() {
    if (connection) {
      natsConnection_Close(connection.get());
    }
    context.reset();
    connection.reset();
    nats_CloseAndWait(kCloseMilliseconds);
  }

  void expect(const std::string& id, std::uint64_t number) {
    const MutexLock lock(mutex_);
    numbers_[id] = number;
  }
  void wait(std::chrono::milliseconds longest, std::vector<Outcome>& outcomes) {
    const MutexLock lock(mutex_);
    if (outcomes_.empty() && longest.count() > 0) {
      arrived_.waitFor(mutex_, longest, [this]() TARN_REQUIRES(mutex_) { return !outcomes_.empty(); });
    }
    outcomes.insert(outcomes.end(), std::make_move_iterator(outcomes_.begin()),
                    std::make_move_iterator(outcomes_.end()));
    outcomes_.clear();
  }
  // One of the library's threads: `acknowledgement` of the message, or why there is none.
  static void acknowledged(jsCtx*, natsMsg* message, jsPubAck* acknowledgement, jsPubAckErr* error, void* link) {
    const NatsOwned<natsMsg> owned(message);
    const char* id = nullptr;
    if (natsMsgHeader_Get(message, "Nats-Msg-Id", &id) != NATS_OK) return;
    Status status;
    if (acknowledgement == nullptr) {
      const bool hasText = error != nullptr && error->ErrText != nullptr;
      status = Error{error != nullptr ? error->ErrCode : 0, hasText ? error->ErrText : "no acknowledgement"};
    }
    static_cast<Link*>(link)->take(id, std::move(status));
  }

 private:
  void take(const char* id, Status status) {
    const MutexLock lock(mutex_);
    const auto known = numbers_.find(id);
    if (known == numbers_.end()) return;
    const bool isDone = status.ok();
    outcomes_.push_back({known->second, std::move(status)});
    if (isDone) {
      numbers_.erase(known);
    }
    arrived_.notifyOne();
  }

  Mutex mutex_;
  ConditionVariable arrived_;
  std::vector<Outcome> outcomes_ TARN_GUARDED_BY(mutex_);
  std::unordered_map<std::string, std::uint64_t> numbers_ TARN_GUARDED_BY(mutex_);
};

JetStreamPublisher::JetStreamPublisher(const ServerSettings& settings, const std::string& device)
    : settings_(settings), subject_(settings.subject + "." + device) {}

JetStreamPublisher::~JetStreamPublisher() = default;

Status JetStreamPublisher::open() {
  auto connection = connectToNats(settings_, "tarnreporting-export");
  if (connection.failed()) return connection.error;
  link_ = std::make_unique<Link>();
  link_->connection = std::move(connection.value);
  jsOptions options;
  jsOptions_Init(&options);
  options.PublishAsync.AckHandler = &Link::acknowledged;
  options.PublishAsync.AckHandlerClosure = link_.get();
  options.PublishAsync.MaxPending = kMostPending;
  jsCtx* context = nullptr;
  if (const natsStatus status = natsConnection_JetStream(&context, link_->connection.get(), &options);
      status != NATS_OK) {
    return natsError("JetStream", status);
  }
  link_->context.reset(context);
  return {};
}

Status JetStreamPublisher::publish(std::uint64_t number, const std::string& id, const std::string& bytes) {
  natsConnection* const connection = link_->connection.get();
  if (natsConnection_Status(connection) != NATS_CONN_STATUS_CONNECTED) {
    const char* why = nullptr;
    natsConnection_GetLastError(connection, &why);
    const std::string reason = why != nullptr && *why != '\0' ? why : "no server answers";
    return Error{0, settings_.urls + ": " + reason};
  }
  link_->expect(id, number);
  jsPubOptions options;
  jsPubOptions_Init(&options);
  options.MsgId = id.c_str();
  options.MaxWait = kAnswerMilliseconds;
  const natsStatus status =
      js_PublishAsync(link_->context.get(), subject_.c_str(), bytes.data(), static_cast<int>(bytes.size()), &options);
  return status == NATS_OK ? Status() : Status(natsError(settings_.urls, status));
}

void JetStreamPublisher::wait(std::chrono::milliseconds longest, std::vector<Outcome>& outcomes) {
  link_->wait(longest, outcomes);
}

}  // namespace tarn::fleet
