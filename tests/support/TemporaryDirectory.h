// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <stdlib.h>
#include <string>

namespace tonewerk {

// Makes an empty directory for the test and removes it with its contents.
class TemporaryDirectory {
 public:
  TemporaryDirectory() {
    std::string name = std::filesystem::temp_directory_path() / "tonewerk-test-XXXXXX";
    if (mkdtemp(name.data()) != nullptr) path_ = name;
  }
  TemporaryDirectory(const TemporaryDirectory&) = delete;
  TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;
  ~TemporaryDirectory() {
    std::error_code error;
    if (!path_.empty()) std::filesystem::remove_all(path_, error);
  }

  // Returns an empty text when the directory could not be made.
  const std::string& path() const { return path_; }
  std::string path(const std::string& name) const { return path_ + "/" + name; }

 private:
  std::string path_;
};

}  // namespace tonewerk
