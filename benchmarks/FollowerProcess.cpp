// SPDX-License-Identifier: Apache-2.0
#include "FollowerProcess.h"

#include <chrono>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kTimeout{60};
constexpr std::chrono::milliseconds kInterval{10};

// Reads the rows after `last` and returns their number.
std::size_t readMore(SqliteStatement& events, std::int64_t& last) {
  std::size_t rows = 0;
  events.bind(1, last);
  SqliteStatement::Step step{};
  while ((step = events.step()) == SqliteStatement::Step::kRow) {
    last = events.integer(0);
    (void)events.number(1);
    (void)events.text(2);
    (void)events.text(3);
    ++rows;
  }
  events.reset();
  if (step == SqliteStatement::Step::kFailed) throw std::runtime_error("cannot read the store's events");
  return rows;
}

}  // namespace

FollowerProcess::FollowerProcess(const std::function<void()>& follow) : process_(::fork()) {
  if (process_ != 0) return;
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  try {
    follow();
  } catch (const std::exception& error) {
    std::fprintf(stderr, "the reader: %s\n", error.what());
    ::_exit(EXIT_FAILURE);
  }
  ::_exit(EXIT_SUCCESS);
}

FollowerProcess::~FollowerProcess() {
  if (process_ <= 0) return;
  ::kill(process_, SIGKILL);
  ::waitpid(process_, nullptr, 0);
}

void FollowerProcess::join() {
  int status = 0;
  const pid_t ended = ::waitpid(process_, &status, 0);
  process_ = -1;
  if (ended < 0 || status != 0) throw std::runtime_error("the reader has not read everything");
}

void followStore(const std::string& storePath, std::size_t rows) {
  const auto deadline = std::chrono::steady_clock::now() + kTimeout;
  const auto wait = [&](std::size_t read) {
    if (std::chrono::steady_clock::now() > deadline) {
      throw std::runtime_error("the store has " + std::to_string(read) + " rows, not " +
                               std::to_string(rows));
    }
    std::this_thread::sleep_for(kInterval);
  };
  SqliteDatabase database;
  // The view is there when the first batch has been written.
  const auto isReady = [&] {
    return std::filesystem::exists(storePath) &&
           (database.isOpen() ||
            database.open(storePath, SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(1))) &&
           database.number("SELECT count(*) FROM sqlite_master WHERE name = 'analytics_event'") == 1;
  };
  while (!isReady()) wait(0);
  SqliteStatement events = database.prepare(
      "SELECT id, recorded_at, name, payload FROM analytics_event WHERE id > ?1 ORDER BY id");
  std::int64_t last = 0;
  for (std::size_t read = 0; read < rows;) {
    const std::size_t more = readMore(events, last);
    read += more;
    if (more == 0) wait(read);
  }
}

}  // namespace tonewerk
