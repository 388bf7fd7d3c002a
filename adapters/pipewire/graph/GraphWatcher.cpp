// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/graph/GraphWatcher.h"

#include <pipewire/extensions/metadata.h>
#include <pipewire/extensions/profiler.h>
#include <pipewire/pipewire.h>

#include <cerrno>
#include <ctime>
#include <unordered_map>
#include <utility>

#include "adapters/pipewire/graph/BoundObject.h"

namespace tarn::streams {

// One connection and what is bound by it.
class GraphWatcher::Objects {
 public:
  Objects(pw_core* core, StreamBook& book, Listener& listener, bool profiles)
      : core_(core), book_(book), listener_(listener), profiles_(profiles) {
    static constexpr pw_core_events kCoreEvents{
        .version = PW_VERSION_CORE_EVENTS, .done = &Objects::done, .error = &Objects::failed};
    static constexpr pw_registry_events kRegistryEvents{PW_VERSION_REGISTRY_EVENTS, &Objects::added, &Objects::removed};
    pw_core_add_listener(core_, &coreHook_, &kCoreEvents, this);
    binding_.registry = pw_core_get_registry(core_, PW_VERSION_REGISTRY, 0);
    binding_.book = &book;
    binding_.changed = [this] { changed(); };
    binding_.counted = [this] { counted(); };
    pw_registry_add_listener(binding_.registry, &registryHook_, &kRegistryEvents, this);
    changed();
  }
  ~Objects() {
    profiler_.reset();
    metadata_.reset();
    objects_.clear();
    spa_hook_remove(&registryHook_);
    spa_hook_remove(&coreHook_);
    pw_proxy_destroy(reinterpret_cast<pw_proxy*>(binding_.registry));
    pw_core_disconnect(core_);
  }
  Objects(const Objects&) = delete;
  Objects& operator=(const Objects&) = delete;

 private:
  static void added(void* data, std::uint32_t id, std::uint32_t, const char* type, std::uint32_t,
                    const spa_dict* dictionary) {
    auto& self = *static_cast<Objects*>(data);
    if (type == std::string_view(PW_TYPE_INTERFACE_Profiler)) {
      self.profilerId_ = id;
      return;
    }
    if (auto object = bindObject(self.binding_, id, type, propertiesOf(dictionary))) {
      self.objects_[id] = std::move(object);
      if (type == std::string_view(PW_TYPE_INTERFACE_Metadata)) {
        self.metadataId_ = id;
      }
      self.changed();
    }
  }
  static void removed(void* data, std::uint32_t id) {
    auto& self = *static_cast<Objects*>(data);
    if (self.objects_.erase(id) == 0) return;
    if (id == self.metadataId_) {
      self.metadataId_ = SPA_ID_INVALID;
      self.metadata_.reset();
    }
    self.book_.removed(id, wallClock());
    self.changed();
  }
  static void done(void* data, std::uint32_t id, int sequence) {
    auto& self = *static_cast<Objects*>(data);
    if (id != PW_ID_CORE || !self.isAsked_ || sequence != self.sequence_) return;
    self.isAsked_ = false;
    self.book_.settlePrepared();
    self.askForDefault();
    const bool isQuiet = !self.hasChanged_;
    self.wasQuiet_ = self.wasQuiet_ || isQuiet;
    if (self.hasChanged_) {
      self.ask();
    }
    self.profile();
    self.listener_.said(isQuiet);
  }
  static void failed(void* data, std::uint32_t id, int, int result, const char* message) {
    auto& self = *static_cast<Objects*>(data);
    // Of other objects: one that was gone before it could be bound.
    if (id == PW_ID_CORE && result == -EPIPE) {
      self.listener_.lost(message == nullptr ? "" : message);
    }
  }

  // One question at a time, however many events come, and none where nothing of a stream has changed.
  void changed() {
    hasChanged_ = true;
    if (!isAsked_ && (!wasQuiet_ || !book_.isSettled())) {
      ask();
    } else if (!isAsked_) {
      listener_.said(false);
    }
  }
  void counted() {
    if (!book_.isSettled()) {
      changed();
    }
    listener_.said(false);
  }
  void ask() {
    hasChanged_ = false;
    book_.prepare();
    sequence_ = pw_core_sync(core_, PW_ID_CORE, 0);
    isAsked_ = true;
  }
  // Who binds the metadata is told all of it; what was bound before goes once that is over, since PipeWire's server
  // loses count of who is being told when one goes meanwhile.
  void askForDefault() {
    if (metadata_) {
      objects_[metadataId_] = std::move(metadata_);
    }
    if (!book_.takeDoubtOfDefault() || metadataId_ == SPA_ID_INVALID) return;
    metadata_ = bindDefaults(binding_, metadataId_);
    hasChanged_ = true;
  }
  // PipeWire tells of its cycles once a second or so, for as long as somebody listens.
  void profile() {
    const bool wants = profiles_ && profilerId_ != SPA_ID_INVALID && book_.anyRuns();
    if (wants && !profiler_) {
      profiler_ = bindProfiler(binding_, profilerId_);
    } else if (!wants) {
      profiler_.reset();
    }
  }

  pw_core* core_;
  StreamBook& book_;
  Listener& listener_;
  bool profiles_;
  Binding binding_;
  spa_hook coreHook_{};
  spa_hook registryHook_{};
  std::unordered_map<ObjectId, std::unique_ptr<BoundObject>> objects_;
  ObjectId metadataId_ = SPA_ID_INVALID;
  std::unique_ptr<BoundObject> metadata_;  // bound anew, and not all told yet
  ObjectId profilerId_ = SPA_ID_INVALID;
  std::unique_ptr<BoundObject> profiler_;
  int sequence_ = 0;
  bool isAsked_ = false;
  bool hasChanged_ = false;  // since it was asked
  bool wasQuiet_ = false;    // all that was there at first is told
};

GraphWatcher::GraphWatcher(pw_context* context, StreamBook& book, Listener& listener, std::string remote, bool profiles)
    : context_(context), book_(book), listener_(listener), remote_(std::move(remote)), profiles_(profiles) {}

GraphWatcher::~GraphWatcher() = default;

bool GraphWatcher::connect() {
  pw_properties* const properties = pw_properties_new(PW_KEY_MEDIA_CATEGORY, "Monitor", nullptr);
  if (!remote_.empty()) {
    pw_properties_set(properties, PW_KEY_REMOTE_NAME, remote_.c_str());
  }
  pw_core* const core = pw_context_connect(context_, properties, 0);
  if (core == nullptr) return false;
  objects_ = std::make_unique<Objects>(core, book_, listener_, profiles_);
  return true;
}

void GraphWatcher::disconnect() {
  objects_.reset();
}

Moment wallClock() {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME, &now);
  return now.tv_sec * Moment{SPA_NSEC_PER_SEC} + now.tv_nsec;
}

}  // namespace tarn::streams
