// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/CollectorRunner.h"

#include <condition_variable>
#include <mutex>
#include <optional>
#include <system_error>
#include <thread>
#include <utility>

#include "platform/linux/threads/ThreadProperties.h"
#include "values/ShortenedText.h"
#include "values/Utf8.h"

namespace tonewerk {

// Outlives the runner when a collector hangs.
struct CollectorRunner::Shared {
  std::mutex mutex;  // guards the flag and every slot's fields
  std::condition_variable changed;
  bool isInterrupted = false;
};

struct CollectorRunner::Slot {
  std::shared_ptr<DiagnosticCollector> collector;
  bool isBusy = false;
  std::optional<DiagnosticCollector::Result> result = {};
};

CollectorRunner::CollectorRunner(std::vector<std::shared_ptr<DiagnosticCollector>> collectors,
                                 const Limits& limits)
    : limits_(limits), shared_(std::make_shared<Shared>()) {
  for (auto& collector : collectors) slots_.push_back(std::make_shared<Slot>(Slot{std::move(collector)}));
}

CollectorRunner::~CollectorRunner() = default;

DiagnosticEvidence CollectorRunner::run() {
  DiagnosticEvidence evidence;
  for (const std::shared_ptr<Slot>& slot : slots_) {
    const std::string name(slot->collector->fileName());
    DiagnosticCollector::Result result = runOne(slot);
    // Whatever processes, cards and nodes call themselves: who reads evidence may count on text.
    result.text = validUtf8(std::move(result.text));
    result.problem = validUtf8(std::move(result.problem));
    if (result.text.size() > limits_.bytes) {
      result.text.resize(shortened(result.text, limits_.bytes).size());
      result.problem = "cut at " + std::to_string(limits_.bytes) + " bytes";
    }
    if (!result.problem.empty()) evidence.problems.emplace_back(name, std::move(result.problem));
    if (!result.text.empty()) evidence.files.push_back({name, std::move(result.text)});
  }
  return evidence;
}

void CollectorRunner::interrupt() {
  const std::lock_guard lock(shared_->mutex);
  shared_->isInterrupted = true;
  shared_->changed.notify_all();
}

DiagnosticCollector::Result CollectorRunner::runOne(const std::shared_ptr<Slot>& slot) {
  {
    const std::lock_guard lock(shared_->mutex);
    if (shared_->isInterrupted) return {{}, "the daemon was ending"};
    if (slot->isBusy) return {{}, "still busy with an earlier item"};
    slot->isBusy = true;
    slot->result.reset();
  }
  try {
    std::thread([slot, shared = shared_] {
      nameThisThread("tw-collector");
      DiagnosticCollector::Result result = slot->collector->collect();
      const std::lock_guard lock(shared->mutex);
      slot->result = std::move(result);
      slot->isBusy = false;
      shared->changed.notify_all();
    }).detach();
  } catch (const std::system_error& error) {
    const std::lock_guard lock(shared_->mutex);
    slot->isBusy = false;
    return {{}, std::string("no thread: ") + error.what()};
  }
  return await(*slot);
}

DiagnosticCollector::Result CollectorRunner::await(Slot& slot) {
  const auto deadline = std::chrono::steady_clock::now() + limits_.time;
  std::unique_lock lock(shared_->mutex);
  while (!slot.result) {
    if (shared_->isInterrupted) return {{}, "the daemon was ending"};
    if (shared_->changed.wait_until(lock, deadline) == std::cv_status::timeout && !slot.result) {
      return {{}, "timed out after " + std::to_string(limits_.time.count()) + " ms"};
    }
  }
  return *std::exchange(slot.result, std::nullopt);
}

}  // namespace tonewerk
