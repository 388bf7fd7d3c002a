// SPDX-License-Identifier: Apache-2.0
// One message and its reply at a time: on one processor, where it is all work and no waking of another processor, and
// where the scheduler puts the processes.
#include <initializer_list>
#include <optional>

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
    receiver_.forget();
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

// Takes turns; what comes before the rounds isn't counted, since caches and branches learn.
void measureInTurns(const Settings& settings, std::initializer_list<Trips*> all) {
  const std::size_t count = settings.count(kTrips);
  for (Trips* trips : all) {
    Trips(*trips).measure(count / 10 + 1);
  }
  for (int round = 0; round < settings.rounds; ++round) {
    for (Trips* trips : all) {
      trips->measure(count);
    }
  }
}

AllResults measureAll(const Settings& settings) {
  ServiceReceiver service(settings, {}, Writes::OneEach);
  BareReceiver bare(Writes::OneEach);
  BusReceiver bus;
  Trips ours(service);
  Trips bareTrips(bare);
  Trips busTrips(bus);
  measureInTurns(settings, {&ours, &bareTrips, &busTrips});
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

// Without a service: what a loop that answers a lone client could gain by waiting in another way.
void measureTurns(const Settings& settings, Table& table) {
  const OneProcessor one;
  BareReceiver receive(Writes::OneEach);
  BareReceiver epoll(Writes::OneEach, BareTurn::Epoll);
  Trips receiveTrips(receive);
  Trips epollTrips(epoll);
  std::optional<BareReceiver> ring;
  std::optional<Trips> ringTrips;
  if (isThere(BareTurn::Ring)) {
    ring.emplace(Writes::OneEach, BareTurn::Ring);
    ringTrips.emplace(*ring);
    measureInTurns(settings, {&receiveTrips, &epollTrips, &*ringTrips});
  } else {
    measureInTurns(settings, {&receiveTrips, &epollTrips});
  }
  const auto add = [&](const std::string& way, const Trips& trips) {
    table.add(rowOf("round trip, one processor, bare by " + way, "bare", trips.medians(), receiveTrips.medians()));
    table.add(
        rowOf("round trip, one processor, bare by " + way + ", p99", "bare", trips.tails(), receiveTrips.tails()));
  };
  add("epoll", epollTrips);
  if (ringTrips) {
    add("io_uring", *ringTrips);
  }
}

}  // namespace tarn::bench
