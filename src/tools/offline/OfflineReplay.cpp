// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineReplay.h"

#include <cerrno>
#include <chrono>
#include <cstddef>
#include <filesystem>
#include <stdlib.h>
#include <system_error>
#include <utility>

#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"
#include "tools/offline/OfflineDaemon.h"

namespace tonewerk {
namespace {

// So many steps are between two writes, which are the only ones that take the rows out of memory.
constexpr std::size_t kStepsPerFlush = 256;
constexpr std::chrono::milliseconds kPatience{5'000};

constexpr const char* kInterrupted = "interrupted";

// A directory for the store while it is made, beside its final place. Goes with everything in it.
class WorkDirectory {
 public:
  WorkDirectory() = default;
  WorkDirectory(const WorkDirectory&) = delete;
  WorkDirectory& operator=(const WorkDirectory&) = delete;
  ~WorkDirectory() {
    std::error_code ignored;
    if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
  }

  [[nodiscard]] std::error_code make(const std::filesystem::path& parent) {
    std::string path = parent / ".tw-replay-XXXXXX";
    if (::mkdtemp(path.data()) == nullptr) return {errno, std::generic_category()};
    path_ = std::move(path);
    return {};
  }
  const std::string& path() const { return path_; }

 private:
  std::string path_;
};

// The first line, if it is about the device.
ValueMap deviceOf(const Recording& recording) {
  const auto& steps = recording.steps();
  return steps.empty() || steps.front().kind != RecordedStep::Kind::kDevice ? ValueMap()
                                                                            : steps.front().properties;
}

// Leaves no file beside the database's, so that it can be moved and read anywhere. A recording without a
// report makes an empty store.
std::string completeFile(const std::string& path) {
  SqliteDatabase database;
  const bool isComplete = database.open(path, SqliteDatabase::Mode::kReadWrite, kPatience) &&
                          (database.number("PRAGMA user_version") != 0 || database.run(storeSchema())) &&
                          database.run("PRAGMA journal_mode = DELETE");
  return isComplete ? std::string() : database.problem();
}

}  // namespace

OfflineReplay::OfflineReplay(JsonService& json, const LogCategory& log, Refusal refusal)
    : json_(json), log_(log), refusal_(std::move(refusal)) {}

std::string OfflineReplay::problemWith(const Recording& recording, const JsonService& json) {
  OfflineChanmeter chanmeter(json);
  for (const RecordedStep& step : recording.steps()) {
    if (step.kind != RecordedStep::Kind::kDevice) continue;
    const std::string problem = chanmeter.change(step.properties);
    if (!problem.empty()) return "line " + std::to_string(step.line) + ": " + problem;
  }
  return {};
}

std::string OfflineReplay::play(const Recording& recording, const std::string& store,
                                const std::atomic<bool>& isInterrupted) {
  std::error_code error;
  const std::filesystem::path place = std::filesystem::absolute(store, error);
  if (error) return store + ": " + error.message();
  if (std::filesystem::exists(std::filesystem::symlink_status(place, error)))
    return store + ": it exists already";
  WorkDirectory work;
  error = work.make(place.parent_path());
  if (error) return place.parent_path().string() + ": " + error.message();
  std::string problem = playInto(work.path(), recording, isInterrupted);
  const std::string made = work.path() + "/" + std::string(kStoreFileName);
  if (problem.empty()) problem = completeFile(made);
  if (problem.empty() && isInterrupted) problem = kInterrupted;
  if (!problem.empty()) return store + ": " + problem;
  error = LinuxFileSystem().moveFile(made, place.parent_path(), place.filename());
  return error ? store + ": " + error.message() : std::string();
}

std::string OfflineReplay::playInto(const std::string& directory, const Recording& recording,
                                    const std::atomic<bool>& isInterrupted) {
  constexpr const char* kNotWritten = "the store cannot be written";
  OfflineDaemon daemon(directory, deviceOf(recording), json_, log_, refusal_, isInterrupted);
  std::size_t steps = 0;
  for (const RecordedStep& step : recording.steps()) {
    if (isInterrupted) return kInterrupted;
    if (step.kind != RecordedStep::Kind::kDevice || &step != &recording.steps().front()) daemon.take(step);
    if (++steps % kStepsPerFlush == 0 && !daemon.flush()) return kNotWritten;
  }
  daemon.end();
  return daemon.flush() ? std::string() : kNotWritten;
}

}  // namespace tonewerk
