// SPDX-License-Identifier: Apache-2.0
// BoundObject: an object of PipeWire's registry that is listened to, as one of several kinds.
//
// It keeps the proxy and its listener for as long as it lives, and hands what it is told to the book. Owned by the
// GraphWatcher. Threads: that of the loop.
#pragma once

#include <pipewire/pipewire.h>

#include <functional>
#include <memory>

#include "adapters/pipewire/core/StreamBook.h"

namespace tarn::streams {

// What the objects of one connection have in common.
struct Binding {
  pw_registry* registry = nullptr;
  StreamBook* book = nullptr;
  std::function<void()> changed;  // an event came, and perhaps more that belong to it
  std::function<void()> counted;  // cycles came, to which nothing else belongs
};

class BoundObject {
 public:
  virtual ~BoundObject();
  BoundObject(const BoundObject&) = delete;
  BoundObject& operator=(const BoundObject&) = delete;

 protected:
  BoundObject(const Binding& binding, ObjectId id, const char* type, std::uint32_t version);

  StreamBook& book() const { return *binding_.book; }
  void changed() const { binding_.changed(); }
  void counted() const { binding_.counted(); }
  ObjectId id() const { return id_; }
  // Null when PipeWire has let go of it already.
  pw_proxy* proxy() const { return proxy_; }

  spa_hook hook_{};

 private:
  static void forget(void* self);

  const Binding& binding_;
  ObjectId id_;
  pw_proxy* proxy_;
  spa_hook proxyHook_{};
};

// The object of a global of the registry; null for one that doesn't concern sound.
std::unique_ptr<BoundObject> bindObject(const Binding& binding, ObjectId id, std::string_view type,
                                        const Properties& properties);
// The metadata that tells what is the default.
std::unique_ptr<BoundObject> bindDefaults(const Binding& binding, ObjectId id);
// The profiler, as long as it is to tell of cycles.
std::unique_ptr<BoundObject> bindProfiler(const Binding& binding, ObjectId id);

Properties propertiesOf(const spa_dict* dictionary);

}  // namespace tarn::streams
