// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/StreamMemory.h"

#include <algorithm>
#include <tarnreporting_messages.hpp>

namespace tarn::streams {

namespace {

using tarnreporting::Category;
using tarnreporting::Type;
namespace keys = tarnreporting::keys;

bool isSide(const PostMessage& post) {
  const auto category = static_cast<Category>(post.category);
  return category == Category::Playback || category == Category::Input;
}

bool isOfType(const PostMessage& post, Type type) {
  return static_cast<Type>(post.type) == type;
}

bool endsSegment(std::string_view key) {
  return key == keys::kKvSessionVolume || key == keys::kActiveDevices || key == keys::kSessionSelectedFormat ||
         key == keys::kLagoonSession;
}

}  // namespace

void StreamMemory::remember(const PostMessage& post) {
  if (isSide(post) && isOfType(post, Type::Start)) {
    run_ = post;
  } else if (isSide(post) && isOfType(post, Type::Stop)) {
    run_.reset();
  } else if (run_ && !isOfType(post, Type::Error)) {
    merge(post);
  }
}

std::optional<PostMessage> StreamMemory::restatement() const {
  std::optional<PostMessage> restated = run_;
  if (restated) {
    restated->fields.push_back({keys::kRestated, true});
  }
  return restated;
}

void StreamMemory::merge(const PostMessage& post) {
  for (const Field& field : post.fields) {
    const auto known = std::find_if(run_->fields.begin(), run_->fields.end(),
                                    [&field](const Field& other) { return other.key == field.key; });
    const bool isNew = known == run_->fields.end();
    if (endsSegment(field.key) && (isNew || known->value != field.value)) {
      run_->stamp = post.stamp;
    }
    if (isNew) {
      run_->fields.push_back(field);
    } else {
      known->value = field.value;
    }
  }
}

}  // namespace tarn::streams
