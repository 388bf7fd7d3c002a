// SPDX-License-Identifier: Apache-2.0
// StoreMoment: the recorder's file as it is at one moment, for questions about it.
//
// The file is opened read-only and may be written meanwhile; it isn't trusted (see
// recorder/store/reading/StoreAccess.h). As long as this is open the file's log can't begin anew, so it is made for one
// look and not kept. Owner: a reader. Threads: one at a time. It may block on the disk.
#pragma once

#include <filesystem>
#include <functional>
#include <string>

#include "plist/Result.h"
#include "recorder/store/reading/StoreAccess.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::report {

class StoreMoment {
 public:
  using Bind = std::function<void(recorder::Statement&)>;
  using Take = std::function<void(const recorder::Statement&)>;

  explicit StoreMoment(std::filesystem::path file) : file_(std::move(file)) {}
  StoreMoment(const StoreMoment&) = delete;
  StoreMoment& operator=(const StoreMoment&) = delete;

  // To be called once, before anything is asked. Here and below every error names the file: it is not there, refuses
  // this user, has no sessions, can't be read, or costs more to read than its bytes are worth.
  [[nodiscard]] Status open();
  // Asks, and calls `take` for each row. `bind` fills the places of the question.
  [[nodiscard]] Status each(const std::string& sql, const Bind& bind, const Take& take);

 private:
  Error about(const Error& error) const { return {error.code, file_.string() + ": " + error.text}; }

  const std::filesystem::path file_;
  recorder::ReadBounds bounds_;
  recorder::Connection connection_;
};

}  // namespace tarn::report
