// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/JetStreamSource.h"

#include <utility>

#include "fleet/format/Again.h"

namespace tarn::fleet {

namespace {

constexpr std::int64_t kNanoseconds = 1'000'000'000;
constexpr std::int64_t kFlushMilliseconds = 2000;
// For the library's threads to end.
constexpr std::int64_t kCloseMilliseconds = 5000;

}  // namespace

JetStreamSource::~JetStreamSource() {
  letGo();
  subscription_.reset();
  context_.reset();
  if (connection_) {
    natsConnection_Close(connection_.get());
  }
  connection_.reset();
  nats_CloseAndWait(kCloseMilliseconds);
}

Status JetStreamSource::open() {
  auto connection = connectToNats(configuration_.server, "tarnreporting-collect");
  if (connection.failed()) return connection.error;
  connection_ = std::move(connection.value);
  jsCtx* context = nullptr;
  if (const natsStatus status = natsConnection_JetStream(&context, connection_.get(), nullptr); status != NATS_OK) {
    return natsError("JetStream", status);
  }
  context_.reset(context);
  return {};
}

// The consumer is made where there is none, and is the same for all who ask for it.
Status JetStreamSource::join() {
  jsConsumerConfig consumer;
  jsConsumerConfig_Init(&consumer);
  consumer.Durable = configuration_.consumer.c_str();
  consumer.AckPolicy = js_AckExplicit;
  consumer.AckWait = configuration_.answerSeconds * kNanoseconds;
  consumer.MaxAckPending = configuration_.mostUnacknowledged;
  const std::string subject = configuration_.server.subject + ".>";
  consumer.FilterSubject = subject.c_str();
  const char* const stream = configuration_.stream.c_str();
  jsErrCode code{};
  if (const natsStatus status = js_AddConsumer(nullptr, context_.get(), stream, &consumer, nullptr, &code);
      status != NATS_OK) {
    return natsError(configuration_.stream, status);
  }
  jsSubOptions options;
  jsSubOptions_Init(&options);
  options.Stream = stream;
  options.Consumer = configuration_.consumer.c_str();
  natsSubscription* subscription = nullptr;
  if (const natsStatus status = js_PullSubscribe(&subscription, context_.get(), subject.c_str(),
                                                 configuration_.consumer.c_str(), nullptr, &options, &code);
      status != NATS_OK) {
    return natsError(configuration_.consumer, status);
  }
  subscription_.reset(subscription);
  return {};
}

Status JetStreamSource::fetch(std::chrono::milliseconds longest) {
  letGo();
  if (natsConnection_Status(connection_.get()) != NATS_CONN_STATUS_CONNECTED) {
    const char* why = nullptr;
    natsConnection_GetLastError(connection_.get(), &why);
    const std::string reason = why != nullptr && *why != '\0' ? why : "no server answers";
    return Error{0, configuration_.server.urls + ": " + reason};
  }
  if (!subscription_) {
    if (Status joined = join(); joined.failed()) return joined;
  }
  natsMsgList list{};
  const natsStatus status = natsSubscription_Fetch(
      &list, subscription_.get(), static_cast<int>(configuration_.groupMessages), longest.count(), nullptr);
  for (int i = 0; i < list.Count; ++i) {
    natsMsg* const message = std::exchange(list.Msgs[i], nullptr);
    held_.emplace_back(message);
    jsMsgMetaData* about = nullptr;
    const bool isKnown = natsMsg_GetMetaData(&about, message) == NATS_OK;
    messages_.push_back({configuration_.stream,
                         isKnown ? about->Sequence.Stream : 0,
                         natsMsg_GetSubject(message),
                         {natsMsg_GetData(message), static_cast<std::size_t>(natsMsg_GetDataLength(message))}});
    jsMsgMetaData_Destroy(about);
  }
  natsMsgList_Destroy(&list);
  if (status == NATS_OK || status == NATS_TIMEOUT) return {};
  // The consumer may be gone, or led by another server now.
  subscription_.reset();
  return natsError(configuration_.consumer, status);
}

void JetStreamSource::acknowledge(const std::vector<Refusal>& refused) {
  std::vector<bool> isRefused(held_.size());
  for (const Refusal& refusal : refused) {
    isRefused[refusal.message] = true;
  }
  // Lost ones are no harm: the message comes again, and is there already.
  for (std::size_t i = 0; i < held_.size(); ++i) {
    if (isRefused[i]) {
      natsMsg_Term(held_[i].get(), nullptr);
    } else {
      natsMsg_Ack(held_[i].get(), nullptr);
    }
  }
  letGo();
}

void JetStreamSource::giveBack() {
  for (const NatsOwned<natsMsg>& message : held_) {
    natsMsg_Nak(message.get(), nullptr);
  }
  natsConnection_FlushTimeout(connection_.get(), kFlushMilliseconds);
  letGo();
}

Status JetStreamSource::ask(const std::string& device, const std::vector<recorder::IdRange>& ranges) {
  const std::string subject = againSubject(configuration_.server.subject, device);
  const std::string bytes = packAgain(ranges);
  const natsStatus status =
      natsConnection_Publish(connection_.get(), subject.c_str(), bytes.data(), static_cast<int>(bytes.size()));
  return status == NATS_OK ? Status() : Status(natsError(subject, status));
}

void JetStreamSource::letGo() {
  messages_.clear();
  held_.clear();
}

}  // namespace tarn::fleet
