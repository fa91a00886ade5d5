// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

namespace tonewerk::report_assets {

// The files of this folder that make the page, as they were when the program was built.
std::string_view html();
std::string_view style();
std::string_view script();
std::string_view charts();

}  // namespace tonewerk::report_assets
