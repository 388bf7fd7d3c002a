// SPDX-License-Identifier: Apache-2.0
// StreamMemory: what was said of one stream, in as few words: how its session begins, and how it runs.
//
// For a service that starts anew and knows nothing of a stream that has been playing for long. Fed with the actions as
// they are carried out, so it is right also for a stream that the book has forgotten meanwhile. Threads: one at a time.
#pragma once

#include <optional>
#include <utility>

#include "adapters/pipewire/core/StreamActions.h"

namespace tarn::streams {

class StreamMemory {
 public:
  explicit StreamMemory(BeginSession begin) : begin_(std::move(begin)) {}

  const BeginSession& begin() const { return begin_; }
  void remember(const PostMessage& post);
  // That the stream runs, with all that was said of the run since, from when on it is so: the last change that ends a
  // segment. Nothing while it doesn't run.
  std::optional<PostMessage> restatement() const;

 private:
  void merge(const PostMessage& post);

  BeginSession begin_;
  std::optional<PostMessage> run_;
};

}  // namespace tarn::streams
