// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>

#include "session/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

class WritableFile;

// One JSON summary file: an array written line by line, an object of one member a message.
//
//   [
//   {
//     "Volume_Summary_1": { ... }
//   }
//   ,
//   ...
//   ]
//
// Failures are logged and never stop the rest. One thread at a time.
class SummaryJsonFile {
 public:
  // The file is made in `directory`, which is made too, at the first message.
  SummaryJsonFile(std::string directory, std::string name);
  ~SummaryJsonFile();

  // The member is called by category, type and how many of the two this file has had.
  void writeMessage(AudioEventCategory category, AudioEventType type, const ValueMap& payload);

  // Ends the array. Also when nothing was written: then it writes nothing, and logs the closing all the same.
  void closeFile();

 private:
  void openFile();
  void writeLine(std::string_view text);

  const std::string directory_;
  const std::string name_;
  std::string reportPath_;  // empty until the first message
  std::unique_ptr<WritableFile> reportFileHandle_;
  std::unordered_map<std::string, std::size_t> counts_;
};

}  // namespace tonewerk
