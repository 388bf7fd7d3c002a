// SPDX-License-Identifier: Apache-2.0
// What posting to a shared ring costs the thread that posts, whatever becomes of the service, beside a tracepoint of
// the same fields, and what a message from a ring costs the service.
#include <sched.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <cstdio>
#include <functional>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "bench/Measure.h"
#include "bench/Poster.h"
#include "bench/Processes.h"
#include "bench/figures/Figures.h"
#include "clients/ring/RingProducer.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kPosts = 200'000;           // a round, of those that are timed
constexpr std::size_t kAllPosts = 10'000'000;     // of which the worst is told, once
constexpr std::size_t kStreamed = 500'000;        // of those that are counted
constexpr std::size_t kRecorded = 200'000;        // of those that are recorded too
constexpr std::size_t kBurst = 500;               // posts between two looks at whether the service has them
constexpr useconds_t kPauseMicroseconds = 4000;   // after each burst, where the service has something else to do
constexpr useconds_t kLifeMicroseconds = 50'000;  // of a service that is killed over and over
constexpr long kMostFileBytes = 262'144;          // of one without room on its disk
constexpr double kProcessorTarget = 0.7e-6;
constexpr double kRateTarget = 1.2e6;
constexpr double kRecordedRateTarget = 200e3;
constexpr double kWorstTarget = 20e3;   // in nanoseconds
constexpr double kTracerTarget = 0.25;  // of the tracepoint's time

using Spread = std::array<double, 3>;  // half, 999 of 1000, all

// Where the system allows it the thread has real-time priority, as an audio thread would.
void becomeRealTime() {
  const sched_param parameter{.sched_priority = 10};
  ::sched_setscheduler(0, SCHED_FIFO | SCHED_RESET_ON_FORK, &parameter);
}

// Nanoseconds that a call takes, half, 999 of 1000 and all of the calls at the most; the clock's own part is left in.
// `before` is called before each and not counted.
template <class Call, class Before>
Spread spread(std::size_t count, Call call, Before before) {
  Samples samples(count);
  for (std::size_t i = 0; i < count; ++i) {
    before(i);
    const double start = nowSeconds();
    call(i);
    samples[i] = (nowSeconds() - start) * 1e9;
  }
  return Spread{percentile(samples, 0.5), percentile(samples, 0.999), percentile(samples, 1)};
}

template <class Call>
Spread spread(std::size_t count, Call call) {
  return spread(count, call, [](std::size_t) {});
}

// The bytes of such a message into a ring that nobody reads and that is never full.
class BareRing {
 public:
  void post() {
    header_.taken = producer_.head();
    producer_.post(TARNRING_MESSAGE, sizeof message_,
                   [this](auto& content) { content.put(message_, sizeof message_); });
  }

 private:
  tarnring_header header_{};
  std::unique_ptr<std::byte[]> data_ = std::make_unique<std::byte[]>(Poster::kRingBytes);
  ring::RingProducer<> producer_{&header_, data_.get(), Poster::kRingBytes};
  char message_[208] = {};
};

enum State : std::size_t { kAlive, kStopped, kAbsent, kKilled, kFull, kStates };
constexpr std::array<const char*, kStates> kStateNames{"alive", "stopped", "absent", "killed over and over",
                                                       "without room on its disk"};

// Whether the thread rests between two bursts: while the service takes what was posted, or because nobody does. The
// first post after a rest finds the caches cold, so what stands beside it rests likewise.
constexpr bool rests(std::size_t state) {
  return state != kStopped;
}

// Of one round. Where there are two, the second is with rests.
struct Round {
  std::array<Spread, kStates> posts{};
  std::array<Spread, 2> bare{};
  Spread clock{};
  std::array<std::optional<Spread>, 2> tracepoint;
  double rate = 0;
  double processor = 0;
  std::vector<double> recorded;
};

// Times of posts to a service that takes them meanwhile.
Spread spreadWhileTaken(Poster& poster, std::size_t posts) {
  return spread(
      posts, [&](std::size_t i) { keep(poster.post(i)); },
      [&](std::size_t i) {
        if (i % kBurst == 0) {
          poster.waitUntilTaken();
        }
      });
}

// Of calls with a rest before each burst.
template <class Call>
Spread spreadWithPauses(std::size_t count, Call call) {
  return spread(count, call, [](std::size_t i) {
    if (i % kBurst == 0) {
      ::usleep(kPauseMicroseconds);
    }
  });
}

// Of posts to a service that may never take them; over some time.
Spread spreadOfPosts(const std::string& socketPath, std::size_t posts) {
  Poster poster(socketPath, 0);
  becomeRealTime();
  return spreadWithPauses(posts, [&](std::size_t i) { keep(poster.post(i)); });
}

