// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/Energybook.h"
#include "values/Mutex.h"

namespace tonewerk {

// Records the events that were sent. Any thread.
//
//   EXPECT_THAT(test.energybook.events(), SizeIs(1));
class MemoryEnergybook final : public Energybook {
 public:
  struct Event {
    std::int32_t group = 0;
    std::string name;
    ValueMap payload;

    friend bool operator==(const Event&, const Event&) = default;
  };

  void sendEvent(std::int32_t group, const SharedString& name, ValueMap payload) override;

  std::vector<Event> events() const;

 private:
  mutable Mutex mutex_;
  std::vector<Event> events_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
