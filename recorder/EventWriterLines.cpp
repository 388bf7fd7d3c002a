// SPDX-License-Identifier: Apache-2.0
// What EventWriter tells in the log.
#include <optional>
#include <string>

#include "recorder/EventWriter.h"

namespace tarn::recorder {

using platform::LogCondition;

void EventWriter::tellWhatOpeningFound() {
  const std::string path = file_.path().string();
  for (const std::string& name : file_.takePutAside()) {
    std::string line = "recorder file " + path;
    line.append(" had something in its log's place that is no regular file; it is set aside as ").append(name);
    log_.error(line);
  }
  if (const auto events = file_.takeMigrated()) {
    log_.notice("recorder file " + path + " had the layout of an older service; its " + std::to_string(*events) +
                " events have the present one now");
  }
  if (const std::int64_t last = file_.takeGoneUpTo(); last > 0) {
    log_.error(LogCondition::StoreDamaged, "recorder file " + path + " holds nothing of the events up to " +
                                               std::to_string(last) +
                                               " that were committed: it is new, or its log is gone");
  }
  if (const auto missing = file_.takeMissing()) {
    missing_ = missing;
    log_.error(LogCondition::StoreDamaged, "recorder file " + path + " misses " + std::to_string(missing->count()) +
                                               " committed events (" + textOf({*missing}) +
                                               "): its log is damaged, cut or gone");
  }
}

void EventWriter::tellLongLog() {
  const bool isLong = file_.logBytes() >= options_.longLogBytes;
  if (isLong && !longLogTold_) {
    std::string readers;
    for (const std::string& reader : readersOf(file_.path())) {
      readers += (readers.empty() ? "" : ", ") + reader;
    }
    log_.error("recorder file " + file_.path().string() + " has a log of " + std::to_string(file_.logBytes() >> 20U) +
               " MiB, held up by readers of an old state: " +
               (readers.empty() ? "none that can be seen" : "process " + readers));
  }
  longLogTold_ = isLong;
}

void EventWriter::tellUnexported() {
  const Unexported gone = file_.unexported();
  if (gone.count == unexportedTold_ || clock_.monotonic() < nextUnexported_) return;
  log_.error("recorder removed " + std::to_string(gone.count - unexportedTold_) +
             " events that hadn't been exported: the file is full, or they grew too old (" +
             std::to_string(gone.count) + " in all, of the ids " + textOf({gone.within}) + ")");
  unexportedTold_ = gone.count;
  nextUnexported_ = clock_.monotonic() + options_.maintenanceInterval;
}

void EventWriter::noteFault(const std::string& problem) {
  problem_ = problem;
  if (faulty_) return;
  faulty_ = true;
  faultSince_ = clock_.monotonic();
  log_.error(LogCondition::StoreUnwritable,
             "recorder can't write to " + file_.path().string() + ": " + problem + "; events are kept until it can");
}

}  // namespace tarn::recorder
