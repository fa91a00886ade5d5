// SPDX-License-Identifier: Apache-2.0
#include "MeasuredDaemon.h"

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <optional>
#include <stdexcept>

#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {
namespace {

// No row when there is no store: the daemon makes it for its first row.
std::size_t rowsOf(const std::string& storePath, const std::string& table) {
  if (!std::filesystem::exists(storePath)) return 0;
  SqliteDatabase database;
  std::optional<std::int64_t> rows;
  if (database.open(storePath, SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(1))) {
    rows = database.number("SELECT count(*) FROM " + table);
  }
  if (!rows) throw std::runtime_error("cannot count the rows of " + table + ": " + database.problem());
  return static_cast<std::size_t>(*rows);
}

void check(const std::string& storePath, const std::string& table, std::size_t wanted) {
  const std::size_t rows = rowsOf(storePath, table);
  if (rows == wanted) return;
  throw std::runtime_error("the store has " + std::to_string(rows) + " rows in " + table + ", not " +
                           std::to_string(wanted));
}

}  // namespace

MeasuredDaemon::MeasuredDaemon(const std::string& program, const DaemonSettings& settings)
    : settings_(settings) {
  const std::string directory = server_.configurationDirectory();
  if (settings.writesFiles) std::ofstream(directory + "/device-facts.toml") << "InternalBuild = true\n";
  std::filesystem::create_directory(directory + "/preferences");
  std::ofstream(directory + "/preferences/com.orvane.tonewerk.store.toml")
      << "journal_megabytes = " << settings.journalMegabytes << "\n";
  if (!settings.records) {
    std::ofstream(directory + "/preferences/com.orvane.metricon.toml") << "consumers = []\n";
    std::ofstream(directory + "/preferences/com.orvane.linkreport.toml") << "backends = []\n";
  }
  server_.start(program, {});
}

void MeasuredDaemon::checkStore(std::size_t messages) const {
  check(storePath(), "analytics_event", settings_.records ? messages * kRowsAnEvent : 0);
  check(storePath(), "rtc_message", settings_.records ? messages : 0);
}

std::size_t MeasuredDaemon::files() const {
  std::error_code error;
  std::size_t count = 0;
  for (const auto& file :
       std::filesystem::directory_iterator(server_.logsDirectory() + "/Audio/Reporting", error)) {
    if (file.path().extension() == ".json") ++count;
  }
  return count;
}

}  // namespace tonewerk
