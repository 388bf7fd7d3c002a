// SPDX-License-Identifier: Apache-2.0
#include "recorder/EventWriter.h"

#include <algorithm>
#include <cstdio>
#include <new>
#include <utility>

#include "plist/formats/Json.h"
#include "recorder/WriterLimits.h"
#include "recorder/store/files/Remedy.h"

namespace tarn::recorder {

using platform::LogCondition;

namespace {

using SteadyClock = std::chrono::steady_clock;

// How long the events and the deletions of one transaction may take; the file's own synchronising comes on top.
constexpr std::chrono::milliseconds kInsertTime{50};
constexpr std::chrono::milliseconds kExpireTime{25};
// What an event takes beside its texts.
constexpr std::size_t kRowBytes = 32;
// Between two looks at the clock.
constexpr std::size_t kEventsBetweenLooks = 64;
// To whom every message goes.
constexpr std::string_view kMessages = "tally";
// Something that goes wrong again right after it was put right waits for the next try.
constexpr int kTriesAtOnce = 5;

}  // namespace

EventWriter::EventWriter(const RecorderOptions& options, platform::Log& log, const platform::Clock& clock)
    : options_(options),
      clock_(clock),
      log_(log),
      file_(options.file, limitsOf(options), clock, options.boot.empty() ? RecorderTime::currentBoot() : options.boot),
      usage_(options.file, options.fileMaxAges.setAside, options.files, capOf(options), options.others),
      pace_(options.commitWindow, options.fewestWaiting),
      started_(clock.epochSeconds()) {
  file_.setLogLimit(logLimit(options));
  file_.setExported(options.exported.value_or(""));
}

void EventWriter::setRetention(const RecorderOptions& options) {
  options_.maxMegabytes = options.maxMegabytes;
  options_.maxAgeDays = options.maxAgeDays;
  options_.summaryMaxAgeDays = options.summaryMaxAgeDays;
  options_.exported = options.exported;
  usage_.setCap(capOf(options_));
  file_.setLimits(limitsOf(options_));
  file_.setLogLimit(logLimit(options_));
  file_.setExported(options_.exported.value_or(""));
}

bool EventWriter::open() {
  Status error;
  for (int tries = 0; tries < kTriesAtOnce; ++tries) {
    error = openOnce();
    if (error.ok()) return true;
    if (!resolve(*error)) return false;
  }
  noteFault(error->text);
  return false;
}

Status EventWriter::openOnce() {
  if (!file_.isOpen()) {
    if (auto error = file_.open(); error.failed()) return error;
    if (auto error = file_.readAges(ages_); error.failed()) return error;
    tidy();
    tellWhatOpeningFound();
  }
  if (missing_) {
    if (auto error = noteMissing(); error.failed()) return error;
  }
  if (carrying_) {
    if (auto error = carryOver(); error.failed()) return error;
  }
  if (file_.hasBegunRun()) return {};
  Status begun = file_.beginRun({options_.boot.empty() ? RecorderTime::currentBoot() : options_.boot, options_.version,
                                 started_, options_.machine});
  if (begun.ok() && runHandler_) {
    runHandler_(file_.lastSessionBefore());
  }
  return begun;
}

// A run whose end can't be noted counts as one that was killed.
void EventWriter::close() noexcept {
  if (file_.isOpen() && file_.hasBegunRun() && !carrying_) {
    try {
      static_cast<void>(file_.endRun(clock_.epochSeconds()));
    } catch (const std::bad_alloc&) {
      file_.closeAfterFault();
    }
  }
  file_.close();
}

Status EventWriter::noteMissing() {
  Status error = file_.begin();
  if (error.ok()) {
    error = file_.noteLoss(*missing_);
  }
  if (error.ok()) {
    error = file_.commit();
  }
  if (error.ok()) {
    missing_.reset();
  }
  return error;
}

void EventWriter::tidy() {
  if (!carrying_) {
    const double now = file_.seconds();
    for (const auto& removed : usage_.tidy([&](const std::string& path) { return now - ages_.firstSeen(path, now); })) {
      log_.notice("recorder removed the " + removed.kind + " " + removed.name +
                  (removed.isOld ? ": it is too old" : ": its kind is over its share"));
    }
    ages_.forgetOthers();
  }
  limitDatabase();
}

void EventWriter::limitDatabase() {
  file_.setMaxBytes(usage_.databaseBytes(std::max(file_.logBytes(), logReserve(options_))));
}

Status EventWriter::carryOver() {
  if (auto error = carrying_->goOn(file_); error.failed()) return error;
  const std::string lost = carrying_->lost().empty() ? "none is known to be lost"
                                                     : std::to_string(countOf(carrying_->lost())) + " are lost (" +
                                                           textOf(carrying_->lost()) + ")";
  const std::int64_t rows = carrying_->leftBehind();
  if (carrying_->carried() > 0 || !carrying_->lost().empty() || rows > 0) {
    log_.notice("recorder file " + file_.path().string() + " got " + std::to_string(carrying_->carried()) +
                " events from " + carrying_->from().filename().string() + "; " + lost +
                (rows > 0 ? "; " + std::to_string(rows) +
                                " rows of sessions, their periods or runs were damaged and are"
                                " left behind"
                          : std::string()));
  }
  carrying_.reset();
  tidy();
  return {};
}

std::size_t EventWriter::write(const EventBatch& batch, std::size_t from) {
  Result<std::size_t> written;
  for (int tries = 0; tries < kTriesAtOnce; ++tries) {
    written = writeOnce(batch, from);
    if (!written.failed()) {
      suspected_ = false;
      return written.value;
    }
    if (!resolve(*written.error)) return 0;
  }
  noteFault(written.error->text);
  return 0;
}

Result<std::size_t> EventWriter::writeOnce(const EventBatch& batch, std::size_t from) {
  if (auto error = openOnce(); error.failed()) return {0, error};
  // What the commit before left in doubt began at the same event. Notes count no rows; those after the last event that
  // is in are written again, which changes nothing.
  if (std::int64_t in = file_.takeRowsInDoubt(); in > 0) {
    std::size_t next = from;
    for (; in > 0 && next < batch.size(); ++next) {
      in -= batch[next].isNote() ? 0 : 1;
    }
    return {next - from};
  }
  const auto begun = clock_.monotonic();
  newest_.begin();
  Status error = file_.begin();
  const SteadyClock::time_point start = SteadyClock::now();
  const auto most = static_cast<std::size_t>(transactionBytes(options_));
  std::size_t bytes = 0;
  std::size_t next = from;
  for (; error.ok() && next < batch.size() && bytes < most; ++next) {
    error = append(batch, batch[next], bytes);
    if (next % kEventsBetweenLooks == 0 && SteadyClock::now() - start > kInsertTime) {
      bytes = most;
    }
  }
  if (error.ok()) {
    error = file_.expire(SteadyClock::now() + kExpireTime);
  }
  const auto written = clock_.monotonic();
  if (error.ok()) {
    error = file_.commit();
  }
  if (error.failed()) return {0, error};
  newest_.commit();
  pace_.note(next - from, written - begun, clock_.monotonic() - written);
  return {next - from};
}

Status EventWriter::append(const EventBatch& batch, const EventBatch::Event& event, std::size_t& bytes) {
  if (event.isNote()) {
    bytes += event.bytes;
    return append(batch.note(event));
  }
  const bool repeats = lastPayload_.sharesStorageWith(event.payload);
  const std::string& payload = payloadText(event.payload);
  detailText_.clear();
  plist::appendJson(detailText_, event.detail);
  if (options_.redundant == Redundant::Mark && event.backend == kMessages) {
    newest_.note(event.session, file_.nextId(), event.payload);
  }
  bytes += kRowBytes + (repeats ? 0 : event.nameSize + payload.size() + detailText_.size());
  return file_.append({event.time, event.backend, batch.name(event), payload, detailText_}, repeats, event.session);
}

Status EventWriter::append(const SessionNote& note) {
  if (note.what == SessionNote::What::Repeated) return file_.append(note, newest_.find(note.session, note.message));
  if (note.what == SessionNote::What::Ended) {
    newest_.end(note.session);
  }
  return file_.append(note);
}

// The two events of a message carry one payload, which becomes text once. The text of the last one stays until the next
// is whole: where there is no memory for that, the group begins anew with the last one.
const std::string& EventWriter::payloadText(const plist::Dictionary& payload) {
  if (!lastPayload_.sharesStorageWith(payload)) {
    nextPayloadText_.clear();
    plist::appendJson(nextPayloadText_, payload);
    payloadText_.swap(nextPayloadText_);
    lastPayload_ = payload;
  }
  return payloadText_;
}

bool EventWriter::settle() {
  // A payload that is kept for its text alone would keep its memory too.
  lastPayload_ = plist::Dictionary();
  payloadText_ = "{}";
  nextPayloadText_.clear();
  if (!file_.isOpen()) return true;
  limitDatabase();
  tellLongLog();
  tellUnexported();
  if (const auto error = file_.checkpointIfDue(); error.failed()) {
    static_cast<void>(resolve(*error));
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
  const Status error = maintainOnce();
  if (error.ok()) {
    suspected_ = false;
    return true;
  }
  return resolve(*error) && open();
}

bool EventWriter::verify() {
  Status error = openOnce();
  if (error.ok()) {
    error = file_.verify(SteadyClock::now() + options_.verifyTime);
  }
  if (error.ok()) return true;
  if (!resolve(*error)) return false;
  if (!suspected_) return open();
  // The second look is at all of it, at once.
  error = openOnce();
  if (error.ok()) {
    error = file_.verify(SteadyClock::time_point::max());
  }
  if (error.failed()) return resolve(*error) && open();
  suspected_ = false;
  return true;
}

Status EventWriter::maintainOnce() {
  Status error = openOnce();
  if (error.ok()) {
    tidy();
  }
  if (error.ok()) {
    error = file_.begin();
  }
  if (error.ok()) {
    error = file_.writeAges(ages_);
  }
  if (error.ok()) {
    error = file_.expire(SteadyClock::now() + kExpireTime);
  }
  if (error.ok()) {
    error = file_.commit();
  }
  if (error.ok()) {
    ages_.written();
  }
  return error;
}

bool EventWriter::resolve(const Error& error) {
  lacksMemory_ = isShortage(error.code);
  switch (remedyFor(error.code)) {
    case Remedy::Moved:
      log_.error(LogCondition::StoreDamaged, "recorder file " + file_.path().string() + " was taken away (" +
                                                 error.text + "); what it held went with it, a fresh one is begun");
      file_.leave();
      return true;
    case Remedy::SetAside:
      return resolveDamage(error);
    case Remedy::Reopen:
      file_.closeAfterFault();
      break;
    case Remedy::Wait:
      break;
  }
  noteFault(error.text);
  return false;
}

// One look may err: by memory that was short, a read that was cut, a disk that answered wrongly once.
bool EventWriter::resolveDamage(const Error& error) {
  file_.closeForAnotherLook();
  if (!std::exchange(suspected_, true)) return true;
  const auto aside = file_.setAside();
  if (aside.failed()) {
    noteFault(error.text + "; " + aside.error->text);
    return false;
  }
  suspected_ = false;
  const auto upTo = file_.isInDoubt() ? std::optional(file_.lastId()) : std::nullopt;
  carrying_ = std::make_unique<CarryOver>(aside.value, upTo);
  log_.error(LogCondition::StoreSetAside, "recorder file " + file_.path().string() + " can't be used (" + error.text +
                                              "); it is set aside as " + aside.value.filename().string() +
                                              " and a fresh one is begun");
  return true;
}

}  // namespace tarn::recorder
