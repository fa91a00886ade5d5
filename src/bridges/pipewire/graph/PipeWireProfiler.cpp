// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PipeWireProfiler.h"

#include <pipewire/extensions/profiler.h>
#include <pipewire/impl.h>
#include <pipewire/pipewire.h>

#include "bridges/pipewire/graph/PipeWireProfile.h"

namespace tonewerk {

class PipeWireProfiler::Bound {
 public:
  Bound(pw_proxy* proxy, ProfileObserver& observer) : proxy_(proxy), observer_(observer) {
    static const pw_profiler_events kEvents = [] {
      pw_profiler_events events{};
      events.version = PW_VERSION_PROFILER_EVENTS;
      events.profile = [](void* self, const spa_pod* pod) {
        if (pod != nullptr) static_cast<Bound*>(self)->observer_.profiled(cyclesOf(*pod));
      };
      return events;
    }();
    pw_proxy_add_object_listener(proxy_, &listener_, &kEvents, this);
  }
  Bound(const Bound&) = delete;
  Bound& operator=(const Bound&) = delete;
  ~Bound() {
    spa_hook_remove(&listener_);
    pw_proxy_destroy(proxy_);
  }

 private:
  pw_proxy* proxy_;
  ProfileObserver& observer_;
  spa_hook listener_{};
};

bool PipeWireProfiler::loadProtocol(pw_context* context) {
  return pw_context_load_module(context, PW_EXTENSION_MODULE_PROFILER, nullptr, nullptr) != nullptr;
}

PipeWireProfiler::PipeWireProfiler(pw_registry* registry, ProfileObserver& observer)
    : registry_(registry), observer_(observer) {}

PipeWireProfiler::~PipeWireProfiler() = default;

void PipeWireProfiler::appeared(std::uint32_t identifier) {
  if (identifier_) return;
  identifier_ = identifier;
  update();
}

void PipeWireProfiler::removed(std::uint32_t identifier) {
  if (identifier_ != identifier) return;
  identifier_.reset();
  update();
}

void PipeWireProfiler::setWanted(bool isWanted) {
  isWanted_ = isWanted;
  update();
}

void PipeWireProfiler::update() {
  if (!isWanted_ || !identifier_) {
    bound_.reset();
  } else if (bound_ == nullptr) {
    auto* proxy = static_cast<pw_proxy*>(
        pw_registry_bind(registry_, *identifier_, PW_TYPE_INTERFACE_Profiler, PW_VERSION_PROFILER, 0));
    if (proxy != nullptr) bound_ = std::make_unique<Bound>(proxy, observer_);
  }
}

}  // namespace tonewerk
