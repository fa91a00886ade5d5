// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/Findings.h"

#include <algorithm>
#include <cassert>
#include <utility>

namespace tonewerk {

const std::vector<FindingKind>& findingKinds() {
  static const std::vector<FindingKind> kinds{
      {"no-daemon", "No socket is at any path where clients look", "programs cannot report",
       "systemctl --user start twreportingd.socket"},
      {"dead-socket", "There is a socket, but its daemon has died", "programs cannot report",
       "systemctl --user restart twreportingd.socket"},
      {"other-socket", "A variable leads clients to a place without a daemon",
       "programs with this environment cannot report", "unset TONEWERK_REPORTING_SOCKET RUNTIME_DIRECTORY"},
      {"forbidden-socket", "You are not in the group that may use the socket",
       "your programs cannot report to the system's daemon", "sudo usermod -aG audio $USER"},
      {"old-login", "You are in the group of the socket, but logged in before",
       "your programs cannot report to the system's daemon", "newgrp audio"},
      {"silent-daemon", "The daemon takes connections, but does not answer", "nothing is recorded",
       "systemctl --user restart twreportingd"},
      {"other-version", "The daemon has another version than twctl",
       "an update takes effect only after a restart", "systemctl --user restart twreportingd"},
      {"old-fact", "The fact InternalBuild has changed since the daemon's start",
       "the daemon reads it only at its start", "systemctl --user restart twreportingd"},
      {"missing-directory", "A directory of the running daemon is missing",
       "the daemon cannot write, or clients do not find it", "systemctl --user restart twreportingd"},
      {"foreign-owner", "A directory or file does not belong to the daemon's user",
       "the daemon cannot write it", "sudo chown tonewerk: PATH"},
      {"open-directory", "Every user may write into a directory of the daemon",
       "others can change preferences and reports", "chmod o-w PATH"},
      {"closed-directory", "The daemon's user may not write into its directory", "the daemon cannot write",
       "chmod u+rwx PATH"},
      {"open-socket", "Every user may use the socket", "others can report, and see the daemon's status",
       "chmod o-rwx PATH"},
      {"failed-unit", "A unit has failed", "systemd does not start it again by itself",
       "systemctl --user reset-failed UNIT; systemctl --user start UNIT"},
      {"stopped-socket", "The socket's unit is installed, but does not run", "no client can start the daemon",
       "systemctl --user enable --now twreportingd.socket"},
      {"no-bridge", "The PipeWire bridge is installed, but does not run",
       "PipeWire's streams are not reported", "systemctl --user enable --now tw-pipewire"},
      {"no-pipewire", "The PipeWire bridge runs, but PipeWire does not",
       "there is nothing that the bridge could report", "systemctl --user start pipewire"},
      {"broken-file", "A file of preferences or facts does not parse", "it is read as empty",
       "mend the line in the file"},
      {"unreadable-file", "The daemon's user cannot read a file of preferences or facts",
       "it is read as empty", "chmod u+r PATH"},
      {"unknown-domain", "A preference file has the name of no domain, but nearly",
       "the daemon does not read it", "rename the file"},
      {"unknown-key", "A key is none that the daemon reads", "the setting has no effect",
       "twctl defaults delete DOMAIN KEY"},
      {"wrong-value", "A value has the wrong type, or is out of range", "the daemon does not use it",
       "twctl defaults write DOMAIN KEY VALUE"},
      {"wrong-fact", "A fact is unknown, or not true or false", "the daemon does not use it",
       "edit device-facts.toml"},
      {"no-consumer", "No consumer asks for any event", "no event is recorded",
       "twctl defaults delete com.orvane.metricon consumers"},
      {"wrong-endpoint", "An entry of backends is neither local nor an address", "nothing is sent there",
       "twctl defaults write com.orvane.linkreport backends '[\"local\"]'"},
      {"unreachable-endpoint", "An endpoint cannot be reached",
       "messages for it wait, and are dropped in the end", "curl -v ADDRESS"},
      {"failing-endpoint", "The daemon cannot send to an endpoint",
       "messages for it wait, and are dropped in the end", "twctl status"},
      {"unset-clock", "The clock is not set", "reports have wrong times", "sudo timedatectl set-ntp true"},
      {"jumped-clock", "The clock has jumped since the daemon's start",
       "reports from before have other times", "sudo timedatectl set-ntp true"},
      {"future-reports", "The store has reports from the future", "the clock was, or is, wrong",
       "sudo timedatectl set-ntp true"},
      {"full-disk", "The disk has less room than the store may still take",
       "reports are dropped when the disk is full",
       "twctl defaults write com.orvane.tonewerk.store max_megabytes MEGABYTES"},
      {"unreadable-store", "The store cannot be read", "reports are lost, or cannot be seen",
       "systemctl --user restart twreportingd"},
      {"newer-store", "A newer daemon has made the store, and this one uses another",
       "the newer daemon's reports are not shown", "install the newer version again"},
      {"damaged-store", "The store was damaged, and a copy was set aside",
       "some reports may be lost; the copy takes space", "rm PATH"},
      {"hanging-sink", "A sink makes no progress", "reports wait, and are dropped in the end", "df -h PATH"},
      {"dropping-sink", "A sink has dropped reports", "they are lost", "df -h PATH"},
      {"refused-user", "A user's programs were refused more than their share",
       "some of their reports are lost",
       "twctl defaults write com.orvane.tonewerk.service kept_megabytes MEGABYTES"},
      {"lost-messages", "A program's own queue was full, and it dropped messages",
       "they are not in the reports", "a larger queue_bytes in twr_client_options"},
      {"idle-sessions", "There are sessions, but none is started", "only started sessions report",
       "twr_session_start in the program"},
      {"logged-errors", "The daemon has logged errors in the last hour", "the log says what failed",
       "journalctl --user -u twreportingd -p err --since -1h"},
  };
  return kinds;
}

void Findings::add(std::string_view name, std::string what, std::string remedy) {
  const std::vector<FindingKind>& kinds = findingKinds();
  const auto kind =
      std::find_if(kinds.begin(), kinds.end(), [&](const FindingKind& known) { return known.name == name; });
  assert(kind != kinds.end());
  if (remedy.empty()) remedy = kind->remedy;
  all_.push_back({&*kind, std::move(what), std::move(remedy)});
}

void Findings::couldNotSee(std::string what) {
  if (std::find(unseen_.begin(), unseen_.end(), what) == unseen_.end()) unseen_.push_back(std::move(what));
}

}  // namespace tonewerk
