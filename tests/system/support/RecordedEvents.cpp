// SPDX-License-Identifier: Apache-2.0
#include "system/support/RecordedEvents.h"

#include <chrono>
#include <memory>
#include <sqlite3.h>

namespace tonewerk {

namespace {

// How long to wait while the daemon recovers its write-ahead log.
constexpr int kBusyMilliseconds = 10'000;

struct Close {
  void operator()(sqlite3* database) const { sqlite3_close(database); }
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};

std::vector<nlohmann::json> parsed(const std::vector<std::string>& texts) {
  std::vector<nlohmann::json> found;
  found.reserve(texts.size());
  for (const std::string& text : texts) found.push_back(nlohmann::json::parse(text, nullptr, false));
  return found;
}

}  // namespace

std::vector<nlohmann::json> RecordedEvents::named(const std::string& name) const {
  return parsed(texts("SELECT payload FROM analytics_event WHERE name = ? ORDER BY id", name));
}

std::vector<nlohmann::json> RecordedEvents::rtcSessions() const {
  return parsed(texts("SELECT user_info FROM rtc_session ORDER BY id"));
}

std::vector<nlohmann::json> RecordedEvents::rtcMessages() const {
  return parsed(texts("SELECT payload FROM rtc_message ORDER BY id"));
}

std::vector<std::string> RecordedEvents::names() const {
  return texts("SELECT name FROM analytics_event ORDER BY id");
}

std::string RecordedEvents::integrity() const {
  std::string all;
  for (const std::string& line : texts("PRAGMA integrity_check")) all += all.empty() ? line : "\n" + line;
  return all;
}

std::vector<std::string> RecordedEvents::texts(const std::string& query,
                                               const std::optional<std::string>& argument) const {
  sqlite3* opened = nullptr;
  const int result = sqlite3_open_v2(path_.c_str(), &opened, SQLITE_OPEN_READONLY, nullptr);
  const std::unique_ptr<sqlite3, Close> database(opened);
  if (result != SQLITE_OK) return {};
  sqlite3_busy_timeout(opened, kBusyMilliseconds);
  sqlite3_stmt* prepared = nullptr;
  sqlite3_prepare_v2(opened, query.c_str(), -1, &prepared, nullptr);
  const std::unique_ptr<sqlite3_stmt, Close> statement(prepared);
  if (argument) sqlite3_bind_text(prepared, 1, argument->c_str(), -1, SQLITE_TRANSIENT);
  std::vector<std::string> found;
  while (sqlite3_step(prepared) == SQLITE_ROW) {
    const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(prepared, 0));
    found.emplace_back(text == nullptr ? "" : text);
  }
  return found;
}

}  // namespace tonewerk
