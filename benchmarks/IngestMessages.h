// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tonewerk {

// Holds the bytes that a client of the ingest benchmark sends. They are made once, before the measurement.
class IngestMessages {
 public:
  enum class Kind {
    kChanging,  // each differs from the one before it
    kRepeated,  // all are the same but for their times: one is stored, the others are redundant
  };

  // Every identifier takes five bytes, so that every answer to a message is kAnswerBytes long.
  static constexpr std::uint32_t kFirstIdentifier = 0x10000;
  static constexpr std::size_t kAnswerBytes = 9;

  // Makes `count` messages, at least one, for one session: 8 keys that describe a playing stream.
  IngestMessages(Kind kind, std::int64_t reporterID, std::size_t count);

  // Creates and starts the session: three notifications, then a request that is answered when all have run.
  static std::string opening(std::int64_t reporterID, std::int64_t serviceType);
  // Stops the session: one request.
  static std::string closing(std::int64_t reporterID);

  const std::string& bytes() const { return bytes_; }
  std::size_t count() const { return count_; }
  // The end of message number `place` in bytes().
  std::size_t endOf(std::size_t place) const { return ends_[place]; }

 private:
  std::string bytes_;
  std::size_t count_;
  std::vector<std::size_t> ends_;
};

}  // namespace tonewerk
