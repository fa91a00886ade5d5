// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <unordered_map>

#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

class NewFile;

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
// It appears under its name when it is whole, never before; where the name is taken it gets "-2", "-3" ...
// before ".json". A message that JSON cannot say leaves an empty line and the array around it valid; a file
// that could not be written to its end does not appear.
//
// Failures are logged and never stop the rest. One thread at a time.
class SummaryJsonFile {
 public:
  // The file is made in `directory`, which is made too, at the first message. `name` ends with ".json".
  SummaryJsonFile(std::string directory, std::string name);
  ~SummaryJsonFile();

  // The member is called by category, type and how many of the two this file has had.
  void writeMessage(AudioEventCategory category, AudioEventType type, const ValueMap& payload);

  // Ends the array. Also when nothing was written: then it writes nothing, and logs the closing all the same.
  void closeFile();

 private:
  void openFile();
  // Goes on to the next name while the attempt says that it is taken; the last attempt's error.
  [[nodiscard]] std::error_code withFreeName(
      const std::function<std::error_code(const std::string& name)>& attempt);
  void writeLine(std::string_view text);

  const std::string directory_;
  const std::string name_;
  std::size_t nameNumber_ = 1;
  std::string reportPath_;  // empty until the first message
  std::unique_ptr<NewFile> reportFileHandle_;
  bool hasEntry_ = false;  // one with a text
  std::unordered_map<std::string, std::size_t> counts_;
};

}  // namespace tonewerk
