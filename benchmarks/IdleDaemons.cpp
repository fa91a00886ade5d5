// SPDX-License-Identifier: Apache-2.0
#include "IdleDaemons.h"

#include <cstdint>
#include <map>
#include <memory>
#include <thread>

#include "MeasuredDaemon.h"

namespace tonewerk {
namespace {

constexpr double kMebibyte = 1 << 20;
// After its start, the daemon may still have work that is done once.
constexpr std::chrono::seconds kSettling{3};

struct Idle {
  std::unique_ptr<MeasuredDaemon> daemon;
  std::map<std::string, std::uint64_t> before;
};

// A thread that has ended meanwhile is not counted.
std::uint64_t wakeUpsOf(const Idle& idle) {
  std::uint64_t count = 0;
  for (const auto& [thread, waits] : idle.daemon->server().waitsByThread()) {
    const auto known = idle.before.find(thread);
    count += waits - (known == idle.before.end() ? 0 : known->second);
  }
  return count;
}

}  // namespace

std::vector<IdleCost> measureIdle(const std::vector<std::string>& daemons, std::chrono::seconds duration) {
  std::vector<Idle> all;
  all.reserve(daemons.size());
  for (const std::string& program : daemons) {
    all.push_back({std::make_unique<MeasuredDaemon>(program, DaemonSettings{}), {}});
  }
  std::this_thread::sleep_for(kSettling);
  for (Idle& idle : all) idle.before = idle.daemon->server().waitsByThread();
  std::this_thread::sleep_for(duration);
  std::vector<IdleCost> costs;
  costs.reserve(all.size());
  const double inAnHour = std::chrono::hours(1) / std::chrono::duration<double>(duration);
  for (const Idle& idle : all) {
    costs.push_back({static_cast<double>(wakeUpsOf(idle)) * inAnHour,
                     static_cast<double>(idle.daemon->server().residentMemory()) / kMebibyte});
  }
  return costs;
}

}  // namespace tonewerk
