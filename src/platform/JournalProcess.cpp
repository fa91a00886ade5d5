// SPDX-License-Identifier: Apache-2.0
#include "platform/JournalProcess.h"

#include <charconv>
#include <system_error>

namespace tonewerk {

// "PID NAME", or "PID" without a name.
std::string encoded(const JournalProcess& process) {
  return std::to_string(process.identifier) + (process.name ? " " + *process.name : "");
}

std::optional<JournalProcess> decodedJournalProcess(std::string_view bytes) {
  JournalProcess process;
  const auto [end, error] = std::from_chars(bytes.data(), bytes.data() + bytes.size(), process.identifier);
  if (error != std::errc()) return std::nullopt;
  bytes.remove_prefix(static_cast<std::size_t>(end - bytes.data()));
  if (bytes.empty()) return process;
  if (bytes.front() != ' ') return std::nullopt;
  process.name = std::string(bytes.substr(1));
  return process;
}

}  // namespace tonewerk
