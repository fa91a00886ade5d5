// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <thread>

#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "platform/Messaging.h"
#include "platform/linux/dbus/DbusInterface.h"
#include "platform/linux/dbus/DbusService.h"
#include "platform/linux/threads/IoWaker.h"
#include "values/GrowingDelay.h"
#include "values/Mutex.h"

namespace tonewerk {

// Serves clients on a D-Bus, all of them on one thread of its own, the bus's thread. Each unique name that
// makes a request gets a connection, which ends when the name vanishes.
//
// Without a bus it tries to connect again after kFirstPause and then after growing pauses, up to
// kLongestPause. It does the same when the bus goes away, which ends every connection, and when the bus
// refuses the name. If another process has the name, it waits for the name on the bus.
class DbusListener final : public MessagingListener {
 public:
  static constexpr std::chrono::milliseconds kFirstPause{250};
  static constexpr std::chrono::milliseconds kLongestPause{60'000};

  // `methods`, `log`, `accounts` and `memory` outlive the listener. Delegates export objects of these
  // methods. `address` is a D-Bus address, empty for the system's bus. `memory` learns how many bytes clients
  // send and when a client is gone. It may be null.
  DbusListener(DbusNames names, const RequestSet& methods, std::string address, const LogCategory& log,
               Accounts& accounts, AllocatorReclaimer* memory = nullptr);
  ~DbusListener() override;

  // Why the bus's thread could not be woken: the system had no descriptor. Then resume() is not called.
  std::error_code problem() const { return waker_->problem(); }

  void setDelegate(MessagingListenerDelegate& delegate) override { delegate_ = &delegate; }
  void resume() override;
  void shutDown() override;

  // Any thread. The bus's thread beats with each event, and rests while it waits for one or for the bus.
  std::shared_ptr<const Heartbeat> heartbeat() const { return heartbeat_; }

 private:
  void run();
  // Logs why the service has ended, but does not repeat the same reason with every try.
  void logEnd(DbusService::End end, const std::string& problem);
  void pause();

  const DbusNames names_;
  const std::string address_;
  const LogCategory& log_;
  const DbusInterface interface_;
  Accounts& accounts_;
  AllocatorReclaimer* const memory_;
  MessagingListenerDelegate* delegate_ = nullptr;
  const std::shared_ptr<IoWaker> waker_ = std::make_shared<IoWaker>();
  const std::shared_ptr<Heartbeat> heartbeat_ = std::make_shared<Heartbeat>();

  // Used by the bus's thread only.
  RpcStrings texts_;
  GrowingDelay pause_{kFirstPause, kLongestPause};
  std::optional<DbusService::End> lastEnd_;

  Mutex lifeMutex_;  // held by resume() and shutDown()
  std::atomic<bool> isStopping_ = false;
  std::thread thread_ GUARDED_BY(lifeMutex_);
};

// The address of the session's bus from the environment; empty, for the system's bus, without one.
std::string dbusAddressFromEnvironment();

}  // namespace tonewerk
