// SPDX-License-Identifier: Apache-2.0
// What the signposts of the performance traces cost: while nothing records, which is nearly always, and while a trace
// does. In this process.
#include <memory>

#include "bench/Intake.h"
#include "bench/Measure.h"
#include "bench/Processes.h"
#include "bench/SessionPlatform.h"
#include "bench/figures/Figures.h"
#include "host/traces/SignpostBuffer.h"
#include "service/vocabulary/TarnReportingSignpost.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kCalls = 2'000'000;
constexpr std::size_t kIntakes = 40;  // windows of messages, with and without in turns
constexpr std::size_t kBuffered = std::size_t{1} << 15U;

TarnReportingSignpost post() noexcept {
  return {SignpostCategory::Worker, "Bench", "call", {"number", 1}};
}

// A message passes six signposts on its road, as many as are added here: operation, intake, two workers, two
// hand-overs.
void sendWithSixMore(TarnReportingSession& session, const TarnReportingSession::MessagePointer& record) {
  const TarnReportingSignpost first = post();
  const TarnReportingSignpost second = post();
  const TarnReportingSignpost third = post();
  const TarnReportingSignpost fourth = post();
  const TarnReportingSignpost fifth = post();
  const TarnReportingSignpost sixth = post();
  session.sendMessage(record);
}

double callsWithSignpost(std::size_t count) {
  return nanosecondsEach(count, [](std::size_t i) {
    const TarnReportingSignpost signpost = post();
    keep(i);
  });
}

// Into memory, which is emptied on the way.
double callsRecorded(std::size_t count, linux_host::LinuxSignposts& signposts) {
  const auto buffer = std::make_shared<linux_host::SignpostBuffer>(kBuffered, std::chrono::nanoseconds(0), [] {});
  signposts.add(buffer);
  const double each = nanosecondsEach(count, [&](std::size_t i) {
    const TarnReportingSignpost signpost = post();
    if (i % (kBuffered / 2) == 0) {
      keep(buffer->drain().records.size());
    }
  });
  signposts.remove(buffer.get());
  return each;
}

enum Sample { kIntake, kIntakeWithMore, kEmpty, kOff, kOn, kSamples };

std::vector<double> measureAll(const Settings& settings) {
  SessionPlatform platform(Tally::WantsNothing);
  const auto session = makeSession();
  Feeder feeder(*session);
  feeder.fillTo(10 * Feeder::kWindow);
  std::vector<double> results(kSamples);
  Samples without;
  Samples with;
  for (std::size_t i = 0; i < settings.count(kIntakes) + 1; ++i) {
    without.push_back(feeder.measure());
    with.push_back(feeder.measure(sendWithSixMore));
  }
  results[kIntake] = median(without);
  results[kIntakeWithMore] = median(with);
  const std::size_t calls = settings.count(kCalls);
  results[kEmpty] = nanosecondsEach(calls, [](std::size_t i) { keep(i); });
  results[kOff] = callsWithSignpost(calls);
  results[kOn] = callsRecorded(calls / 10, platform.signposts());
  return results;
}

}  // namespace

void measureSignposts(const Settings& settings, Table& table) {
  std::vector<Samples> samples(kSamples);
  for (int round = 0; round < settings.rounds; ++round) {
    const std::vector<double> results = measureInChild([&] { return measureAll(settings); });
    for (std::size_t i = 0; i < results.size(); ++i) {
      samples[i].push_back(results[i]);
    }
  }
  const auto figure = [&](Sample sample) { return median(samples[sample]); };
  const auto row = [&](const char* name, Sample ours, const char* peer, Sample theirs) {
    table.add({name,
               nanoseconds(figure(ours)),
               peer + nanoseconds(figure(theirs)),
               times(figure(ours) / figure(theirs)),
               "",
               {}});
  };
  row("trace points off, intake with six more", kIntakeWithMore, "without", kIntake);
  row("trace points off, one alone", kOff, "an empty loop", kEmpty);
  row("trace points on, one alone", kOn, "off", kOff);
}

}  // namespace tarn::bench
