// SPDX-License-Identifier: Apache-2.0
// One message and its reply at a time: on one processor, where it is all work and no waking of another processor, and
// where the scheduler puts the processes.
#include "bench/Measure.h"
#include "bench/ServiceReceiver.h"
#include "bench/figures/Figures.h"
#include "bench/peers/BareReceiver.h"
#include "bench/peers/BusReceiver.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kTrips = 10'000;
constexpr double kMedianTarget = 7.5e-6;
constexpr double kTailTarget = 15e-6;
constexpr double kPlacedTarget = 1.15;

// The medians over the rounds of each round's median and 99th percentile.
class Trips {
 public:
  explicit Trips(Receiver& receiver) : receiver_(receiver) {}

  void measure(std::size_t count) {
    Samples samples;
    samples.reserve(count);
    for (std::size_t i = 0; i < count; ++i) {
      receiver_.prepare();
      const double start = nowSeconds();
      receiver_.roundTrip();
      samples.push_back(nowSeconds() - start);
    }
    medians_.push_back(percentile(samples, 0.5));
    tails_.push_back(percentile(std::move(samples), 0.99));
  }
  double middle() const { return median(medians_); }
  double tail() const { return median(tails_); }

 private:
  Receiver& receiver_;
  Samples medians_;
  Samples tails_;
};

struct Results {
  double middle;
  double tail;
};

struct AllResults {
  Results ours;
  Results bare;
  Results bus;
};

AllResults measureAll(const Settings& settings) {
  ServiceReceiver service(settings, {}, Writes::OneEach);
  BareReceiver bare(Writes::OneEach);
  BusReceiver bus;
  Trips ours(service);
  Trips bareTrips(bare);
  Trips busTrips(bus);
  const std::size_t count = settings.count(kTrips);
  for (Trips* trips : {&ours, &bareTrips, &busTrips}) {
    Trips(*trips).measure(count / 10 + 1);  // not counted: caches and branches learn
  }
  for (int round = 0; round < settings.rounds; ++round) {
    for (Trips* trips : {&ours, &bareTrips, &busTrips}) {
      trips->measure(count);
    }
    service.forget();
  }
  return {{ours.middle(), ours.tail()}, {bareTrips.middle(), bareTrips.tail()}, {busTrips.middle(), busTrips.tail()}};
}

}  // namespace

void measureRoundTripOnOneProcessor(const Settings& settings, Table& table) {
  const OneProcessor one;
  const AllResults all = measureAll(settings);
  const auto row = [&](const std::string& part, const std::string& peer, double ours, double theirs) {
    return Row{"round trip, one processor, " + part,
               microseconds(ours),
               peer + " " + microseconds(theirs),
               times(ours / theirs),
               "",
               {}};
  };
  Row middle = row("median", "bare", all.ours.middle, all.bare.middle);
  middle.target = "<= 7.5 us";
  table.addWithTarget(middle, all.ours.middle, kMedianTarget);
  table.add(row("median", "sd-bus", all.ours.middle, all.bus.middle));
  Row tail = row("p99", "bare", all.ours.tail, all.bare.tail);
  tail.target = "<= 15 us";
  table.addWithTarget(tail, all.ours.tail, kTailTarget);
  table.add(row("p99", "sd-bus", all.ours.tail, all.bus.tail));
}

void measureRoundTrip(const Settings& settings, Table& table) {
  const AllResults all = measureAll(settings);
  const double ratio = all.ours.middle / all.bare.middle;
  const auto row = [](const std::string& part, const std::string& peer, double ours, double theirs) {
    return Row{"round trip, placed freely, " + part,
               microseconds(ours),
               peer + " " + microseconds(theirs),
               times(ours / theirs),
               "",
               {}};
  };
  Row middle = row("median", "bare", all.ours.middle, all.bare.middle);
  middle.target = "<= 1.15 x bare";
  table.addWithTarget(middle, ratio, kPlacedTarget);
  table.add(row("median", "sd-bus", all.ours.middle, all.bus.middle));
  table.add(row("p99", "bare", all.ours.tail, all.bare.tail));
}

}  // namespace tarn::bench
