// SPDX-License-Identifier: Apache-2.0
#include "system/support/DaemonProcess.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/socket.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"

namespace tonewerk {

DaemonProcess::DaemonProcess() {
  for (const char* directory : {kRuntime, kState, kLogs, kConfiguration}) {
    std::filesystem::create_directories(path(directory));
  }
  environment_ = {{"RUNTIME_DIRECTORY", path(kRuntime)},
                  {"STATE_DIRECTORY", path(kState)},
                  {"LOGS_DIRECTORY", path(kLogs)},
                  {"CONFIGURATION_DIRECTORY", path(kConfiguration)},
                  {"TONEWERK_LOG", "debug"}};
}

std::string DaemonProcess::path(const char* directory, const std::string& name) const {
  const std::string base = directory_.path(directory);
  return name.empty() ? base : base + "/" + name;
}

std::map<std::string, std::string> DaemonProcess::clientEnvironment() const {
  return {{"TONEWERK_REPORTING_SOCKET", socketPath()}};
}

bool DaemonProcess::writeConfiguration(const std::string& name, const std::string& text) const {
  const std::filesystem::path file = path(kConfiguration, name);
  std::filesystem::create_directories(file.parent_path());
  return static_cast<bool>(std::ofstream(file) << text << std::flush);
}

bool DaemonProcess::startWithoutWaiting() {
  const ChildCommand command{TONEWERK_DAEMON_PATH, {}, environment_};
  return process_.start(command, directory_.path("output"), directory_.path("log"));
}

bool DaemonProcess::start() {
  if (!startWithoutWaiting()) return false;
  waitUntil([this] { return accepts() || !process_.isRunning(); });
  if (accepts()) return true;
  ADD_FAILURE() << "the daemon accepts no connections; its log:\n" << log();
  return false;
}

std::optional<int> DaemonProcess::stop() {
  // It first does what it has accepted, which takes long under a sanitizer when clients flood it.
  constexpr std::chrono::seconds kLongestEnd{90};
  process_.signal(SIGTERM);
  const std::optional<int> status = process_.wait(kLongestEnd);
  if (!status) ADD_FAILURE() << "the daemon does not end; its log:\n" << log();
  return status;
}

bool DaemonProcess::accepts() const {
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const auto address = unixAddressOf(socketPath());
  return address && connect(socket.get(), generic(*address), sizeof(*address)) == 0;
}

std::size_t DaemonProcess::residentBytes() const {
  std::ifstream status("/proc/" + std::to_string(process_.identifier()) + "/status");
  constexpr std::string_view kField = "VmRSS:";
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with(kField)) return std::stoul(line.substr(kField.size())) * 1024;
  }
  return 0;
}

std::size_t DaemonProcess::openDescriptors() const {
  std::error_code error;
  const std::filesystem::directory_iterator all("/proc/" + std::to_string(process_.identifier()) + "/fd",
                                                error);
  return error ? 0 : static_cast<std::size_t>(std::distance(begin(all), end(all)));
}

std::string DaemonProcess::log() const { return textOfFile(directory_.path("log")); }

}  // namespace tonewerk
