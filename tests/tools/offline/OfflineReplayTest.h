// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <filesystem>
#include <gmock/gmock.h>
#include <sstream>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "protocol/Requests.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/recordings/StoreText.h"
#include "tools/offline/OfflineReplay.h"

namespace tonewerk {

// Plays recordings to the core.
class OfflineReplayTest : public testing::Test {
 protected:
  // Returns the problem, or an empty text. The store is then in store().
  std::string play(const std::string& lines) {
    std::istringstream text(lines);
    std::string problem;
    const auto recording = Recording::read(text, requests::all(), json_, problem);
    if (!recording) return problem;
    refused_.clear();
    OfflineReplay replay(json_, category_, [this](const RecordedStep& call, const ReplyError& error) {
      refused_.push_back("line " + std::to_string(call.line) + ": " + error.message);
    });
    return replay.play(*recording, store(), isInterrupted_);
  }
  // Plays into a new store, and returns what is in it.
  std::string textOf(const std::string& lines) {
    std::filesystem::remove(store());
    const std::string problem = play(lines);
    return problem.empty() ? storeText(directory_.path("")) : problem;
  }

  std::string store() const { return directory_.path("reports.db"); }
  std::vector<std::string> files() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(directory_.path(""))) {
      names.push_back(entry.path().filename());
    }
    return names;
  }

  TemporaryDirectory directory_;
  NlohmannJsonService json_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  std::vector<std::string> refused_;
  std::atomic<bool> isInterrupted_ = false;
};

}  // namespace tonewerk
