// CarryOver: brings what can still be read of a file that was set aside into the fresh one, under its own ids.
//
// Rows that are as their checksum says are carried, and rows that nothing proves; where a page can't be read it goes on
// after it. The old file isn't trusted: reading it ends after work that its bytes are worth, and it stays as it is.
// When the fresh file fails, it is gone on with later. Owner: the event writer. Threads: the writer's.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/Connection.h"
#include "recorder/store/EventFile.h"
#include "recorder/store/EventGroup.h"
#include "recorder/store/Statement.h"
#include "recorder/store/StoreCheck.h"

namespace tarn::recorder {

class CarryOver {
 public:
  // With a bound only events up to this id: those after it will be written again.
  CarryOver(std::filesystem::path from, std::optional<std::int64_t> upTo) : from_(std::move(from)), upTo_(upTo) {}
  CarryOver(const CarryOver&) = delete;
  CarryOver& operator=(const CarryOver&) = delete;

  // Carries all of it, in transactions of its own. An error is one of the fresh file.
  [[nodiscard]] Status goOn(EventFile& into);

  const std::filesystem::path& from() const noexcept { return from_; }
  std::int64_t carried() const noexcept { return carried_; }
  // Ids that the old file should have held, as far as that is known.
  const std::vector<IdRange>& lost() const noexcept { return lost_; }

 private:
  struct Read {
    std::int64_t id;
    double seconds;
    double time;
    std::string backend;
    std::string name;
    std::string payload;
    std::string detail;
  };

  void open(const EventFile& into);
  std::int64_t lastToLookFor(std::int64_t known);
  bool readSome(double now);
  void readRow(double now);
  [[nodiscard]] Status writeSome(EventFile& into);
  [[nodiscard]] Status finish(EventFile& into);

  const std::filesystem::path from_;
  const std::optional<std::int64_t> upTo_;
  Connection connection_;
  Statement rows_;
  Statement groups_;
  EventGroup group_;
  std::vector<Read> some_;
  std::vector<IdRange> lost_;
  std::int64_t stepsLeft_ = 0;
  bool opened_ = false;
  bool ended_ = false;
  std::int64_t after_ = 0;   // looked at up to here
  std::int64_t last_ = 0;    // nothing is looked for beyond
  std::int64_t wanted_ = 0;  // the id that should come next; 0 when nothing tells
  std::int64_t first_ = 0;   // carried, 0 for none
  std::int64_t carried_ = 0;
};

}  // namespace tarn::recorder
