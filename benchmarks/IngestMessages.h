// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

// The bytes that a client of the ingest benchmark sends: made once, before anything is measured.
class IngestMessages {
 public:
  enum class Kind {
    kChanging,  // each differs from the one before
    kRepeated,  // all but the times are the same: stored once, the rest is redundant
  };

  // Every identifier takes five bytes, so that every answer to a message is kAnswerBytes long.
  static constexpr std::uint32_t kFirstIdentifier = 0x10000;
  static constexpr std::size_t kAnswerBytes = 9;

  // Messages of 8 keys and the names of a playing stream, for one session. At least one.
  IngestMessages(Kind kind, std::int64_t reporterID, std::size_t count);

  // Makes the session and starts it: three notifications, then a request, answered when all have run.
  static std::string opening(std::int64_t reporterID, std::int64_t serviceType);
  // Stops it: one request.
  static std::string closing(std::int64_t reporterID);

  const std::string& bytes() const { return bytes_; }
  std::size_t count() const { return count_; }
  // Where in bytes() the message of this place ends.
  std::size_t endOf(std::size_t place) const { return ends_[place]; }

 private:
  std::string bytes_;
  std::size_t count_;
  std::vector<std::size_t> ends_;
};

}  // namespace tonewerk
