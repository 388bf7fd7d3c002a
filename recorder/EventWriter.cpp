#include "recorder/EventWriter.h"

#include <algorithm>
#include <cstdio>

#include "plist/formats/Json.h"

namespace tarn::recorder {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr std::int64_t kMegabyte = std::int64_t{1} << 20;
constexpr double kSecondsADay = 86'400;

// How long the events and the deletions of one transaction may take; the file's own synchronising comes on top.
constexpr std::chrono::milliseconds kInsertTime{50};
constexpr std::chrono::milliseconds kExpireTime{25};
// Between two looks at the clock.
constexpr std::size_t kEventsBetweenLooks = 64;
// Something that goes wrong again right after it was put right waits for the next try.
constexpr int kTriesAtOnce = 3;

RetentionLimits limitsOf(const RecorderOptions& options) {
  return {std::max<std::int64_t>(options.maxMegabytes, 1) * kMegabyte, options.maxAgeDays * kSecondsADay};
}

// One transaction of a small file must not outgrow what retention keeps free.
std::size_t transactionBytes(const RecorderOptions& options) {
  const auto share = static_cast<std::size_t>(std::max<std::int64_t>(options.maxMegabytes, 1) * kMegabyte / 16);
  return std::clamp(share, std::size_t{1} << 18, std::size_t{1} << 23);
}

}  // namespace

EventWriter::EventWriter(const RecorderOptions& options, platform::Log& log, const platform::Clock& clock)
    : options_(options), clock_(clock), log_(log), file_(options.file, limitsOf(options), clock) {}

bool EventWriter::open() {
  for (int tries = 0; tries < kTriesAtOnce; ++tries) {
    const Outcome outcome = openOnce();
    if (outcome == Outcome::Done) return true;
    if (!resolve(outcome)) return false;
  }
  noteFault();
  return false;
}

Outcome EventWriter::openOnce() {
  return file_.isOpen() ? Outcome::Done : file_.open();
}

std::size_t EventWriter::write(const EventBatch& batch, std::size_t from) {
  for (int tries = 0; tries < kTriesAtOnce; ++tries) {
    std::size_t written = 0;
    const Outcome outcome = writeOnce(batch, from, written);
    if (outcome == Outcome::Done) return written;
    if (!resolve(outcome)) return 0;
  }
  noteFault();
  return 0;
}

Outcome EventWriter::writeOnce(const EventBatch& batch, std::size_t from, std::size_t& written) {
  Outcome outcome = openOnce();
  if (outcome == Outcome::Done) {
    outcome = file_.begin();
  }
  const SteadyClock::time_point start = SteadyClock::now();
  const std::size_t most = transactionBytes(options_);
  std::size_t bytes = 0;
  std::size_t next = from;
  for (; outcome == Outcome::Done && next < batch.size() && bytes < most; ++next) {
    const EventBatch::Event& event = batch[next];
    const std::string& payload = payloadText(event.payload);
    detailText_.clear();
    plist::appendJson(detailText_, event.detail);
    outcome = file_.append({event.time, event.backend, batch.name(event), payload, detailText_});
    bytes += event.nameSize + payload.size() + detailText_.size() + sizeof(double) * 2;
    if (next % kEventsBetweenLooks == 0 && SteadyClock::now() - start > kInsertTime) {
      bytes = most;
    }
  }
  if (outcome == Outcome::Done) {
    outcome = file_.expire(SteadyClock::now() + kExpireTime);
  }
  if (outcome == Outcome::Done) {
    outcome = file_.commit();
  }
  if (outcome == Outcome::Done) {
    written = next - from;
  }
  return outcome;
}

// The two events of a message carry one payload, which becomes text once.
const std::string& EventWriter::payloadText(const plist::Dictionary& payload) {
  if (!lastPayload_.sharesStorageWith(payload)) {
    payloadText_.clear();
    plist::appendJson(payloadText_, payload);
    lastPayload_ = payload;
  }
  return payloadText_;
}

bool EventWriter::settle() {
  // A payload that is kept for its text alone would keep its memory too.
  lastPayload_ = plist::Dictionary();
  payloadText_ = "{}";
  if (!file_.isOpen()) return true;
  const Outcome outcome = file_.checkpointIfDue();
  if (outcome != Outcome::Done) {
    static_cast<void>(resolve(outcome));
    return false;
  }
  if (faulty_) {
    faulty_ = false;
    const double seconds = std::chrono::duration<double>(clock_.monotonic() - faultSince_).count();
    char took[32];
    static_cast<void>(std::snprintf(took, sizeof took, "%.1f", seconds));
    log_.notice("recorder writes to " + file_.path().string() + " again, after " + took + " seconds");
  }
  return true;
}

bool EventWriter::maintain() {
  const Outcome outcome = maintainOnce();
  if (outcome == Outcome::Done) return true;
  return resolve(outcome) && open();
}

Outcome EventWriter::maintainOnce() {
  Outcome outcome = openOnce();
  if (outcome == Outcome::Done) {
    outcome = file_.begin();
  }
  if (outcome == Outcome::Done) {
    outcome = file_.expire(SteadyClock::now() + kExpireTime);
  }
  if (outcome == Outcome::Done) {
    outcome = file_.commit();
  }
  return outcome;
}

bool EventWriter::resolve(Outcome outcome) {
  switch (outcome) {
    case Outcome::Done:
      return true;
    case Outcome::Moved:
      log_.error("recorder file " + file_.path().string() + " was taken away (" + file_.problem() +
                 "); what it held went with it, a fresh one is begun");
      file_.leave();
      return true;
    case Outcome::SetAside: {
      const std::string problem = file_.problem();
      file_.closeAfterFault();
      const std::filesystem::path aside = file_.setAside();
      if (!aside.empty()) {
        log_.error("recorder file " + file_.path().string() + " can't be used (" + problem + "); it is set aside as " +
                   aside.filename().string() + " and a fresh one is begun");
        return true;
      }
      break;
    }
    case Outcome::Reopen:
      file_.closeAfterFault();
      break;
    case Outcome::Wait:
      break;
  }
  noteFault();
  return false;
}

void EventWriter::noteFault() {
  if (faulty_) return;
  faulty_ = true;
  faultSince_ = clock_.monotonic();
  log_.error("recorder can't write to " + file_.path().string() + ": " + file_.problem() +
             "; events are kept until it can");
}

}  // namespace tarn::recorder
