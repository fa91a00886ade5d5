// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "values/ValueMap.h"

namespace tonewerk {

// Holds the bytes that a client of the ingest benchmarks sends. They are made once, before the measurement,
// and sent repeatedly.
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
  static IngestMessages playback(Kind kind, std::int64_t reporterID, std::size_t count);

  // Makes the whole life of each of `sessions` sessions without messages: four notifications and a request.
  static IngestMessages lives(std::int64_t firstReporterID, std::size_t sessions, std::int64_t serviceType);

  // Creates and starts the session: three notifications, then a request that is answered when all have run.
  static std::string opening(std::int64_t reporterID, std::int64_t serviceType);
  // Stops the session: one request.
  static std::string closing(std::int64_t reporterID);

  static constexpr std::string_view kTimeKey = "twreporting_timestamp";

  struct Address {
    std::int64_t reporterID;
    std::uint32_t category;
    std::uint16_t type;
  };
  // Appends a message, whose time is its entry kTimeKey if it has one. `isStored` says whether a session
  // keeps it, or finds it redundant.
  void add(const Address& address, const ValueMap& payload, bool isStored = true);

  // Moves the times of all messages to after those of the last one, so that times go on when the messages are
  // sent again. The bytes keep their lengths.
  void advanceTimes();

  const std::string& bytes() const { return bytes_; }
  std::size_t count() const { return ends_.size(); }
  // The end of message number `place` in bytes().
  std::size_t endOf(std::size_t place) const { return ends_[place]; }
  // How many of the first `count` messages are stored.
  std::size_t storedOfFirst(std::size_t count) const { return count == 0 ? 0 : stored_[count - 1]; }

  double bytesAMessage() const { return static_cast<double>(bytes_.size()) / static_cast<double>(count()); }

 private:
  std::uint32_t nextIdentifier() const { return kFirstIdentifier + static_cast<std::uint32_t>(count()); }
  void end(bool isStored);
  double timeAt(std::size_t place) const;

  std::string bytes_;
  std::vector<std::size_t> ends_;
  std::vector<std::size_t> stored_;  // up to and including each message
  std::vector<std::size_t> times_;   // the places of the times in bytes_
};

}  // namespace tonewerk
