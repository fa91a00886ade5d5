// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>

#include "ServerProcess.h"

namespace tonewerk {

// Runs a journal of its own, in namespaces and directories of its own: neither the machine's journal nor its
// log learns of it. It keeps every message, in a file. Failures throw std::runtime_error.
class JournalProcess {
 public:
  // Returns why this machine cannot run it; empty when it can.
  static std::string problem();

  JournalProcess();

  const ServerProcess& server() const { return server_; }
  // Where clients send datagrams.
  std::string socketPath() const;
  // What sd_journal_open_directory() opens.
  std::string filesDirectory() const;

 private:
  ServerProcess server_;
};

}  // namespace tonewerk
