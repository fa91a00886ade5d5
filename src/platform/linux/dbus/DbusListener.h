// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <thread>

#include "platform/Log.h"
#include "platform/Messaging.h"
#include "platform/linux/dbus/DbusInterface.h"
#include "platform/linux/dbus/DbusService.h"
#include "platform/linux/threads/IoWaker.h"
#include "values/GrowingDelay.h"
#include "values/Mutex.h"

namespace tonewerk {

// Serves clients on a D-Bus, all of them on one thread of its own, the bus's thread: one connection for each
// unique name that makes a request, ended when the name vanishes.
//
// Without a bus it does nothing but to look for it again, after kFirstPause and then ever more rarely, at
// last every kLongestPause; the same when the bus goes away, which ends every connection, or refuses the
// name. A name that another has is waited for on the bus.
class DbusListener final : public MessagingListener {
 public:
  static constexpr std::chrono::milliseconds kFirstPause{250};
  static constexpr std::chrono::milliseconds kLongestPause{60'000};

  // `methods` and `log` outlive the listener; delegates export objects of these methods. `address` is a D-Bus
  // address, empty for the system's bus. `memory`, which outlives the listener, is told of what clients
  // bring, and of their ends.
  DbusListener(DbusNames names, const RequestSet& methods, std::string address, const LogCategory& log,
               AllocatorReclaimer* memory = nullptr);
  ~DbusListener() override;

  void setDelegate(MessagingListenerDelegate& delegate) override { delegate_ = &delegate; }
  void resume() override;
  void shutDown() override;

 private:
  void run();
  // Logs why the service has ended, but not the same again with every try.
  void tell(DbusService::End end, const std::string& problem);
  void pause();

  const DbusNames names_;
  const std::string address_;
  const LogCategory& log_;
  const DbusInterface interface_;
  AllocatorReclaimer* const memory_;
  MessagingListenerDelegate* delegate_ = nullptr;
  const std::shared_ptr<IoWaker> waker_ = std::make_shared<IoWaker>();

  // The bus's thread's.
  RpcStrings texts_;
  GrowingDelay pause_{kFirstPause, kLongestPause};
  std::optional<DbusService::End> lastEnd_;

  Mutex lifeMutex_;  // held by resume() and shutDown()
  std::atomic<bool> isStopping_ = false;
  std::thread thread_ GUARDED_BY(lifeMutex_);
};

// The bus that the environment names: the session's, else the system's (empty).
std::string dbusAddressFromEnvironment();

}  // namespace tonewerk
