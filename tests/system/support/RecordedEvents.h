// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {

// Reads the daemon's store, also while the daemon writes to it.
class RecordedEvents {
 public:
  explicit RecordedEvents(std::string path) : path_(std::move(path)) {}

  // The payloads of all events of this name, oldest first; empty without a readable store.
  std::vector<nlohmann::json> named(const std::string& name) const;
  // The names of all events, oldest first.
  std::vector<std::string> names() const;
  // The session information that the local backend received, and the payloads of the messages sent to it,
  // oldest first.
  std::vector<nlohmann::json> rtcSessions() const;
  std::vector<nlohmann::json> rtcMessages() const;
  // The result of the database's integrity check; "ok" when it is sound.
  std::string integrity() const;
  // The first column of all rows of `query`.
  std::vector<std::string> texts(const std::string& query,
                                 const std::optional<std::string>& argument = {}) const;

 private:
  const std::string path_;
};

}  // namespace tonewerk
