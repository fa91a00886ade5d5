// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <system_error>

namespace tonewerk {

// The library that programs with signposts load, as a name or path for dlopen(): the absolute path in
// TONEWERK_SIGNPOSTS, or otherwise the default name.
std::string signpostLibraryName();

// The directory of traces while they are in use. The tracer needs an absolute path.
std::string tracesDirectory(const std::string& stateDirectory);

// The path of tw-trace-reader, which is in the directory of this executable.
std::string traceReaderPath();

// Creates or removes the file that tells programs whether signposts can be traced. Programs check it when
// they start.
[[nodiscard]] std::error_code setSignpostMark(const std::string& runtimeDirectory, bool canBeTraced);

}  // namespace tonewerk
