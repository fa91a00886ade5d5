// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <system_error>

namespace tonewerk {

// Owns the directory of one trace. The destructor removes it with its contents.
class TraceDirectory {
 public:
  // Creates the directory `name` in `parent`, and `parent` if it is missing. Null, with `error` set, if that
  // fails.
  [[nodiscard]] static std::shared_ptr<TraceDirectory> make(const std::string& parent,
                                                            const std::string& name, std::error_code& error);
  // Removes all that an earlier process left in `parent`.
  static void removeLeftovers(const std::string& parent);

  explicit TraceDirectory(std::string path) : path_(std::move(path)) {}
  TraceDirectory(const TraceDirectory&) = delete;
  TraceDirectory& operator=(const TraceDirectory&) = delete;
  ~TraceDirectory();

  const std::string& path() const { return path_; }

 private:
  const std::string path_;
};

}  // namespace tonewerk
