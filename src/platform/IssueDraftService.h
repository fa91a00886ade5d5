// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {

// A part of the product, as the bug tracker knows it.
struct TrackletComponent {
  std::string name;
  std::string version;
  std::int64_t identifier = 0;
};

// A bug report that waits for somebody to file it. The two numbers are the tracker's own enumerations.
struct TrackletDraft {
  std::string title;
  std::string problemDescription;
  TrackletComponent component;
  std::int32_t reproducibility = 0;
  std::int32_t classification = 0;
  std::vector<std::string> diagnosticExtensionIDs;
};

// Offers drafts of bug reports. Any thread.
class IssueDraftService {
 public:
  // None when the draft was made, else what went wrong, in words.
  using CompletionHandler = std::function<void(const std::optional<std::string>& error)>;

  virtual ~IssueDraftService() = default;

  // Returns at once; the handler runs once, later, on a thread of the service's.
  virtual void createDraft(TrackletDraft draft, std::optional<std::string> processName,
                           std::string displayReason, CompletionHandler completionHandler) = 0;
};

}  // namespace tonewerk
