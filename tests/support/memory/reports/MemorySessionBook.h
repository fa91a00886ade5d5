// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "platform/SessionBook.h"
#include "values/Mutex.h"

namespace tonewerk {

// Keeps all entries, in their order. Any thread.
//
//   EXPECT_THAT(test.sessionBook.entries(), SizeIs(2));
class MemorySessionBook final : public SessionBook {
 public:
  struct Entry {
    std::shared_ptr<SessionLife> life;
    std::string application;
    std::string process;
    std::optional<SessionEnd> end;
  };

  void enter(const std::shared_ptr<SessionLife>& life, const SharedString& application,
             const SharedString& process, const std::optional<SessionEnd>& end) override;

  std::vector<Entry> entries() const;

 private:
  mutable Mutex mutex_;
  std::vector<Entry> entries_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
