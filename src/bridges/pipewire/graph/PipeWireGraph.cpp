// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PipeWireGraph.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <functional>
#include <map>
#include <pipewire/extensions/profiler.h>
#include <pipewire/pipewire.h>
#include <set>
#include <string>
#include <utility>

#include "bridges/pipewire/graph/PipeWireParams.h"
#include "bridges/pipewire/graph/PipeWireProfiler.h"
#include "tonewerk/signpost.h"

namespace tonewerk {

namespace {

Properties propertiesOf(const spa_dict* dictionary) {
  Properties properties;
  if (dictionary == nullptr) return properties;
  for (const std::string_view key : kUsedKeys) {
    const char* value =
        spa_dict_lookup(dictionary, key.data());  // the keys are literals, which end with a zero
    if (value != nullptr) properties.emplace(key, value);
  }
  return properties;
}

std::optional<std::uint32_t> numberOf(const spa_dict* dictionary, std::string_view key) {
  const char* text = dictionary == nullptr ? nullptr : spa_dict_lookup(dictionary, key.data());
  std::uint32_t number = 0;
  if (text == nullptr || !spa_atou32(text, &number, 10)) return std::nullopt;
  return number;
}

// Owns the proxy of one object of the graph, and its listener.
class BoundObject {
 public:
  explicit BoundObject(pw_proxy* proxy) : proxy_(proxy) {}
  BoundObject(const BoundObject&) = delete;
  BoundObject& operator=(const BoundObject&) = delete;
  virtual ~BoundObject() {
    spa_hook_remove(&listener_);
    pw_proxy_destroy(proxy_);
  }

 protected:
  pw_proxy* proxy() const { return proxy_; }
  spa_hook& listener() { return listener_; }

 private:
  pw_proxy* proxy_;
  spa_hook listener_{};
};

class BoundNode final : public BoundObject {
 public:
  BoundNode(pw_proxy* proxy, std::uint32_t identifier, GraphModel& model)
      : BoundObject(proxy), identifier_(identifier), model_(model) {
    static const pw_node_events kEvents = [] {
      pw_node_events events{};
      events.version = PW_VERSION_NODE_EVENTS;
      events.info = [](void* self, const pw_node_info* info) {
        static_cast<BoundNode*>(self)->onInfo(*info);
      };
      events.param = [](void* self, int, std::uint32_t parameter, std::uint32_t, std::uint32_t,
                        const spa_pod* pod) {
        if (pod != nullptr) static_cast<BoundNode*>(self)->onParameter(parameter, *pod);
      };
      return events;
    }();
    auto* node = reinterpret_cast<pw_node*>(proxy);
    pw_node_add_listener(node, &listener(), &kEvents, this);
    std::array<std::uint32_t, 2> parameters{SPA_PARAM_Props, SPA_PARAM_Format};
    pw_node_subscribe_params(node, parameters.data(), parameters.size());
  }

 private:
  void onInfo(const pw_node_info& info) {
    const signpost::Interval interval("tw-pipewire.node", identifier_);
    model_.nodeDescribed(identifier_, info.state == PW_NODE_STATE_RUNNING, propertiesOf(info.props));
  }

  void onParameter(std::uint32_t parameter, const spa_pod& pod) {
    const signpost::Interval interval("tw-pipewire.parameter", identifier_);
    if (parameter == SPA_PARAM_Props) {
      model_.volumeChanged(identifier_, volumeOf(pod));
    } else if (const std::optional<AudioFormat> format = formatOf(pod)) {
      model_.formatChanged(identifier_, *format);
    }
  }

  std::uint32_t identifier_;
  GraphModel& model_;
};

class BoundClient final : public BoundObject {
 public:
  BoundClient(pw_proxy* proxy, std::uint32_t identifier, GraphModel& model)
      : BoundObject(proxy), identifier_(identifier), model_(model) {
    static const pw_client_events kEvents = [] {
      pw_client_events events{};
      events.version = PW_VERSION_CLIENT_EVENTS;
      events.info = [](void* self, const pw_client_info* info) {
        static_cast<BoundClient*>(self)->onInfo(*info);
      };
      return events;
    }();
    pw_client_add_listener(reinterpret_cast<pw_client*>(proxy), &listener(), &kEvents, this);
  }

