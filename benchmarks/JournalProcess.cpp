// SPDX-License-Identifier: Apache-2.0
#include "JournalProcess.h"

#include <array>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string_view>
#include <unistd.h>
#include <vector>

namespace tonewerk {
namespace {

constexpr const char* kUnshare = "/usr/bin/unshare";
constexpr const char* kJournal = "/lib/systemd/systemd-journald";
constexpr const char* kMachine = "/etc/machine-id";
constexpr const char* kSocket = "run/systemd/journal/socket";

// Nothing is limited or forwarded. One file is large enough, so that none is closed during a measurement.
constexpr std::string_view kConfiguration =
    "[Journal]\n"
    "Storage=persistent\n"
    "RateLimitIntervalSec=0\n"
    "RateLimitBurst=0\n"
    "SystemMaxUse=4G\n"
    "SystemMaxFileSize=1G\n"
    "ForwardToSyslog=no\n"
    "ForwardToWall=no\n"
    "ReadKMsg=no\n"
    "Audit=no\n";

// Hides the directories of the machine's journal, and the kernel's log, to which a journal writes its own
// messages. The variables are for the daemon, but the journal would use them, too. exec keeps the process,
// whose processor time is measured.
constexpr const char* kScript =
    "mount --bind \"$1/run\" /run\n"
    "mount --bind \"$1/log\" /var/log\n"
    "unset RUNTIME_DIRECTORY STATE_DIRECTORY LOGS_DIRECTORY CONFIGURATION_DIRECTORY\n"
    "if [ -e /dev/kmsg ]; then mount --bind /dev/null /dev/kmsg; fi\n"
    "exec \"$2\"\n";

std::vector<std::string> unshareArguments() {
  // Namespaces of mounts are root's. Others become root in a namespace of users.
  std::vector<std::string> arguments{"--mount"};
  if (::geteuid() != 0) arguments.insert(arguments.end(), {"--user", "--map-root-user"});
  return arguments;
}

bool isMachineKnown() {
  std::ifstream file(kMachine);
  std::string identifier;
  return static_cast<bool>(file >> identifier);
}

}  // namespace

std::string JournalProcess::problem() {
  if (::access(kJournal, X_OK) != 0) return "systemd-journald is not installed";
  if (!isMachineKnown()) return std::string(kMachine) + " is empty";
  std::string command = kUnshare;
  for (const std::string& argument : unshareArguments()) command += " " + argument;
  // The mounts that the script makes are the most that is asked of the machine.
  command += " sh -ec 'mount --bind /dev/null /dev/null; mount --bind /tmp /run' >/dev/null 2>&1";
  // NOLINTNEXTLINE(cert-env33-c): a fixed command
  return std::system(command.c_str()) == 0 ? "" : "this user may not make mount namespaces";
}

JournalProcess::JournalProcess() {
  const std::string& directory = server_.directory();
  for (const char* made : {"/run/systemd/journald.conf.d", "/run/systemd/journal", "/log/journal"}) {
    std::filesystem::create_directories(directory + made);
  }
  std::ofstream(directory + "/run/systemd/journald.conf.d/benchmark.conf") << kConfiguration;
  // Says that /var is there, so that the journal writes to /var/log/journal from its start.
  std::ofstream(directory + "/run/systemd/journal/flushed").flush();
  std::vector<std::string> arguments = unshareArguments();
  arguments.insert(arguments.end(), {"sh", "-ec", kScript, "sh", directory, kJournal});
  server_.start(kUnshare, arguments, kSocket);
}

std::string JournalProcess::socketPath() const { return server_.directory() + "/" + kSocket; }
std::string JournalProcess::filesDirectory() const { return server_.directory() + "/log/journal"; }

}  // namespace tonewerk
