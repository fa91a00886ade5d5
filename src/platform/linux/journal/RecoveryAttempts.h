// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

class LogCategory;

// Counts the starts that begin to play the journal in a directory and do not finish. After kMost of them in a
// row the directory is moved aside, so that a journal that ends the daemon does not end each one for ever.
//
// For the daemon's start, before the directory is opened. Not thread-safe.
class RecoveryAttempts {
 public:
  static constexpr int kMost = 30;

  // `directory` is that of the journal; `log` outlives the object. Moves the directory to its name with
  // ".failed", in place of an earlier one, when it has had its attempts, and logs that.
  RecoveryAttempts(std::string directory, const LogCategory& log);

  // Playing begins. A failure to write is logged; then the attempt does not count.
  void begin();
  // The daemon has not ended while it played.
  void finish();

 private:
  std::string path() const;

  const std::string directory_;
  const LogCategory& log_;
  int begun_ = 0;
};

}  // namespace tonewerk
