// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <utility>

namespace tonewerk {

// Points to an object that counts its own holders: T has retain() and release(), and frees itself when the
// last holder releases it. Null by default.
template <typename T>
class Counted {
 public:
  Counted() = default;
  // Becomes one more holder of `object`.
  explicit Counted(T& object) : object_(&object) { object_->retain(); }
  // Takes over the place of a holder that is already counted.
  static Counted adopt(T* object) {
    Counted made;
    made.object_ = object;
    return made;
  }

  Counted(const Counted& other) : object_(other.object_) {
    if (object_ != nullptr) object_->retain();
  }
  Counted(Counted&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
  Counted& operator=(Counted other) noexcept {
    std::swap(object_, other.object_);
    return *this;
  }
  ~Counted() {
    if (object_ != nullptr) object_->release();
  }

  // Gives the place of this holder to the caller.
  [[nodiscard]] T* detach() { return std::exchange(object_, nullptr); }

  T* get() const { return object_; }
  T& operator*() const { return *object_; }
  T* operator->() const { return object_; }
  explicit operator bool() const { return object_ != nullptr; }

 private:
  T* object_ = nullptr;
};

}  // namespace tonewerk
