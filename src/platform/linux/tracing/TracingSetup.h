// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <system_error>

namespace tonewerk {

// What programs with signposts load, as dlopen() takes it: the path that TONEWERK_SIGNPOSTS says, or else the
// usual name.
std::string signpostLibraryName();

// Where traces lie while they are needed; absolute, as the tracer wants it.
std::string tracesDirectory(const std::string& stateDirectory);

// tw-trace-reader, which lies beside this executable.
std::string traceReaderPath();

// Tells programs that start from now on whether signposts can be traced here: by a file that is there or not.
[[nodiscard]] std::error_code setSignpostMark(const std::string& runtimeDirectory, bool canBeTraced);

}  // namespace tonewerk
