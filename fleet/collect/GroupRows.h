// SPDX-License-Identifier: Apache-2.0
// GroupRows: batches that are written together, as rows of the tables where they are looked at before they are stored.
// Pure: what only the database knows (its numbers for devices and runs) is handed in.
//
//   GroupRows rows(batches);
//   rows.deviceNames() -> the database -> rows.setDevices(numbers)
//   rows.runs()        -> the database -> rows.setRuns(keys)
//   rows.events(), sessions(), periods(), gaps(), told()
//
// Threads: one. The batches outlive it.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "fleet/collect/CopyRows.h"
#include "fleet/format/Message.h"

namespace tarn::fleet {

class GroupRows {
 public:
  explicit GroupRows(std::vector<const v1::Batch*> batches);

  // Each once, in hexadecimal, rising: whoever asks in the same order waits for nobody who waits for him.
  std::vector<std::string> deviceNames() const;
  // The database's numbers, by name.
  void setDevices(std::map<std::string, std::int32_t> numbers) { devices_ = std::move(numbers); }
  // number, device, id, boot, version, started, ended, end_reason, machine, looked_at; `number` counts from 0.
  CopyRows runs() const;
  // The database's keys, by number.
  void setRuns(std::vector<std::int64_t> keys) { runs_ = std::move(keys); }

  // device, run, id, time, session, backend, name, payload, detail, application, release; the last two are those of
  // its session, and there where it is measured
  CopyRows events() const;
  // run, id, device, process, application, service_type, service_name, created, ended, end_reason, looked_at
  CopyRows sessions() const;
  // run, id, session, device, started, stopped, messages, redundant, looked_at
  CopyRows periods() const;
  // device, first, last
  CopyRows gaps() const;
  // device, first, last, left_out
  CopyRows told() const;
  // How far devices said that they are, with nothing to tell.
  CopyRows places() const;
  // The database's numbers of the devices.
  std::vector<std::int32_t> devices() const;
  // The days of the events, each once, as 2026-11-20.
  std::vector<std::string> days() const;

 private:
  const std::vector<const v1::Batch*> batches_;
  std::vector<std::string> names_;     // of each batch's device
  std::vector<std::size_t> firstRun_;  // the number of each batch's first run
  std::map<std::string, std::int32_t> devices_;
  std::vector<std::int64_t> runs_;
};

// Whether an event counts for the hours: something was played, or went wrong.
bool isMeasured(const v1::Kind& kind, const v1::Event& event);
// The ids of a batch that are neither events nor gaps, as the database writes ranges: {[5,6],[9,9]}.
std::string leftOutOf(const v1::Batch& batch);

}  // namespace tarn::fleet
