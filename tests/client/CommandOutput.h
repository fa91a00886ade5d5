// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdio>
#include <gtest/gtest.h>
#include <string>

namespace tonewerk {

// Returns what a shell command prints. A test failure when the command fails.
inline std::string outputOfCommand(const std::string& command) {
  std::string output;
  FILE* pipe = ::popen((command + " 2>&1").c_str(), "r");
  if (pipe == nullptr) {
    ADD_FAILURE() << "no shell";
    return output;
  }
  std::array<char, 4096> buffer;
  while (const std::size_t count = std::fread(buffer.data(), 1, buffer.size(), pipe)) {
    output.append(buffer.data(), count);
  }
  EXPECT_EQ(::pclose(pipe), 0) << command << "\n" << output;
  return output;
}

}  // namespace tonewerk