// Of as many tracepoints; nothing where there is no tracer.
std::optional<Spread> spreadOfTracer([[maybe_unused]] const Settings& settings, [[maybe_unused]] useconds_t pause) {
#ifdef TARN_TRACER_RUNNER
  const TemporaryDirectory folder(settings.directory);
  const std::string command = std::string("\"" TARN_TRACER_RUNNER "\" \"") + folder.path() +
                              "\" \"" TARN_TRACER_PROGRAM "\" " + std::to_string(settings.count(kPosts)) + " " +
                              std::to_string(kBurst) + " " + std::to_string(pause);
  std::FILE* const output = ::popen(command.c_str(), "r");
  if (output == nullptr) return std::nullopt;
  Spread figures{};
  int recorded = 0;
  const int read = std::fscanf(output, "%lf %lf %lf %d", &figures[0], &figures[1], &figures[2], &recorded);
  ::pclose(output);
  if (read == 4 && recorded == 1) return figures;
#endif
  return std::nullopt;
}

void append(std::vector<double>& results, const Spread& figures) {
  results.insert(results.end(), figures.begin(), figures.end());
}

Spread take(std::vector<double>::const_iterator& from) {
  Spread figures{};
  for (double& figure : figures) {
    figure = *from++;
  }
  return figures;
}

// Messages a second until `wait(poster)` is done, and the service's processor time for one.
template <class Wait>
std::array<double, 2> stream(Poster& poster, pid_t service, std::size_t count, Wait wait) {
  const double processorBefore = processorSeconds(service);
  const double start = nowSeconds();
  for (std::size_t i = 0; i < count; ++i) {
    while (poster.post(i) == TARNREPORTING_DROPPED) {
      ::sched_yield();
    }
  }
  wait(poster);
  const auto messages = static_cast<double>(count);
  return {messages / (nowSeconds() - start), (processorSeconds(service) - processorBefore) / messages};
}

void measureWithService(const Settings& settings, const ServiceProcess& service, Round& round) {
  const std::size_t posts = settings.count(kPosts);
  const std::vector<double> results = measureInChild([&] {
    std::vector<double> figures;
    Poster poster(service.socketPath());
    for (std::size_t i = 0; i < kBurst; ++i) {
      poster.post(i);
    }
    poster.waitUntilTaken();
    for (const double figure :
         stream(poster, service.id(), settings.count(kStreamed), [](Poster& posted) { posted.waitUntilTaken(); })) {
      figures.push_back(figure);
    }
    becomeRealTime();
    append(figures, spreadWhileTaken(poster, posts));
    BareRing bare;
    append(figures, spread(posts, [&](std::size_t) { bare.post(); }));
    append(figures, spreadWithPauses(posts, [&](std::size_t) { bare.post(); }));
    append(figures, spread(posts, [](std::size_t i) { keep(i); }));
    ::kill(service.id(), SIGSTOP);
    append(figures, spread(posts, [&](std::size_t i) { keep(poster.post(i)); }));
    ::kill(service.id(), SIGCONT);
    return figures;
  });
  auto next = results.begin();
  round.rate = *next++;
  round.processor = *next++;
  round.posts[kAlive] = take(next);
  round.bare[0] = take(next);
  round.bare[1] = take(next);
  round.clock = take(next);
  round.posts[kStopped] = take(next);
}

Spread measureWithPauses(const Settings& settings, const std::string& socketPath,
                         const std::function<void()>& meanwhile = {}) {
  const std::vector<double> results = measureInChild(
      [&] {
        std::vector<double> figures;
        append(figures, spreadOfPosts(socketPath, settings.count(kPosts)));
        return figures;
      },
      meanwhile);
  auto next = results.begin();
  return take(next);
}

// The same with both events of each message recorded, until all are committed.
std::vector<double> measureRecorded(const Settings& settings) {
  const ServiceProcess service(settings, {.recordsEvents = true});
  return measureInChild([&] {
    Poster poster(service.socketPath());
    const auto figures =
        stream(poster, service.id(), settings.count(kRecorded), [](Poster& posted) { posted.waitUntilCommitted(); });
    return std::vector<double>(figures.begin(), figures.end());
  });
}

// Once: it takes long.
double worstOfAll(const Settings& settings, const ServiceProcess& service) {
  return measureInChild([&] {
    Poster poster(service.socketPath());
    becomeRealTime();
    return std::vector<double>{spreadWhileTaken(poster, settings.count(kAllPosts))[2]};
  })[0];
}

