// SPDX-License-Identifier: Apache-2.0
// FakeSignposts: keeps the signposts that were set while a test has it record. Threads: any.
#pragma once

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <mutex>
#include <string>
#include <vector>

#include "platform/Signposts.h"
#include "testing/backends/OwnMemory.h"

namespace tarn::testing {

class FakeSignposts final : public platform::Signposts {
 public:
  struct Post {
    platform::SignpostCategory category;
    std::string name;      // "subject.verb"
    std::string argument;  // "name=value", or empty
    friend bool operator==(const Post&, const Post&) = default;
  };

  // The interface.
  std::chrono::nanoseconds begin() noexcept override {
    const std::lock_guard lock(mutex_);
    ++begun_;
    return std::chrono::nanoseconds(begun_);
  }
  void end(const platform::Signpost& signpost, std::chrono::nanoseconds) noexcept override {
    const OwnMemory own;
    const std::lock_guard lock(mutex_);
    intervals_.push_back(postOf(signpost));
  }
  void mark(const platform::Signpost& signpost) noexcept override {
    const OwnMemory own;
    const std::lock_guard lock(mutex_);
    marks_.push_back(postOf(signpost));
  }

  // Controls.
  using platform::Signposts::setRecording;

  // Observations.
  std::size_t begun() const {
    const std::lock_guard lock(mutex_);
    return begun_;
  }
  std::vector<Post> intervals() const {  // in the order in which they ended
    const std::lock_guard lock(mutex_);
    return intervals_;
  }
  std::vector<Post> marks() const {
    const std::lock_guard lock(mutex_);
    return marks_;
  }
  // How many intervals of that name ended.
  std::size_t count(const std::string& name) const {
    const auto posts = intervals();
    return static_cast<std::size_t>(
        std::count_if(posts.begin(), posts.end(), [&](const Post& post) { return post.name == name; }));
  }

 private:
  static Post postOf(const platform::Signpost& signpost) {
    std::string name(signpost.subject);
    name += '.';
    name += signpost.verb;
    std::string argument(signpost.argument.name);
    if (!argument.empty()) {
      argument += "=" + std::to_string(signpost.argument.value);
    }
    return {signpost.category, std::move(name), std::move(argument)};
  }

  mutable std::mutex mutex_;
  std::size_t begun_ = 0;        // guarded by mutex_
  std::vector<Post> intervals_;  // guarded by mutex_
  std::vector<Post> marks_;      // guarded by mutex_
};

}  // namespace tarn::testing
