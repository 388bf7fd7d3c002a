// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/graph/BoundObject.h"

#include <pipewire/extensions/metadata.h>
#include <pipewire/extensions/profiler.h>
#include <spa/utils/json.h>

#include <array>
#include <ctime>
#include <utility>

#include "adapters/pipewire/graph/GraphWatcher.h"
#include "adapters/pipewire/graph/PodReading.h"

namespace tarn::streams {

namespace {

std::string textOr(const char* text) {
  return text == nullptr ? "" : text;
}

class BoundClient final : public BoundObject {
 public:
  BoundClient(const Binding& binding, ObjectId id)
      : BoundObject(binding, id, PW_TYPE_INTERFACE_Client, PW_VERSION_CLIENT) {
    static constexpr pw_client_events kEvents{PW_VERSION_CLIENT_EVENTS, &BoundClient::told, nullptr};
    pw_client_add_listener(reinterpret_cast<pw_client*>(proxy()), &hook_, &kEvents, this);
  }

 private:
  static void told(void* data, const pw_client_info* info) {
    auto& self = *static_cast<BoundClient*>(data);
    if ((info->change_mask & PW_CLIENT_CHANGE_MASK_PROPS) == 0) return;
    self.book().clientKnown(self.id(), propertiesOf(info->props));
    self.changed();
  }
};

class BoundNode final : public BoundObject {
 public:
  BoundNode(const Binding& binding, ObjectId id) : BoundObject(binding, id, PW_TYPE_INTERFACE_Node, PW_VERSION_NODE) {
    static constexpr pw_node_events kEvents{PW_VERSION_NODE_EVENTS, &BoundNode::told, &BoundNode::toldParam};
    pw_node* const node = reinterpret_cast<pw_node*>(proxy());
    pw_node_add_listener(node, &hook_, &kEvents, this);
    std::array<std::uint32_t, 2> wanted{SPA_PARAM_Props, SPA_PARAM_Format};
    pw_node_subscribe_params(node, wanted.data(), static_cast<std::uint32_t>(wanted.size()));
  }

 private:
  static NodeState stateOf(pw_node_state state) {
    switch (state) {
      case PW_NODE_STATE_ERROR:
        return NodeState::Error;
      case PW_NODE_STATE_SUSPENDED:
        return NodeState::Suspended;
      case PW_NODE_STATE_IDLE:
        return NodeState::Idle;
      case PW_NODE_STATE_RUNNING:
        return NodeState::Running;
      default:
        return NodeState::Creating;
    }
  }
  static void told(void* data, const pw_node_info* info) {
    auto& self = *static_cast<BoundNode*>(data);
    if ((info->change_mask & PW_NODE_CHANGE_MASK_STATE) != 0) {
      self.facts_.state = stateOf(info->state);
      self.facts_.error = textOr(info->error);
    }
    if ((info->change_mask & PW_NODE_CHANGE_MASK_PROPS) != 0) {
      self.facts_.properties = propertiesOf(info->props);
    }
    if ((info->change_mask & (PW_NODE_CHANGE_MASK_STATE | PW_NODE_CHANGE_MASK_PROPS)) == 0) return;
    self.book().nodeKnown(self.id(), wallClock(), self.facts_);
    self.changed();
  }
  static void toldParam(void* data, int, std::uint32_t, std::uint32_t, std::uint32_t, const spa_pod* param) {
    auto& self = *static_cast<BoundNode*>(data);
    if (auto volumes = volumesOf(param)) {
      self.book().volumesKnown(self.id(), wallClock(), *std::move(volumes));
    } else if (auto format = formatOf(param)) {
      self.book().formatKnown(self.id(), wallClock(), *std::move(format));
    } else {
      return;
    }
    self.changed();
  }

  NodeFacts facts_;
};

class BoundDevice final : public BoundObject {
 public:
  BoundDevice(const Binding& binding, ObjectId id)
      : BoundObject(binding, id, PW_TYPE_INTERFACE_Device, PW_VERSION_DEVICE) {
    static constexpr pw_device_events kEvents{PW_VERSION_DEVICE_EVENTS, &BoundDevice::told, &BoundDevice::toldParam};
    pw_device* const device = reinterpret_cast<pw_device*>(proxy());
    pw_device_add_listener(device, &hook_, &kEvents, this);
    std::uint32_t wanted = SPA_PARAM_Route;
    pw_device_subscribe_params(device, &wanted, 1);
  }

 private:
  static void told(void* data, const pw_device_info* info) {
    auto& self = *static_cast<BoundDevice*>(data);
    if ((info->change_mask & PW_DEVICE_CHANGE_MASK_PROPS) == 0) return;
    self.book().deviceKnown(self.id(), wallClock(), propertiesOf(info->props));
    self.changed();
  }
  static void toldParam(void* data, int, std::uint32_t, std::uint32_t, std::uint32_t, const spa_pod* param) {
    auto& self = *static_cast<BoundDevice*>(data);
    auto route = routeOf(param);
    if (!route) return;
    self.book().portKnown(self.id(), wallClock(), route->isOutput, route->device, std::move(route->port));
    self.changed();
  }
};

class BoundLink final : public BoundObject {
 public:
  BoundLink(const Binding& binding, ObjectId id) : BoundObject(binding, id, PW_TYPE_INTERFACE_Link, PW_VERSION_LINK) {
    static constexpr pw_link_events kEvents{PW_VERSION_LINK_EVENTS, &BoundLink::told};
    pw_link_add_listener(reinterpret_cast<pw_link*>(proxy()), &hook_, &kEvents, this);
  }

