// SPDX-License-Identifier: Apache-2.0
#include "fleet/publish/JetStreamPublisher.h"

#include <unordered_map>
#include <utility>

#include "fleet/format/Again.h"
#include "plist/ThreadSafety.h"

namespace tarn::fleet {

namespace {

constexpr std::int64_t kMilliseconds = 1000;
constexpr std::int64_t kMostPending = 4096;
// For the library's threads to end.
constexpr std::int64_t kCloseMilliseconds = 5000;
// Between two tries to connect when nothing is to be published.
constexpr std::chrono::minutes kBetweenTries{1};
// What is beyond will be asked for another time.
constexpr std::size_t kMostAsked = 4 * kMostRanges;

}  // namespace

// What the library's threads reach.
class JetStreamPublisher::Answers {
 public:
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
  // Nothing that is on its way will be answered.
  void lose(const Error& why) {
    const MutexLock lock(mutex_);
    for (const auto& [id, number] : numbers_) {
      outcomes_.push_back({number, why});
    }
    numbers_.clear();
  }
  void takeAsked(std::vector<recorder::IdRange>& ranges) {
    const MutexLock lock(mutex_);
    ranges.insert(ranges.end(), asked_.begin(), asked_.end());
    asked_.clear();
  }
  // One of the library's threads: somebody asks. What can't be read is nobody's who could be told.
  static void heard(natsConnection*, natsSubscription*, natsMsg* message, void* answers) {
    const NatsOwned<natsMsg> owned(message);
    const auto ranges =
        unpackAgain({natsMsg_GetData(message), static_cast<std::size_t>(natsMsg_GetDataLength(message))});
    static_cast<Answers*>(answers)->ask(ranges.value);
  }
  // One of the library's threads: `acknowledgement` of the message, or why there is none.
  static void acknowledged(jsCtx*, natsMsg* message, jsPubAck* acknowledgement, jsPubAckErr* error, void* answers) {
    const NatsOwned<natsMsg> owned(message);
    const char* id = nullptr;
    if (natsMsgHeader_Get(message, "Nats-Msg-Id", &id) != NATS_OK) return;
    Status status;
    if (acknowledgement == nullptr) {
      const bool hasText = error != nullptr && error->ErrText != nullptr;
      status = Error{error != nullptr ? error->ErrCode : 0, hasText ? error->ErrText : "no acknowledgement"};
    } else if (acknowledgement->Sequence == 0) {
      // It lost the lead of the stream between taking down the id and proposing the message. The id is forgotten when
      // the stream's window for repeats is over, or told with a number when the message is there after all.
      status = Error{0, "the server knows the message and doesn't have it"};
    }
    static_cast<Answers*>(answers)->take(id, std::move(status));
  }

 private:
  void ask(const std::vector<recorder::IdRange>& ranges) {
    const MutexLock lock(mutex_);
    if (asked_.size() + ranges.size() <= kMostAsked) {
      asked_.insert(asked_.end(), ranges.begin(), ranges.end());
    }
  }
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
  std::vector<recorder::IdRange> asked_ TARN_GUARDED_BY(mutex_);
};

JetStreamPublisher::JetStreamPublisher(const ServerSettings& settings, const std::string& device)
    : settings_(settings),
      subject_(settings.subject + "." + device),
      againSubject_(againSubject(settings.subject, device)),
      answers_(std::make_unique<Answers>()) {}

JetStreamPublisher::~JetStreamPublisher() {
  disconnect();
  nats_CloseAndWait(kCloseMilliseconds);
}

Status JetStreamPublisher::open() {
  return checkNatsSettings(settings_);
}

void JetStreamPublisher::disconnect() {
  if (connection_) {
    natsConnection_Close(connection_.get());
  }
  again_.reset();
  context_.reset();
  connection_.reset();
}

Status JetStreamPublisher::connect() {
  disconnect();
  auto connection = connectToNatsOnce(settings_, "tarnreporting-export");
  if (connection.failed()) return connection.error;
  connection_ = std::move(connection.value);
  jsOptions options;
  jsOptions_Init(&options);
  options.PublishAsync.AckHandler = &Answers::acknowledged;
  options.PublishAsync.AckHandlerClosure = answers_.get();
  options.PublishAsync.MaxPending = kMostPending;
  jsCtx* context = nullptr;
  if (const natsStatus status = natsConnection_JetStream(&context, connection_.get(), &options); status != NATS_OK) {
    return natsError("JetStream", status);
  }
  context_.reset(context);
  natsSubscription* again = nullptr;
  if (const natsStatus status =
          natsConnection_Subscribe(&again, connection_.get(), againSubject_.c_str(), &Answers::heard, answers_.get());
      status != NATS_OK) {
    return natsError(againSubject_, status);
  }
  again_.reset(again);
  return {};
}

bool JetStreamPublisher::isConnected() const {
  return context_ && natsConnection_Status(connection_.get()) == NATS_CONN_STATUS_CONNECTED;
}

Status JetStreamPublisher::publish(std::uint64_t number, const std::string& id, const std::string& bytes) {
  if (!isConnected()) {
    if (Status connected = connect(); connected.failed()) return connected;
  }
  answers_->expect(id, number);
  jsPubOptions options;
  jsPubOptions_Init(&options);
  options.MsgId = id.c_str();
  options.MaxWait = settings_.answerSeconds * kMilliseconds;
  const natsStatus status =
      js_PublishAsync(context_.get(), subject_.c_str(), bytes.data(), static_cast<int>(bytes.size()), &options);
  return status == NATS_OK ? Status() : Status(natsError(settings_.urls, status));
}

void JetStreamPublisher::wait(std::chrono::milliseconds longest, std::vector<Outcome>& outcomes) {
  if (context_ && !isConnected()) {
    const char* why = nullptr;
    natsConnection_GetLastError(connection_.get(), &why);
    const std::string reason = why != nullptr && *why != '\0' ? why : "the connection was lost";
    disconnect();
    answers_->lose(Error{0, settings_.urls + ": " + reason});
  }
  answers_->wait(longest, outcomes);
}

void JetStreamPublisher::asked(std::vector<recorder::IdRange>& ranges) {
  const auto now = std::chrono::steady_clock::now();
  if (!isConnected() && now >= nextTry_) {
    nextTry_ = now + kBetweenTries;
    static_cast<void>(connect());  // why it can't is told when something is to be published
  }
  answers_->takeAsked(ranges);
}

}  // namespace tarn::fleet
