// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace CLI {
class App;
class ParseError;
}  // namespace CLI

namespace tonewerk {

// What is wrong with the command line that `app` did not take, in one line.
[[nodiscard]] std::string usageProblem(const CLI::App& app, const CLI::ParseError& error);

}  // namespace tonewerk
