// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>

#include "platform/SessionBook.h"

namespace tonewerk {

class ReportStore;

// The book of sessions' lives over the report store.
class StoreSessionBook final : public SessionBook {
 public:
  // `store` outlives it.
  explicit StoreSessionBook(ReportStore& store) : store_(store) {}

  void enter(const std::shared_ptr<SessionLife>& life, const SharedString& application,
             const SharedString& process, const std::optional<SessionEnd>& end) override;

 private:
  ReportStore& store_;
};

}  // namespace tonewerk
