// SPDX-License-Identifier: Apache-2.0
// Many messages under way at once, a reply to each: how many a second, and what one costs the receiving process.
#include "bench/Measure.h"
#include "bench/ServiceReceiver.h"
#include "bench/figures/Figures.h"
#include "bench/peers/BareReceiver.h"
#include "bench/peers/BusReceiver.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kMessages = 100'000;
constexpr std::size_t kBusMessages = 20'000;
constexpr std::size_t kOutstanding = 64;
constexpr std::size_t kUnbounded = 16'384;
constexpr double kStreamTarget = 400e3;
constexpr double kGatheredTarget = 600e3;
constexpr double kProcessorTarget = 2.0e-6;

class Flow {
 public:
  Flow(Receiver& receiver, std::size_t count, std::size_t outstanding)
      : receiver_(receiver), count_(count), outstanding_(outstanding) {
    receiver_.stream(count_ / 10 + 1, outstanding_);  // not counted: caches and branches learn
  }

  void measure() {
    const double processorBefore = receiver_.processorSeconds();
    const double start = nowSeconds();
    receiver_.stream(count_, outstanding_);
    const auto messages = static_cast<double>(count_);
    rates_.push_back(messages / (nowSeconds() - start));
    processor_.push_back((receiver_.processorSeconds() - processorBefore) / messages);
    receiver_.forget();
  }
  double rate() const { return median(rates_); }
  double processor() const { return median(processor_); }
  const Samples& rates() const { return rates_; }
  const Samples& processors() const { return processor_; }

 private:
  Receiver& receiver_;
  std::size_t count_;
  std::size_t outstanding_;
  Samples rates_;
  Samples processor_;
};

Row rateRow(const std::string& figure, const std::string& peer, const Flow& ours, const Flow& theirs) {
  return {figure,
          perSecond(ours.rate()),
          peer + " " + perSecond(theirs.rate()),
          timesOfRounds(ours.rates(), theirs.rates()),
          "",
          {}};
}

Row processorRow(const std::string& figure, const std::string& peer, const Flow& ours, const Flow& theirs) {
  return {figure,
          microseconds(ours.processor()),
          peer + " " + microseconds(theirs.processor()),
          timesOfRounds(ours.processors(), theirs.processors()),
          "",
          {}};
}

void addGathered(const Settings& settings, Table& table, const std::string& name, std::size_t outstanding,
                 double target) {
  ServiceReceiver service(settings, {}, Writes::Gathered);
  BareReceiver bareReceiver(Writes::Gathered);
  Flow ours(service, settings.count(kMessages), outstanding);
  Flow bare(bareReceiver, settings.count(kMessages), outstanding);
  for (int round = 0; round < settings.rounds; ++round) {
    ours.measure();
    bare.measure();
  }
  Row rate = rateRow(name, "bare", ours, bare);
  rate.target = target > 0 ? ">= 600 k/s" : "";
  if (target > 0) {
    table.addWithTarget(rate, ours.rate(), target, true);
  } else {
    table.add(rate);
  }
  table.add(processorRow(name + ", processor time a message", "bare", ours, bare));
}

}  // namespace

void measureStream(const Settings& settings, Table& table) {
  ServiceReceiver service(settings, {}, Writes::OneEach);
  BareReceiver bareReceiver(Writes::OneEach);
  BusReceiver busReceiver;
  Flow ours(service, settings.count(kMessages), kOutstanding);
  Flow bare(bareReceiver, settings.count(kMessages), kOutstanding);
  Flow bus(busReceiver, settings.count(kBusMessages), kOutstanding);
  for (int round = 0; round < settings.rounds; ++round) {
    for (Flow* flow : {&ours, &bare, &bus}) {
      flow->measure();
    }
  }
  const std::string name = "64 outstanding, a write each";
  Row rate = rateRow(name, "bare", ours, bare);
  rate.target = ">= 400 k/s";
  table.addWithTarget(rate, ours.rate(), kStreamTarget, true);
  table.add(rateRow(name, "sd-bus", ours, bus));
  const std::string processorName = "processor time a message, nothing wanted";
  Row processor = processorRow(processorName, "bare", ours, bare);
  processor.target = "<= 2.0 us";
  table.addWithTarget(processor, ours.processor(), kProcessorTarget);
  table.add(processorRow(processorName, "sd-bus", ours, bus));
}

void measureGathered(const Settings& settings, Table& table) {
  addGathered(settings, table, "64 outstanding, writes gathered", kOutstanding, kGatheredTarget);
  addGathered(settings, table, "16384 outstanding, writes gathered", kUnbounded, 0);
}

}  // namespace tarn::bench
