// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// A client's process, as the bytes of a journal's record of kConnected tell it.
struct JournalProcess {
  std::int32_t identifier = 0;
  std::optional<std::string> name;

  friend bool operator==(const JournalProcess&, const JournalProcess&) = default;
};

std::string encoded(const JournalProcess& process);
// None for other bytes.
std::optional<JournalProcess> decodedJournalProcess(std::string_view bytes);

}  // namespace tonewerk
