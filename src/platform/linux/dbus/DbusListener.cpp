// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/DbusListener.h"

#include <cassert>
#include <cstdlib>
#include <poll.h>
#include <sys/eventfd.h>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {

DbusListener::DbusListener(DbusNames names, const RequestSet& methods, std::string address,
                           const LogCategory& log, Accounts& accounts, AllocatorReclaimer* memory)
    : names_(std::move(names)),
      address_(std::move(address)),
      log_(log),
      interface_(methods),
      accounts_(accounts),
      memory_(memory) {}

DbusListener::~DbusListener() { shutDown(); }

void DbusListener::resume() {
  const MutexLock lock(lifeMutex_);
  assert(delegate_ != nullptr && !problem());
  if (thread_.joinable() || isStopping_) return;
  thread_ = std::thread([this] { run(); });
}

void DbusListener::shutDown() {
  const MutexLock lock(lifeMutex_);
  assert(std::this_thread::get_id() != thread_.get_id());
  isStopping_ = true;
  waker_->wake(0);
  if (thread_.joinable()) thread_.join();
}

void DbusListener::run() {
  nameThisThread("tw-dbus");
  const Heartbeat::OnThisThread heartbeat(heartbeat_);
  heartbeat_->beat();
  const DbusConnectionContext context{interface_, *delegate_, accounts_, waker_, texts_, log_, memory_};
  while (!isStopping_) {
    const auto start = std::chrono::steady_clock::now();
    {
      DbusService service(names_, address_, context);
      const DbusService::End end = service.serve(isStopping_);
      logEnd(end, service.problem());
    }
    if (std::chrono::steady_clock::now() - start >= kLongestPause) pause_.reset();
    pause();
  }
}

void DbusListener::logEnd(DbusService::End end, const std::string& problem) {
  using End = DbusService::End;
  const std::optional<End> before = std::exchange(lastEnd_, end);
  if (end == End::kLost) {
    errorLog(log_, "D-Bus is gone: %@", problem);
  } else if (end == End::kRefused && before != End::kRefused) {
    errorLog(log_, "D-Bus refuses %@: %@", names_.name, problem);
  } else if (end == End::kNoBus && before != End::kNoBus && before != End::kLost) {
    infoLog(log_, "no D-Bus to serve on: %@", problem);
  }
}

// Waits until it is time to try again or the listener is stopped.
void DbusListener::pause() {
  const auto end = std::chrono::steady_clock::now() + pause_.next();
  while (!isStopping_) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - std::chrono::steady_clock::now());
    if (left <= std::chrono::milliseconds::zero()) return;
    pollfd waited{waker_->fileDescriptor(), POLLIN, 0};
    {
      const Heartbeat::Rest rest;
      ::poll(&waited, 1, static_cast<int>(left.count()));
    }
    eventfd_t count = 0;
    static_cast<void>(::eventfd_read(waker_->fileDescriptor(), &count));
    static_cast<void>(waker_->take());  // dropped: the clients are gone
  }
}

std::string dbusAddressFromEnvironment() {
  const char* session = std::getenv("DBUS_SESSION_BUS_ADDRESS");
  return session == nullptr ? "" : session;
}

}  // namespace tonewerk