Round measureRound(const Settings& settings, const ServiceProcess& service) {
  Round round;
  measureWithService(settings, service, round);
  round.posts[kAbsent] = measureWithPauses(settings, settings.directory + "/nobody");
  {
    ServiceProcess doomed(settings, {});
    round.posts[kKilled] = measureWithPauses(settings, doomed.socketPath(), [&] {
      ::usleep(kLifeMicroseconds);
      doomed.killAndStart();
    });
  }
  {
    const ServiceProcess full(settings, {.recordsEvents = true, .mostFileBytes = kMostFileBytes});
    round.posts[kFull] = measureWithPauses(settings, full.socketPath());
  }
  round.recorded = measureRecorded(settings);
  round.tracepoint = {spreadOfTracer(settings, 0), spreadOfTracer(settings, kPauseMicroseconds)};
  return round;
}

// The median over the rounds of what `get` finds in each.
template <class Get>
double medianOf(const std::vector<Round>& rounds, Get get) {
  Samples samples;
  for (const Round& round : rounds) {
    samples.push_back(get(round));
  }
  return median(samples);
}

// What a post takes, the clock's own part taken off, beside a tracepoint likewise.
void addTracer(const std::vector<Round>& rounds, std::size_t part, const char* name, Table& table) {
  const double clock = medianOf(rounds, [](const Round& round) { return round.clock[0]; });
  for (std::size_t state = 0; state < kStates; ++state) {
    const double tracer =
        medianOf(rounds, [&](const Round& round) { return (*round.tracepoint[rests(state)])[part]; }) - clock;
    const double ours = medianOf(rounds, [&](const Round& round) { return round.posts[state][part]; }) - clock;
    table.addWithTarget({std::string("the same without the clock, service ") + kStateNames[state] + ", " + name,
                         nanoseconds(ours),
                         "tracepoint " + nanoseconds(tracer),
                         times(ours / tracer),
                         "<= 0.25",
                         {}},
                        ours / tracer, kTracerTarget);
  }
}

void addPart(const std::vector<Round>& rounds, std::size_t part, const char* name, Table& table) {
  for (std::size_t state = 0; state < kStates; ++state) {
    const double bare = medianOf(rounds, [&](const Round& round) { return round.bare[rests(state)][part]; });
    const double ours = medianOf(rounds, [&](const Round& round) { return round.posts[state][part]; });
    table.add({std::string("post of a message, service ") + kStateNames[state] + ", " + name,
               nanoseconds(ours),
               "bare copy " + nanoseconds(bare),
               times(ours / bare),
               "",
               {}});
  }
  const double clock = medianOf(rounds, [&](const Round& round) { return round.clock[part]; });
  table.add({std::string("the clock around each of them, ") + name, nanoseconds(clock), {}, {}, "", {}});
}

}  // namespace

void measurePost(const Settings& settings, Table& table) {
  const ServiceProcess service(settings, {});
  std::vector<Round> rounds;
  for (int round = 0; round < settings.rounds; ++round) {
    rounds.push_back(measureRound(settings, service));
  }
  const bool traced = std::all_of(rounds.begin(), rounds.end(), [](const Round& round) {
    return round.tracepoint[0].has_value() && round.tracepoint[1].has_value();
  });
  if (!traced) {
    std::cerr << ", no tracepoint beside it: that needs liblttng-ust-dev and lttng-tools" << std::flush;
  }
  const std::array<const char*, 3> parts{"median", "p99.9", "worst"};
  for (std::size_t part = 0; part < parts.size(); ++part) {
    addPart(rounds, part, parts[part], table);
    if (traced && part < 2) {
      addTracer(rounds, part, parts[part], table);
    }
  }
  const double worst = worstOfAll(settings, service);
  table.addWithTarget({"post of a message, service alive, worst of " + std::to_string(settings.count(kAllPosts)),
                       nanoseconds(worst),
                       {},
                       {},
                       "<= 20 us",
                       {}},
                      worst, kWorstTarget);
  const double rate = medianOf(rounds, [](const Round& round) { return round.rate; });
  table.addWithTarget({"messages through a ring, nothing wanted", perSecond(rate), {}, {}, ">= 1.2 M/s", {}}, rate,
                      kRateTarget, true);
  const double processor = medianOf(rounds, [](const Round& round) { return round.processor; });
  table.addWithTarget(
      {"processor time a message through a ring, nothing wanted", microseconds(processor), {}, {}, "<= 0.7 us", {}},
      processor, kProcessorTarget);
  const double recorded = medianOf(rounds, [](const Round& round) { return round.recorded[0]; });
  table.addWithTarget(
      {"messages through a ring, both events recorded, until committed", perSecond(recorded), {}, {}, ">= 200 k/s", {}},
      recorded, kRecordedRateTarget, true);
  const double spent = medianOf(rounds, [](const Round& round) { return round.recorded[1]; });
  table.add({"processor time a message through a ring, both events recorded", microseconds(spent), {}, {}, "", {}});
}

}  // namespace tarn::bench
