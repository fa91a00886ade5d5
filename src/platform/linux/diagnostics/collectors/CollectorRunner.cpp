// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/CollectorRunner.h"

#include <optional>
#include <system_error>
#include <thread>
#include <utility>

#include "platform/linux/threads/ThreadProperties.h"
#include "values/Mutex.h"
#include "values/ShortenedText.h"
#include "values/Utf8.h"

namespace tonewerk {

// State shared with the collectors' threads. It outlives the runner if a collector does not return.
struct CollectorRunner::Shared {
  // What one collector is doing.
  struct Progress {
    bool isBusy = false;
    std::optional<DiagnosticCollector::Result> result;
  };

  explicit Shared(std::size_t collectors) : progress(collectors) {}

  Mutex mutex;
  Condition changed;
  bool isInterrupted GUARDED_BY(mutex) = false;
  std::vector<Progress> progress GUARDED_BY(mutex);  // in the order of the collectors
};

CollectorRunner::CollectorRunner(std::vector<std::shared_ptr<DiagnosticCollector>> collectors,
                                 const Limits& limits)
    : limits_(limits),
      collectors_(std::move(collectors)),
      shared_(std::make_shared<Shared>(collectors_.size())) {}

CollectorRunner::~CollectorRunner() = default;

DiagnosticEvidence CollectorRunner::run() {
  DiagnosticEvidence evidence;
  for (std::size_t index = 0; index < collectors_.size(); ++index) {
    const std::string name(collectors_[index]->fileName());
    DiagnosticCollector::Result result = runOne(index);
    // Names of processes, cards and nodes can hold any bytes. Readers of evidence rely on UTF-8.
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
  const MutexLock lock(shared_->mutex);
  shared_->isInterrupted = true;
  shared_->changed.notifyAll();
}

DiagnosticCollector::Result CollectorRunner::runOne(std::size_t index) {
  {
    const MutexLock lock(shared_->mutex);
    if (shared_->isInterrupted) return {{}, "the daemon was ending"};
    Shared::Progress& progress = shared_->progress[index];
    if (progress.isBusy) return {{}, "still busy with an earlier item"};
    progress = {.isBusy = true, .result = std::nullopt};
  }
  try {
    std::thread([collector = collectors_[index], shared = shared_, index] {
      nameThisThread("tw-collector");
      DiagnosticCollector::Result result = collector->collect();
      const MutexLock lock(shared->mutex);
      shared->progress[index] = {.isBusy = false, .result = std::move(result)};
      shared->changed.notifyAll();
    }).detach();
  } catch (const std::system_error& error) {
    const MutexLock lock(shared_->mutex);
    shared_->progress[index].isBusy = false;
    return {{}, std::string("no thread: ") + error.what()};
  }
  return await(index);
}

DiagnosticCollector::Result CollectorRunner::await(std::size_t index) {
  const auto deadline = std::chrono::steady_clock::now() + limits_.time;
  MutexLock lock(shared_->mutex);
  std::optional<DiagnosticCollector::Result>& result = shared_->progress[index].result;
  while (!result) {
    if (shared_->isInterrupted) return {{}, "the daemon was ending"};
    if (!shared_->changed.waitUntil(lock, deadline) && !result) {
      return {{}, "timed out after " + std::to_string(limits_.time.count()) + " ms"};
    }
  }
  return *std::exchange(result, std::nullopt);
}

}  // namespace tonewerk