 private:
  void onInfo(const pw_client_info& info) { model_.clientDescribed(identifier_, propertiesOf(info.props)); }

  std::uint32_t identifier_;
  GraphModel& model_;
};

}  // namespace

// Owns one connection to the PipeWire daemon, and the objects bound through it.
class PipeWireGraph::Connection {
 public:
  // Null when there is no daemon; errno gives the reason.
  static std::unique_ptr<Connection> make(PipeWireGraph& graph) {
    pw_core* core = pw_context_connect(graph.context_, nullptr, 0);
    if (core == nullptr) return nullptr;
    return std::make_unique<Connection>(graph, core);
  }

  Connection(PipeWireGraph& graph, pw_core* core)
      : graph_(graph), core_(core), registry_(pw_core_get_registry(core, PW_VERSION_REGISTRY, 0)) {
    listenToCore();
    if (registry_ == nullptr) return;
    profiler_ = std::make_unique<PipeWireProfiler>(registry_, graph_.profiles_);
    listenToRegistry();
    sync_ = pw_core_sync(core_, PW_ID_CORE, 0);
  }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;
  ~Connection() {
    bound_.clear();
    profiler_.reset();
    if (registry_ != nullptr) {
      spa_hook_remove(&registryListener_);
      pw_proxy_destroy(reinterpret_cast<pw_proxy*>(registry_));
    }
    spa_hook_remove(&coreListener_);
    pw_core_disconnect(core_);
  }

 private:
  void listenToCore() {
    static const pw_core_events kEvents = [] {
      pw_core_events events{};
      events.version = PW_VERSION_CORE_EVENTS;
      events.info = [](void* self, const pw_core_info*) {
        static_cast<Connection*>(self)->graph_.established();
      };
      events.done = [](void* self, std::uint32_t object, int sequence) {
        if (object == PW_ID_CORE) static_cast<Connection*>(self)->onDone(sequence);
      };
      events.error = [](void* self, std::uint32_t object, int, int result, const char* message) {
        static_cast<Connection*>(self)->onError(object, result, message);
      };
      return events;
    }();
    pw_core_add_listener(core_, &coreListener_, &kEvents, this);
  }

  void listenToRegistry() {
    static const pw_registry_events kEvents = [] {
      pw_registry_events events{};
      events.version = PW_VERSION_REGISTRY_EVENTS;
      events.global = [](void* self, std::uint32_t identifier, std::uint32_t, const char* type, std::uint32_t,
                         const spa_dict* properties) {
        static_cast<Connection*>(self)->onAppeared(identifier, type, properties);
      };
      events.global_remove = [](void* self, std::uint32_t identifier) {
        static_cast<Connection*>(self)->onRemoved(identifier);
      };
      return events;
    }();
    pw_registry_add_listener(registry_, &registryListener_, &kEvents, this);
  }

  // The first answer comes after all objects have appeared and their descriptions have been requested; the
  // second comes after these descriptions.
  void onDone(int sequence) {
    if (sequence != sync_) return;
    if (std::exchange(hasListed_, true)) {
      sync_ = -1;
      graph_.model_.complete();
    } else {
      sync_ = pw_core_sync(core_, PW_ID_CORE, 0);
    }
  }

  void onError(std::uint32_t object, int result, const char* message) {
    // Errors on other objects come from their removal while a request was on its way.
    if (object == PW_ID_CORE && result == -EPIPE) {
      if (!std::exchange(broken_, true)) graph_.lost();
      return;
    }
    graph_.console_.detail(std::string("PipeWire: ") + message);
  }

