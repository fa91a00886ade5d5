// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/notifications/NotificationPace.h"

#include <cstddef>
#include <map>
#include <string>
#include <utility>

#include "platform/TimerService.h"
#include "values/Mutex.h"

namespace tonewerk {

struct NotificationPace::State : std::enable_shared_from_this<State> {
  State(TimerService& t, Tell teller) : timers(t), tell(std::move(teller)) {}

  struct Name {
    std::size_t uses = 0;
    bool isPosted = false;         // since it was told last
    std::unique_ptr<Timer> timer;  // runs as long as the name must wait
  };

  void post(const std::string& text, Name& name) REQUIRES(mutex) {
    if (name.timer != nullptr) {
      name.isPosted = true;
      return;
    }
    name.timer = timers.repeat(kInterval, [weak = weak_from_this(), text] {
      if (const auto state = weak.lock()) state->tick(text);
    });
    tell(text);
  }

  void tick(const std::string& text) {
    const MutexLock lock(mutex);
    const auto found = names.find(text);
    if (found == names.end()) return;
    if (!std::exchange(found->second.isPosted, false)) {
      found->second.timer.reset();
      return;
    }
    tell(text);
  }

  TimerService& timers;
  const Tell tell;
  Mutex mutex;  // held while something is told
  std::map<std::string, Name, std::less<>> names GUARDED_BY(mutex);
};

NotificationPace::NotificationPace(TimerService& timers, Tell tell)
    : state_(std::make_shared<State>(timers, std::move(tell))) {}

NotificationPace::~NotificationPace() {
  const MutexLock lock(state_->mutex);
  state_->names.clear();
}

void NotificationPace::add(std::string_view name) {
  const MutexLock lock(state_->mutex);
  ++state_->names[std::string(name)].uses;
}

void NotificationPace::remove(std::string_view name) {
  const MutexLock lock(state_->mutex);
  const auto found = state_->names.find(name);
  if (found != state_->names.end() && --found->second.uses == 0) state_->names.erase(found);
}

void NotificationPace::post(std::string_view name) {
  const MutexLock lock(state_->mutex);
  const auto found = state_->names.find(name);
  if (found != state_->names.end()) state_->post(found->first, found->second);
}

void NotificationPace::postAll() {
  const MutexLock lock(state_->mutex);
  for (auto& [text, name] : state_->names) state_->post(text, name);
}

}  // namespace tonewerk
