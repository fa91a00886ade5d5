// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/SessionReplay.h"

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <system_error>

#include "platform/linux/journal/JournalReader.h"
#include "tools/journal/JournalRecorder.h"
#include "tools/recording/RecordingWriter.h"
#include "tools/twctl/commands/OfflineProgram.h"
#include "tools/twctl/commands/RecordedDevice.h"

namespace tonewerk {
namespace {

constexpr const char* kGone =
    "the journal no longer has its requests, which the preference journal_days of com.orvane.tonewerk.store "
    "lets it keep";

// A directory for the recording and what is made of it, which only this user may read. Goes with everything.
class PrivateDirectory {
 public:
  PrivateDirectory() = default;
  PrivateDirectory(const PrivateDirectory&) = delete;
  PrivateDirectory& operator=(const PrivateDirectory&) = delete;
  ~PrivateDirectory() {
    std::error_code ignored;
    if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
  }

  [[nodiscard]] std::error_code make() {
    std::error_code error;
    std::string path = std::filesystem::temp_directory_path(error) / "twctl-session-XXXXXX";
    if (error) return error;
    if (::mkdtemp(path.data()) == nullptr) return {errno, std::generic_category()};
    path_ = std::move(path);
    return {};
  }
  std::string file(const std::string& name) const { return path_ + "/" + name; }

 private:
  std::string path_;
};

// Returns the problem; empty when the recording has been written.
std::string record(const Tool& tool, const StoredSession& session, const std::string& file) {
  const std::string journal = tool.directories().state + "/journal";
  LinuxJournalDirectory directory(journal);
  std::error_code error = directory.openToRead();
  struct stat status {};
  if (!error && stat(journal.c_str(), &status) != 0) error = {errno, std::generic_category()};
  if (error == std::errc::no_such_file_or_directory) return "there is no journal";
  if (error) return "the journal cannot be read: " + error.message();
  std::ofstream out(file);
  RecordingWriter writer(out, tool.json, recordedDevice(tool, status.st_uid));
  JournalRecorder recorder(writer,
                           SessionChoice({session.reporterID, std::nullopt, std::nullopt}, status.st_uid));
  JournalReader reader(directory);
  error = reader.read([&](const Journal::Record& record, bool isFirstOfProcess) {
    if (isFirstOfProcess) recorder.endProcess();
    recorder.take(record);
    return out.good();
  });
  recorder.end();
  if (error) return "the journal cannot be read: " + error.message();
  if (recorder.requests() == 0) return kGone;
  return writer.finish() ? std::string() : "its requests cannot be written to " + file;
}

}  // namespace

ReasonedLife* SessionReplay::play(const Tool& tool, const StoredSession& session) {
  PrivateDirectory directory;
  if (const std::error_code error = directory.make()) {
    why_ = "no directory for the replay: " + error.message();
    return nullptr;
  }
  const std::string recording = directory.file("session.jsonl");
  why_ = record(tool, session, recording);
  if (!why_.empty()) return nullptr;
  const std::string program = offlineProgram();
  const std::string output = directory.file("reasons.jsonl");
  int status = 0;
  const std::error_code error =
      runProgram({program, "--reasons", recording, directory.file("reports.db")}, output, status);
  // 1 says that a request was refused, as it was by the daemon, too.
  if (error || !WIFEXITED(status) || WEXITSTATUS(status) > kRefused) {
    why_ = program + ": " + (error ? error.message() : "it cannot play what the journal has");
    return nullptr;
  }
  std::ifstream text(output);
  std::optional<std::vector<ReasonedLife>> lives = readReasons(text, tool.json, why_);
  if (!lives) return nullptr;
  lives_ = std::move(*lives);
  const ReasonedLife* life = lifeOf(lives_, session);
  if (life == nullptr) {
    why_ = kGone;
    return nullptr;
  }
  return &lives_[static_cast<std::size_t>(life - lives_.data())];
}

}  // namespace tonewerk
