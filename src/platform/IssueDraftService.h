// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {

// A part of the product, as the bug tracker identifies it.
struct TrackletComponent {
  std::string name;
  std::string version;
  std::int64_t identifier = 0;
};

// A bug report that a person may file later. The two numbers are the bug tracker's own enumerations.
struct TrackletDraft {
  std::string title;
  std::string problemDescription;
  TrackletComponent component;
  std::int32_t reproducibility = 0;
  std::int32_t classification = 0;
  std::vector<std::string> diagnosticExtensionIDs;
};

// Makes drafts of bug reports. Any thread.
class IssueDraftService {
 public:
  // Takes none when the draft was made, else a text that says what went wrong.
  using CompletionHandler = std::function<void(const std::optional<std::string>& error)>;

  virtual ~IssueDraftService() = default;

  // Returns at once. The handler runs later, once, on a thread of the service.
  virtual void createDraft(TrackletDraft draft, std::optional<std::string> processName,
                           std::string displayReason, CompletionHandler completionHandler) = 0;
};

}  // namespace tonewerk
