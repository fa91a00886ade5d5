// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <system_error>
#include <vector>

namespace tonewerk {

// The program that plays recordings to the core: it is in the directory of this one.
std::string offlineProgram();

// Runs a program and waits for it. A signal to the terminal's programs reaches it, too. `status` is that of
// waitpid(). `output`: the file that takes its standard output, while its errors go nowhere; with an empty
// name it has this program's streams.
[[nodiscard]] std::error_code runProgram(std::vector<std::string> words, const std::string& output,
                                         int& status);

}  // namespace tonewerk
