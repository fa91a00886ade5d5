// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace CLI {
class App;
class ParseError;
}  // namespace CLI

namespace tonewerk {

// Describes in one line why `app` has refused the command line.
[[nodiscard]] std::string usageProblem(const CLI::App& app, const CLI::ParseError& error);

}  // namespace tonewerk
