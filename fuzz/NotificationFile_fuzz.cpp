// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a notification's file, and posts the name with its state and with a new one.
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <optional>
#include <string_view>
#include <system_error>

#include "FuzzInput.h"
#include "platform/linux/notifications/NotificationFiles.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

constexpr std::string_view kName = "com.orvane.fuzz";

void read(std::string_view text) {
  static const TemporaryDirectory directory;
  static const NotificationFiles files(directory.path());
  std::ofstream(directory.path(std::string(kName)), std::ios::binary) << text;
  std::error_code error;
  const std::optional<std::uint64_t> state = files.state(kName, error);
  expect(state.has_value() == !error);
  expect(!files.post(kName));
  std::error_code later;
  expect(files.state(kName, later) == state && later == error);
  expect(!files.post(kName, text.size()));
  expect(files.state(kName, later) == text.size() && !later);
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({reinterpret_cast<const char*>(data), size});
  return 0;
}
