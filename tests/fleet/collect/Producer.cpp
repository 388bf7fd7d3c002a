// SPDX-License-Identifier: Apache-2.0
// Sends what a made-up fleet would, to a stream or as files of a folder, and prints as JSON what must come of it.
#include <nats/nats.h>

#include <CLI/CLI.hpp>
#include <chrono>
#include <cstdio>
#include <fstream>
#include <iostream>

#include "fleet/publish/NatsConnection.h"
#include "tests/fleet/collect/MadeUpFleet.h"
#include "tools/ctl/terminal/StopRequest.h"

namespace tarn::testing {
namespace {

constexpr std::chrono::duration<double> kPause(0.1);

struct Message {
  std::string subject, id, bytes;
};

class Sender {
 public:
  virtual ~Sender() = default;
  virtual bool send(const Message& message) = 0;
};

class FolderSender final : public Sender {
 public:
  explicit FolderSender(std::string folder) : folder_(std::move(folder)) {}
  bool send(const Message& message) override {
    std::ofstream file(folder_ + "/" + std::to_string(next_++) + ".tnf", std::ios::binary);
    return static_cast<bool>(file.write(message.bytes.data(), static_cast<std::streamsize>(message.bytes.size())));
  }

 private:
  const std::string folder_;
  int next_ = 100'000;
};

// Each until it is acknowledged, however often the server goes.
class StreamSender final : public Sender {
 public:
  explicit StreamSender(const std::string& url) {
    fleet::ServerSettings settings;
    settings.urls = url;
    auto connection = fleet::connectToNats(settings, "producer");
    if (connection.failed()) return;
    connection_ = std::move(connection.value);
    jsCtx* context = nullptr;
    if (natsConnection_JetStream(&context, connection_.get(), nullptr) == NATS_OK) {
      context_.reset(context);
    }
  }
  bool send(const Message& message) override {
    if (!context_) return false;
    jsPubOptions options;
    jsPubOptions_Init(&options);
    options.MsgId = message.id.c_str();
    options.MaxWait = 2000;
    const auto until = std::chrono::steady_clock::now() + std::chrono::minutes(2);
    while (std::chrono::steady_clock::now() < until) {
      jsPubAck* acknowledgement = nullptr;
      if (js_Publish(&acknowledgement, context_.get(), message.subject.c_str(), message.bytes.data(),
                     static_cast<int>(message.bytes.size()), &options, nullptr) == NATS_OK) {
        // Without a number the server knows the message and doesn't have it.
        const bool isThere = acknowledgement->Sequence > 0;
        jsPubAck_Destroy(acknowledgement);
        if (isThere) return true;
      }
      ctl::pauseUnlessStopped(kPause);
    }
    return false;
  }

 private:
  fleet::NatsOwned<natsConnection> connection_;
  fleet::NatsOwned<jsCtx> context_;
};

// So many messages a second and no more; 0: as many as are taken.
class Pace {
 public:
  explicit Pace(double aSecond) : aSecond_(aSecond), next_(std::chrono::steady_clock::now()) {}
  void wait() {
    if (aSecond_ <= 0) return;
    ctl::pauseUnlessStopped(next_ - std::chrono::steady_clock::now());
    next_ +=
        std::chrono::duration_cast<std::chrono::steady_clock::duration>(std::chrono::duration<double>(1 / aSecond_));
  }

 private:
  const double aSecond_;
  std::chrono::steady_clock::time_point next_;
};

// What no device of ours would send: no message, one whose payload is no JSON, and one whose texts no database takes.
std::vector<Message> oddMessages(fleet::MessagePacker& packer) {
  std::vector<Message> odd{{"tarnreporting.odd", "odd1", "this isn't one"}};
  fleet::v1::Batch batch;
  batch.set_device(std::string(fleet::kDeviceBytes, '\xee'));
  batch.set_looked_at(1);
  batch.set_first(1);
  batch.set_last(1);
  fleet::v1::Kind& kind = *batch.add_kinds();
  kind.set_backend("tally");
  kind.set_name(std::string("na\0me\xff", 6));
  kind.set_detail("{}");
  fleet::v1::Event& event = *batch.add_events();
  event.set_time(1795000000);
  event.set_payload(R"({"a":"\u0000\ud800x"})");
  odd.push_back({"tarnreporting.odd", "odd2", packer.pack(batch).value.bytes});
  batch.set_device(std::string(fleet::kDeviceBytes, '\xef'));
  batch.mutable_events(0)->set_payload(R"({"a":)");
  odd.push_back({"tarnreporting.odd", "odd3", packer.pack(batch).value.bytes});
  return odd;
}

void tell(const FleetTruth& truth) {
  std::printf(
      "{\"made\":%lld,\"events\":%lld,\"gaps\":%lld,\"left_out\":%lld,\"sessions\":%lld,\"overloads\":%lld,"
      "\"messages\":%lld,\"play_seconds\":%.2f}\n",
      static_cast<long long>(truth.made), static_cast<long long>(truth.events), static_cast<long long>(truth.gaps),
      static_cast<long long>(truth.leftOut), static_cast<long long>(truth.sessions),
      static_cast<long long>(truth.overloads), static_cast<long long>(truth.messages), truth.playSeconds);
}

int run(const FleetShape& shape, double aSecond, Sender& sender, bool isOdd) {
  const MadeUpFleet made(shape);
  fleet::MessagePacker packer;
  Pace pace(aSecond);
  std::vector<Message> odd = isOdd ? oddMessages(packer) : std::vector<Message>();
  for (std::size_t i = 0; i < made.messages(); ++i) {
    pace.wait();
    fleet::v1::Batch batch = made.batch(i);
    auto packed = packer.pack(batch);
    // By its number: what comes again is to arrive, since a stream knows only so long what it had.
    const Message message{"tarnreporting.d" + std::to_string(made.number(i) % 100), std::to_string(made.number(i)),
                          std::move(packed.value.bytes)};
    const bool isSent = sender.send(message) && (i >= odd.size() || sender.send(odd[i]));
    if (!isSent) return 1;
  }
  tell(made.truth());
  return 0;
}

}  // namespace
}  // namespace tarn::testing

int main(int argumentCount, char** arguments) {
  using namespace tarn::testing;
  FleetShape shape;
  std::string folder, url;
  double aSecond = 0;
  bool isOdd = false;
  CLI::App app;
  app.add_option("--devices", shape.devices);
  app.add_option("--ids", shape.ids);
  app.add_option("--batch", shape.batch);
  app.add_option("--repeat", shape.repeat);
  app.add_option("--seed", shape.seed);
  app.add_option("--begin", shape.begin);
  app.add_option("--a-second", aSecond);
  app.add_option("--folder", folder);
  app.add_option("--url", url);
  app.add_flag("--odd", isOdd);
  CLI11_PARSE(app, argumentCount, arguments);
  if (!folder.empty()) {
    FolderSender sender(folder);
    return run(shape, aSecond, sender, isOdd);
  }
  StreamSender sender(url);
  return run(shape, aSecond, sender, isOdd);
}
