// EventWriter: writes batches of events into the recorder's file and copes with whatever happens to that file.
//
// Owner: the recorder. Threads: all calls on the recorder's writer thread.
//
// A passing fault (a full or read-only disk, an I/O error, a lock) is logged once when it begins and once when all
// works again; nothing is dropped, the caller comes again later. A file that can't be used is looked at twice, through
// two connections; then it is set aside with an error line and a fresh one is begun, into which goes what wasn't
// committed.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "plist/Result.h"
#include "recorder/CommitPace.h"
#include "recorder/RecorderLog.h"
#include "recorder/RecorderOptions.h"
#include "recorder/store/CarryOver.h"
#include "recorder/store/EventBatch.h"
#include "recorder/store/EventFile.h"
#include "recorder/store/files/StateUsage.h"

namespace tarn::recorder {

class EventWriter {
 public:
  EventWriter(const RecorderOptions& options, platform::Log& log, const platform::Clock& clock);
  EventWriter(const EventWriter&) = delete;
  EventWriter& operator=(const EventWriter&) = delete;

  // Opens the file if it isn't open. False: a fault; come again later.
  [[nodiscard]] bool open();
  // Writes events from `from` on in one transaction: all of them, or as many as fit into the time and size of a commit.
  // How many are now committed; 0 for a fault.
  [[nodiscard]] std::size_t write(const EventBatch& batch, std::size_t from);
  // What may wait until the commit is announced: the checkpoint, and the word that a fault is over.
  [[nodiscard]] bool settle();
  // One step of retention in a transaction of its own.
  [[nodiscard]] bool maintain();
  // Compares a piece of the file with its checksums; damage is resolved. Whether the file is well.
  [[nodiscard]] bool verify();
  bool isVerified() const noexcept { return file_.isVerified(); }
  // What an earlier run is known to have committed. Before open().
  void expect(std::int64_t lastId) noexcept { file_.expect(lastId); }
  std::int64_t lastId() const noexcept { return file_.lastId(); }
  void close() noexcept { file_.close(); }

  bool hasMoreToExpire() const noexcept { return file_.hasMoreToExpire(); }
  bool hasMoreToBringIn() const noexcept { return file_.isOpen() && file_.hasMoreToBringIn(); }
  std::uint64_t expired() const noexcept { return file_.expired(); }
  // How fast it goes.
  const CommitPace& pace() const noexcept { return pace_; }
  const std::string& problem() const noexcept { return problem_; }

 private:
  [[nodiscard]] Status openOnce();
  [[nodiscard]] Result<std::size_t> writeOnce(const EventBatch& batch, std::size_t from);
  [[nodiscard]] Status maintainOnce();
  // Does what helps against the error and logs it. Whether to try again at once.
  [[nodiscard]] bool resolve(const Error& error);
  [[nodiscard]] bool resolveDamage(const Error& error);
  void tellWhatOpeningFound();
  [[nodiscard]] Status noteMissing();
  [[nodiscard]] Status carryOver();
  void tidy();
  void limitDatabase();
  void tellLongLog();
  void noteFault(const std::string& problem);
  const std::string& payloadText(const plist::Dictionary& payload);

  const RecorderOptions& options_;
  const platform::Clock& clock_;
  RecorderLog log_;
  EventFile file_;
  StateUsage usage_;
  CommitPace pace_;
  plist::Dictionary lastPayload_;  // whose text payloadText_ is
  std::string payloadText_ = "{}";
  std::string detailText_;
  std::chrono::nanoseconds faultSince_{0};
  std::unique_ptr<CarryOver> carrying_;  // out of a file that was set aside, while that isn't over
  std::optional<IdRange> missing_;       // to be noted
  std::string problem_;                  // of the last failure
  bool longLogTold_ = false;
  bool faulty_ = false;
  bool suspected_ = false;  // the file was found unusable once
};

}  // namespace tarn::recorder
