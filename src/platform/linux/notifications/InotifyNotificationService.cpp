// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/notifications/InotifyNotificationService.h"

#include <system_error>
#include <utility>

#include "platform/linux/files/LinuxFileSystem.h"

namespace tonewerk {
namespace {

constexpr unsigned kDirectoryMode = 0755;

const std::string& made(const std::string& directory) {
  // If this fails, the watcher logs why it cannot watch the directory, and waits for it.
  static_cast<void>(LinuxFileSystem().createDirectories(directory, kDirectoryMode));
  return directory;
}

}  // namespace

InotifyNotificationService::InotifyNotificationService(const std::string& directory, TimerService& timers,
                                                       const LogCategory& log)
    : files_(directory),
      pace_(timers, [this](std::string_view name) { handlers_.tell(name); }),
      watcher_(
          made(directory), [this](std::string_view name) { pace_.post(name); }, [this] { pace_.postAll(); },
          log) {}

NotificationService::Registration InotifyNotificationService::registerHandler(
    std::string_view name, SerialQueue& queue, std::function<void(Token)> handler) {
  if (!NotificationHandlers::isName(name)) return {kStatusInvalidName, kNoToken};
  if (!watcher_.isWorking()) return {kStatusFailed, kNoToken};
  pace_.add(name);
  return {kStatusOk, handlers_.add(name, queue, std::move(handler))};
}

std::optional<std::uint64_t> InotifyNotificationService::state(Token token) const {
  const std::optional<std::string> name = handlers_.nameOf(token);
  if (!name) return std::nullopt;
  std::error_code error;
  const std::optional<std::uint64_t> state = files_.state(*name, error);
  return error == std::errc::no_such_file_or_directory ? 0 : state;
}

void InotifyNotificationService::cancel(Token token) {
  const std::optional<std::string> name = handlers_.nameOf(token);
  handlers_.remove(token);
  if (name) pace_.remove(*name);
}

void InotifyNotificationService::makeDirectory() { made(files_.directory()); }

std::error_code InotifyNotificationService::post(std::string_view name) { return files_.post(name); }

}  // namespace tonewerk
