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

// Each round's median and 99th percentile.
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
  // A sample of each round.
  const Samples& medians() const { return medians_; }
  const Samples& tails() const { return tails_; }

 private:
  Receiver& receiver_;
  Samples medians_;
  Samples tails_;
};

struct Results {
  Samples middle;
  Samples tail;
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
  return {
      {ours.medians(), ours.tails()}, {bareTrips.medians(), bareTrips.tails()}, {busTrips.medians(), busTrips.tails()}};
}

Row rowOf(const std::string& figure, const std::string& peer, const Samples& ours, const Samples& theirs) {
  return {
      figure, microseconds(median(ours)), peer + " " + microseconds(median(theirs)), timesOfRounds(ours, theirs), "",
      {}};
}

}  // namespace

void measureRoundTripOnOneProcessor(const Settings& settings, Table& table) {
  const OneProcessor one;
  const AllResults all = measureAll(settings);
  const auto row = [](const std::string& part, const std::string& peer, const Samples& ours, const Samples& theirs) {
    return rowOf("round trip, one processor, " + part, peer, ours, theirs);
  };
  Row middle = row("median", "bare", all.ours.middle, all.bare.middle);
  middle.target = "<= 7.5 us";
  table.addWithTarget(middle, median(all.ours.middle), kMedianTarget);
  table.add(row("median", "sd-bus", all.ours.middle, all.bus.middle));
  Row tail = row("p99", "bare", all.ours.tail, all.bare.tail);
  tail.target = "<= 15 us";
  table.addWithTarget(tail, median(all.ours.tail), kTailTarget);
  table.add(row("p99", "sd-bus", all.ours.tail, all.bus.tail));
}

void measureRoundTrip(const Settings& settings, Table& table) {
  const AllResults all = measureAll(settings);
  const double ratio = median(all.ours.middle) / median(all.bare.middle);
  const auto row = [](const std::string& part, const std::string& peer, const Samples& ours, const Samples& theirs) {
    return rowOf("round trip, placed freely, " + part, peer, ours, theirs);
  };
  Row middle = row("median", "bare", all.ours.middle, all.bare.middle);
  middle.target = "<= 1.15 x bare";
  table.addWithTarget(middle, ratio, kPlacedTarget);
  table.add(row("median", "sd-bus", all.ours.middle, all.bus.middle));
  table.add(row("p99", "bare", all.ours.tail, all.bare.tail));
}

}  // namespace tarn::bench
