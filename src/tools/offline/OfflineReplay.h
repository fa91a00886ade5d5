// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <functional>
#include <string>

#include "protocol/RequestSet.h"
#include "tools/recording/Recording.h"

namespace tonewerk {

class JsonService;
class LogCategory;

// Plays a recording to the daemon's own core, in this process, and keeps what it records in a new store.
class OfflineReplay {
 public:
  // Called for each request that was refused, in the order of the refusals.
  using Refusal = std::function<void(const RecordedStep& call, const ReplyError& error)>;

  // Returns "line 3: why" when the core cannot take what the recording says of the device, else an empty
  // text.
  [[nodiscard]] static std::string problemWith(const Recording& recording, const JsonService& json);

  // `json` and `log`, which takes the store's errors, outlive it.
  OfflineReplay(JsonService& json, const LogCategory& log, Refusal refusal);

  // Makes the file `store`, which must not exist. Until it is complete it has another name, in a hidden
  // directory beside it, which is removed in any case. Gives up when `isInterrupted` becomes true. Returns
  // the problem, or an empty text. `recording` has no problem. At most one call at a time in a process.
  [[nodiscard]] std::string play(const Recording& recording, const std::string& store,
                                 const std::atomic<bool>& isInterrupted);

 private:
  [[nodiscard]] std::string playInto(const std::string& directory, const Recording& recording,
                                     const std::atomic<bool>& isInterrupted);

  JsonService& json_;
  const LogCategory& log_;
  const Refusal refusal_;
};

}  // namespace tonewerk
