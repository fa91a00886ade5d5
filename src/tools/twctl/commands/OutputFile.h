// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <iosfwd>
#include <memory>
#include <string>
#include <system_error>

namespace tonewerk {

// Makes a file that is there when it is complete. Only its owner may read it, because it has what clients
// have sent. Without end() nothing is left behind.
class OutputFile {
 public:
  OutputFile();
  OutputFile(const OutputFile&) = delete;
  OutputFile& operator=(const OutputFile&) = delete;
  ~OutputFile();

  // Call once. std::errc::file_exists when there is such a file already.
  [[nodiscard]] std::error_code begin(const std::string& file);
  // After begin() has succeeded. It fails when the file cannot be written; end() then knows the reason.
  std::ostream& stream();
  [[nodiscard]] std::error_code end();

 private:
  struct Writing;
  std::unique_ptr<Writing> writing_;
};

}  // namespace tonewerk
