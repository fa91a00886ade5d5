// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/Diagwire.h"
#include "values/Mutex.h"

namespace tonewerk {

// Records the metrics that were posted. Any thread.
//
//   EXPECT_THAT(diagwire.posts(),
//               ElementsAre(MemoryDiagwire::Post{0x5B0003, {"2=7", "3=overload", "4=", "5="}}));
class MemoryDiagwire final : public Diagwire {
 public:
  struct Post {
    std::uint32_t identifier = 0;
    std::vector<std::string> fields;  // "tag=value", in the order in which the record wrote them
    friend bool operator==(const Post&, const Post&) = default;
  };

  void post(std::uint32_t metricIdentifier, const PB::Base& record) override;

  std::vector<Post> posts() const;

 private:
  mutable Mutex mutex_;
  std::vector<Post> posts_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
