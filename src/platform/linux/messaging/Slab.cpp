// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messaging/Slab.h"

#include <cassert>
#include <utility>

namespace tonewerk {

// The slabs that nobody uses.
class SlabPool::FreeSlabs {
 public:
  std::unique_ptr<Slab> take() {
    {
      const MutexLock lock(mutex_);
      if (!slabs_.empty()) {
        std::unique_ptr<Slab> slab = std::move(slabs_.back());
        slabs_.pop_back();
        return slab;
      }
    }
    return std::make_unique_for_overwrite<Slab>();
  }

  void put(std::unique_ptr<Slab> slab) {
    const MutexLock lock(mutex_);
    if (slabs_.size() < kMaxFreeSlabs) slabs_.push_back(std::move(slab));
  }

 private:
  Mutex mutex_;
  std::vector<std::unique_ptr<Slab>> slabs_ GUARDED_BY(mutex_);
};

SlabPool::SlabPool() : free_(std::make_shared<FreeSlabs>()) {}

SlabPool::~SlabPool() = default;

std::span<char> SlabPool::room() {
  if (current_ == nullptr || current_->size() - used_ < kMinRoomBytes) {
    current_ = nullptr;  // may return the slab, for the next line to take
    current_ = {free_->take().release(),
                [free = free_](Slab* slab) { free->put(std::unique_ptr<Slab>(slab)); }};
    used_ = 0;
  }
  return std::span(*current_).subspan(used_);
}

SlabBytes SlabPool::commit(std::size_t count) {
  assert(current_ != nullptr && count <= current_->size() - used_);
  const char* begin = current_->data() + used_;
  used_ += count;
  return {current_, {begin, count}};
}

}  // namespace tonewerk
