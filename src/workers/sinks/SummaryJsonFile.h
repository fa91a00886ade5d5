// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

class NewFile;

// Writes one JSON summary file: an array, written line by line, with an object of one member for each
// message.
//
//   [
//   {
//     "Volume_Summary_1": { ... }
//   }
//   ,
//   ...
//   ]
//
// The file appears under its name when it is complete, never before. When the name is taken, it gets "-2",
// "-3" ... before ".json". A message that cannot be written as JSON leaves an empty line, and the array stays
// valid. A file that could not be written to its end does not appear.
//
// The first line that cannot be written is logged. Used by one thread at a time.
class SummaryJsonFile {
 public:
  // The file is made with the first message, in `directory`, which is made when it is missing. `name` ends
  // with ".json".
  SummaryJsonFile(std::string directory, std::string name);
  ~SummaryJsonFile();

  // The name that the file gets when `number` - 1 others have its name.
  static std::string numbered(const std::string& name, std::size_t number);

  // Writes a member whose name is the category, the type and how many messages of both the file has had.
  void writeMessage(AudioEventCategory category, AudioEventType type, const ValueMap& payload);

  // Ends the array and gives the file its name. Without a message it writes nothing, but logs the closing.
  // False when there were messages and there is no file.
  [[nodiscard]] bool closeFile();

  // What the file holds, in bytes.
  std::uint64_t bytes() const { return bytes_; }

 private:
  struct Kind {
    std::string name;              // as in "Volume_Summary"
    std::size_t* count = nullptr;  // how many messages of this name the file has had
  };

  void openFile();
  const Kind& kindOf(AudioEventCategory category, AudioEventType type);
  // The name of the kind's next message, until the next call: "Volume_Summary_2".
  std::string_view nextMember(const Kind& kind);
  // Calls `attempt` with one name after the other while it fails because the name is taken. Returns its last
  // error.
  [[nodiscard]] std::error_code withFreeName(
      const std::function<std::error_code(const std::string& name)>& attempt);
  void writeLine(std::string_view text);
  void writeCollected();

  const std::string directory_;
  const std::string name_;
  std::size_t nameNumber_ = 1;
  std::string reportPath_;  // empty until the first message
  std::unique_ptr<NewFile> reportFileHandle_;
  std::string lines_;  // whole lines of entries that are not written yet, with their ends
  std::string member_;
  std::uint64_t bytes_ = 0;
  bool hasLoggedLine_ = false;  // that a line of this file could not be written
  bool hasEntry_ = false;       // whether an entry with a text was written
  std::map<std::string, std::size_t> counts_;
  // By category and type. Categories of the same text share a count.
  std::map<std::pair<AudioEventCategory, AudioEventType>, Kind> kinds_;
};

}  // namespace tonewerk
