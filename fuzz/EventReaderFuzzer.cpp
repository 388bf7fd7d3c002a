// SPDX-License-Identifier: Apache-2.0
// Bytes as the recorder's file: whatever they are, reading ends with no more rows than were asked for or with an
// error, and the file stays as it was.
#include <unistd.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "recorder/store/reading/EventReader.h"

namespace {

using tarn::Result;
using tarn::recorder::EventPage;
using tarn::recorder::EventQuery;
using tarn::recorder::EventReader;

void check(bool holds) {
  if (!holds) {
    std::abort();
  }
}

// A folder of this process, gone at its end.
class Folder {
 public:
  Folder() {
    std::string pattern = (std::filesystem::temp_directory_path() / "event-reader-XXXXXX").string();
    check(::mkdtemp(pattern.data()) != nullptr);
    path_ = pattern;
  }
  ~Folder() { clear(true); }
  Folder(const Folder&) = delete;
  Folder& operator=(const Folder&) = delete;
  std::filesystem::path file() const { return path_ / "recorder.sqlite3"; }
  void clear(bool whole) const {
    std::error_code ignored;
    for (const auto& entry : std::filesystem::directory_iterator(path_, ignored)) {
      std::filesystem::remove_all(entry.path(), ignored);
    }
    if (whole) {
      std::filesystem::remove(path_, ignored);
    }
  }

 private:
  std::filesystem::path path_;
};

std::string contents(const std::filesystem::path& file) {
  std::ifstream in(file, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

void checkRead(EventReader& reader, const EventQuery& query) {
  const Result<EventPage> result = reader.read(query);
  const EventPage& page = result.value;
  if (result.failed() || page.missing) {
    check((result.failed() != page.missing) && page.rows.empty() && !page.more);
    check(result.ok() || !result.error->text.empty());
    return;
  }
  check(page.rows.size() <= query.limit);
  check(page.more == (page.rows.size() == query.limit));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const Folder folder;
  folder.clear(false);
  const std::string bytes(reinterpret_cast<const char*>(data), size);
  std::ofstream(folder.file(), std::ios::binary) << bytes;
  {
    EventReader reader(folder.file());
    EventQuery query;
    query.limit = 3;
    checkRead(reader, query);
    query.after = 1;
    query.nameGlob = "*e";
    checkRead(reader, query);
    query.backend = "tally";
    query.limit = 1000;
    checkRead(reader, query);
    static_cast<void>(reader.waitForChange(std::chrono::milliseconds(0)));
  }
  check(contents(folder.file()) == bytes);
  return 0;
}