  void onAppeared(std::uint32_t identifier, std::string_view type, const spa_dict* dictionary) {
    if (type == PW_TYPE_INTERFACE_Node) return onNode(identifier, propertiesOf(dictionary));
    if (type == PW_TYPE_INTERFACE_Client) {
      bind<BoundClient>(identifier, PW_TYPE_INTERFACE_Client, PW_VERSION_CLIENT);
      return;
    }
    if (type == PW_TYPE_INTERFACE_Profiler) return profiler_->appeared(identifier);
    if (type != PW_TYPE_INTERFACE_Link) return;
    const std::optional<std::uint32_t> output = numberOf(dictionary, kLinkOutputNodeKey);
    const std::optional<std::uint32_t> input = numberOf(dictionary, kLinkInputNodeKey);
    if (output && input) graph_.model_.linkAppeared(identifier, *output, *input);
  }

  void onNode(std::uint32_t identifier, const Properties& properties) {
    if (isStream(properties)) {
      streams_.insert(identifier);
      profiler_->setWanted(true);
    }
    graph_.model_.nodeAppeared(identifier, properties);
    // Of others, such as filters, the properties in the registry are enough.
    if (!isOutputStream(properties) && !isSink(properties) && !isSource(properties)) return;
    bind<BoundNode>(identifier, PW_TYPE_INTERFACE_Node, PW_VERSION_NODE);
  }

  template <typename Object>
  void bind(std::uint32_t identifier, const char* type, std::uint32_t version) {
    auto* proxy = static_cast<pw_proxy*>(pw_registry_bind(registry_, identifier, type, version, 0));
    if (proxy == nullptr) return;
    bound_.insert_or_assign(identifier, std::make_unique<Object>(proxy, identifier, graph_.model_));
  }

  void onRemoved(std::uint32_t identifier) {
    bound_.erase(identifier);
    profiler_->removed(identifier);
    streams_.erase(identifier);
    profiler_->setWanted(!streams_.empty());
    graph_.model_.removed(identifier);
  }

  PipeWireGraph& graph_;
  pw_core* core_;
  pw_registry* registry_;
  bool broken_ = false;
  int sync_ = -1;  // sequence number of the pending sync; -1 when none is
  bool hasListed_ = false;
  spa_hook coreListener_{};
  spa_hook registryListener_{};
  std::map<std::uint32_t, std::unique_ptr<BoundObject>> bound_;
  std::set<std::uint32_t> streams_;  // audio streams, playing or recording
  std::unique_ptr<PipeWireProfiler> profiler_;
};

PipeWireGraph::PipeWireGraph(PipeWireLoop& loop, GraphModel& model, ProfileObserver& profiles,
                             const Console& console)
    : model_(model),
      profiles_(profiles),
      console_(console),
      loop_(loop),
      retryTimer_(loop.makeTimer([this] { retryNow(); })) {}

PipeWireGraph::~PipeWireGraph() {
  connection_.reset();
  if (context_ != nullptr) pw_context_destroy(context_);
}

bool PipeWireGraph::open() {
  context_ = pw_context_new(loop_.native(), nullptr, 0);
  if (context_ == nullptr) return false;
  if (!PipeWireProfiler::loadProtocol(context_)) {
    console_.say("cannot use PipeWire's profiler: no statistics of drivers, no overloads");
  }
  connect();
  return true;
}

void PipeWireGraph::connect() {
  connection_ = Connection::make(*this);
  if (connection_ != nullptr) return;
  if (!std::exchange(hasReportedAbsence_, true)) {
    console_.say(std::string("no PipeWire (") + std::strerror(errno) + "), trying on");
  }
  retryTimer_->arm(retryDelay_.next());
}

void PipeWireGraph::established() {
  if (std::exchange(established_, true)) return;
  hasReportedAbsence_ = false;
  retryDelay_.reset();
  console_.say("connected to PipeWire");
}

// Called from inside the connection, so the connection is destroyed later, by the timer.
void PipeWireGraph::lost() {
  established_ = false;
  console_.say("lost PipeWire");
  model_.clear();
  retryTimer_->arm(retryDelay_.next());
}

void PipeWireGraph::retryNow() {
  connection_.reset();
  connect();
}

}  // namespace tonewerk
