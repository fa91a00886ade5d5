// SPDX-License-Identifier: Apache-2.0
#include "driver/TWReportingSessionDriverSnapshotWorker.h"

#include <cassert>
#include <utility>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

std::shared_ptr<Account> accountOfThisThread() {
  std::shared_ptr<Account> account = WorkingFor::account();
  return account != nullptr ? account : TWReportingContext::current().platform().accounts.own();
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionDriverSnapshotWorker::kWorkerClass =
    workerClassOf<TWReportingSessionDriverSnapshotWorker>("TWReportingSessionDriverSnapshotWorker");

std::optional<bool> TWReportingSessionDriverSnapshotWorker::start() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto& utility = TWReportingContext::current().singletons().get<TWReportingDriverUtility>();
  dropSnapshot();
  TWReportingDriverUtility::Snapshot snapshot = utility.getSnapShot();
  const std::uint64_t bytes = TWReportingDriverUtility::ownBytesOf(snapshot);
  const std::shared_ptr<Account> account = accountOfThisThread();
  std::optional<Charge> charge = Charge::withinShare(account, Resource::kSnapshotBytes, bytes);
  if (!charge) {
    const std::shared_ptr<TWReportingSession> owner = session.lock();
    errorLog(TWReportingDriverUtilityCategory(),
             "no driver statistics: %lu bytes are more than is left of the share of user %u. reporterID=%lli",
             bytes, account->user(), owner != nullptr ? owner->reporterID() : 0);
    return true;
  }
  charge_ = std::move(*charge);
  driverSnapShot_ = std::move(snapshot);
  return true;
}

void TWReportingSessionDriverSnapshotWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto* utility = TWReportingContext::current().singletons().find<TWReportingDriverUtility>();
  if (utility == nullptr) return;  // no worker of this class has started yet in this process
  utility->sendDriverLogsForSession(session.lock().get(), driverSnapShot_ ? &*driverSnapShot_ : nullptr);
  dropSnapshot();
}

void TWReportingSessionDriverSnapshotWorker::dropSnapshot() {
  driverSnapShot_.reset();
  charge_ = {};
}

}  // namespace tonewerk
