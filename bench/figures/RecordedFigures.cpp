// SPDX-License-Identifier: Apache-2.0
// Both events of every message recorded, until the last is safe on the disk.
#include "bench/Measure.h"
#include "bench/ServiceReceiver.h"
#include "bench/figures/Figures.h"
#include "bench/peers/SqliteAlone.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kMessages = 50'000;
constexpr std::size_t kOutstanding = 1024;
constexpr int kSmallFileMegabytes = 32;
constexpr double kRateTarget = 100e3;
constexpr double kProcessorTarget = 10e-6;
constexpr double kFileTarget = 0.55;

class Recording {
 public:
  Recording(const Settings& settings, const ServiceSetup& setup)
      : service_(settings, setup, Writes::Gathered), count_(settings.count(kMessages)) {
    service_.stream(count_ / 5 + 1, kOutstanding);  // not counted
    committed_ = service_.waitUntilCommitted();
  }

  void measure() {
    const double processorBefore = service_.processorSeconds();
    const double start = nowSeconds();
    service_.stream(count_, kOutstanding);
    const std::int64_t committed = service_.waitUntilCommitted();
    const auto messages = static_cast<double>(count_);
    rates_.push_back(messages / (nowSeconds() - start));
    processor_.push_back((service_.processorSeconds() - processorBefore) / messages);
    if (committed - committed_ != 2 * static_cast<std::int64_t>(count_)) {
      fail("not every message left two events");
    }
    service_.forget();
    committed_ = service_.waitUntilCommitted();
  }
  double bytesAMessage() const { return bytesAMessageOf(service_.stateDirectory() + "/recorder.sqlite3"); }
  double rate() const { return median(rates_); }
  double processor() const { return median(processor_); }

 private:
  ServiceReceiver service_;
  std::size_t count_;
  std::int64_t committed_ = 0;
  Samples rates_;
  Samples processor_;
};

}  // namespace

void measureRecorded(const Settings& settings, Table& table) {
  Recording all(settings, {.recordsEvents = true});
  Recording retaining(settings, {.recordsEvents = true, .maxMegabytes = kSmallFileMegabytes});
  SqliteAlone sqlite(settings.directory);
  const std::size_t count = settings.count(kMessages);
  Samples limits;
  for (int round = 0; round < settings.rounds; ++round) {
    all.measure();
    retaining.measure();
    const double start = nowSeconds();
    sqlite.write(count);
    limits.push_back(static_cast<double>(count) / (nowSeconds() - start));
  }
  const double limit = median(limits);
  const Beside beside = "SQLite alone " + perSecond(limit) + " (of two rows)";
  table.addWithTarget({"both events recorded, until committed",
                       perSecond(all.rate()),
                       beside,
                       times(all.rate() / limit),
                       ">= 100 k/s",
                       {}},
                      all.rate(), kRateTarget, true);
  table.add({"both events recorded, old ones expiring (32 MB)",
             perSecond(retaining.rate()),
             beside,
             times(retaining.rate() / limit),
             "",
             {}});
  table.addWithTarget(
      {"processor time a message, both events recorded", microseconds(all.processor()), {}, {}, "<= 10 us", {}},
      all.processor(), kProcessorTarget);
  const double ofTwoRows = sqlite.bytesAMessage();
  table.addWithTarget({"file a message, both events recorded",
                       bytes(all.bytesAMessage()),
                       "SQLite alone " + bytes(ofTwoRows) + " (of two rows)",
                       times(all.bytesAMessage() / ofTwoRows),
                       "<= 0.55 of two rows",
                       {}},
                      all.bytesAMessage(), kFileTarget * ofTwoRows);
  table.add({"processor time a message, old ones expiring", microseconds(retaining.processor()), {}, {}, "", {}});
}

}  // namespace tarn::bench