 private:
  static void told(void* data, const pw_link_info* info) {
    auto& self = *static_cast<BoundLink*>(data);
    if ((info->change_mask & PW_LINK_CHANGE_MASK_STATE) == 0) return;
    self.book().linkKnown(
        self.id(), wallClock(),
        {info->output_node_id, info->input_node_id, info->state == PW_LINK_STATE_ERROR, textOr(info->error)});
    self.changed();
  }
};

class BoundMetadata final : public BoundObject {
 public:
  BoundMetadata(const Binding& binding, ObjectId id)
      : BoundObject(binding, id, PW_TYPE_INTERFACE_Metadata, PW_VERSION_METADATA) {
    static constexpr pw_metadata_events kEvents{PW_VERSION_METADATA_EVENTS, &BoundMetadata::told};
    pw_metadata_add_listener(reinterpret_cast<pw_metadata*>(proxy()), &hook_, &kEvents, this);
  }

 private:
  // Of {"name": "speaker"}; empty of anything else.
  static std::string nameIn(const char* value) {
    std::array<spa_json, 2> readers{};
    std::array<char, 256> key{};
    std::array<char, 256> text{};
    if (value == nullptr) return {};
    spa_json_init(&readers[0], value, std::char_traits<char>::length(value));
    if (spa_json_enter_object(&readers[0], &readers[1]) <= 0) return {};
    while (spa_json_get_string(&readers[1], key.data(), static_cast<int>(key.size())) > 0 &&
           spa_json_get_string(&readers[1], text.data(), static_cast<int>(text.size())) > 0) {
      if (std::string_view(key.data()) == "name") return text.data();
    }
    return {};
  }
  static int told(void* data, std::uint32_t subject, const char* key, const char*, const char* value) {
    auto& self = *static_cast<BoundMetadata*>(data);
    if (subject != PW_ID_CORE) return 0;
    // Without a key everything is taken back.
    const std::string_view name = key == nullptr ? "" : key;
    if (name.empty() || name == "default.audio.sink") {
      self.book().defaultKnown(wallClock(), true, nameIn(value));
    }
    if (name.empty() || name == "default.audio.source") {
      self.book().defaultKnown(wallClock(), false, nameIn(value));
    }
    self.changed();
    return 0;
  }
};

class BoundProfiler final : public BoundObject {
 public:
  BoundProfiler(const Binding& binding, ObjectId id)
      : BoundObject(binding, id, PW_TYPE_INTERFACE_Profiler, PW_VERSION_PROFILER) {
    static constexpr pw_profiler_events kEvents{PW_VERSION_PROFILER_EVENTS, &BoundProfiler::told};
    pw_profiler_add_listener(reinterpret_cast<pw_profiler*>(proxy()), &hook_, &kEvents, this);
  }
  ~BoundProfiler() override { book().cyclesEnded(); }

 private:
  static Moment monotonicClock() {
    timespec now{};
    ::clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec * Moment{SPA_NSEC_PER_SEC} + now.tv_nsec;
  }
  static void told(void* data, const spa_pod* pod) {
    auto& self = *static_cast<BoundProfiler*>(data);
    for (const CycleFacts& cycle : cyclesOf(pod, wallClock() - monotonicClock())) {
      self.book().cycleSeen(cycle);
    }
    self.counted();
  }
};

}  // namespace

BoundObject::BoundObject(const Binding& binding, ObjectId id, const char* type, std::uint32_t version)
    : binding_(binding),
      id_(id),
      proxy_(static_cast<pw_proxy*>(pw_registry_bind(binding.registry, id, type, version, 0))) {
  static constexpr pw_proxy_events kEvents{.version = PW_VERSION_PROXY_EVENTS, .destroy = &BoundObject::forget};
  pw_proxy_add_listener(proxy_, &proxyHook_, &kEvents, this);
}

BoundObject::~BoundObject() {
  if (proxy_ == nullptr) return;
  spa_hook_remove(&hook_);
  spa_hook_remove(&proxyHook_);
  pw_proxy_destroy(proxy_);
}

// The connection takes its proxies along.
void BoundObject::forget(void* data) {
  auto& self = *static_cast<BoundObject*>(data);
  spa_hook_remove(&self.hook_);
  spa_hook_remove(&self.proxyHook_);
  self.proxy_ = nullptr;
}

std::unique_ptr<BoundObject> bindObject(const Binding& binding, ObjectId id, std::string_view type,
                                        const Properties& properties) {
  const std::string_view mediaClass = textOf(properties, PW_KEY_MEDIA_CLASS);
  if (type == PW_TYPE_INTERFACE_Client) return std::make_unique<BoundClient>(binding, id);
  if (type == PW_TYPE_INTERFACE_Link) return std::make_unique<BoundLink>(binding, id);
  if (type == PW_TYPE_INTERFACE_Node && mediaClass.find("Audio") != std::string_view::npos) {
    return std::make_unique<BoundNode>(binding, id);
  }
  if (type == PW_TYPE_INTERFACE_Device && mediaClass == "Audio/Device") {
    return std::make_unique<BoundDevice>(binding, id);
  }
  if (type == PW_TYPE_INTERFACE_Metadata && textOf(properties, PW_KEY_METADATA_NAME) == "default") {
    return bindDefaults(binding, id);
  }
  return nullptr;
}

std::unique_ptr<BoundObject> bindDefaults(const Binding& binding, ObjectId id) {
  return std::make_unique<BoundMetadata>(binding, id);
}

std::unique_ptr<BoundObject> bindProfiler(const Binding& binding, ObjectId id) {
  return std::make_unique<BoundProfiler>(binding, id);
}

Properties propertiesOf(const spa_dict* dictionary) {
  Properties properties;
  const spa_dict_item* item = nullptr;
  if (dictionary == nullptr) return properties;
  spa_dict_for_each(item, dictionary) {
    properties[item->key] = textOr(item->value);
  }
  return properties;
}

}  // namespace tarn::streams
