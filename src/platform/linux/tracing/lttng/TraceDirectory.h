// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <system_error>

namespace tonewerk {

// A directory for one trace, removed with all that is in it when this goes.
class TraceDirectory {
 public:
  // Makes `name` in `parent`, which is made, too, when it is missing. Null, and `error` set, when that fails.
  [[nodiscard]] static std::shared_ptr<TraceDirectory> make(const std::string& parent,
                                                            const std::string& name, std::error_code& error);
  // Removes what an earlier process left in `parent`.
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
