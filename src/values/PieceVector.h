// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <bit>
#include <cassert>
#include <cstddef>
#include <memory>
#include <utility>
#include <vector>

namespace tonewerk {

// A vector that grows without moving its elements: references to them stay valid until clear().
//
// The elements lie in pieces, each twice as large as the one before it, so that few elements take little
// memory, and the place of an element is found without a search:
//
//   0 1 | 2 3 4 5 | 6 7 8 9 10 11 12 13 | ...
//
// One thread.
template <typename T>
class PieceVector {
 public:
  PieceVector() = default;
  PieceVector(PieceVector&& other) noexcept
      : pieces_(std::move(other.pieces_)), size_(std::exchange(other.size_, 0)) {
    other.pieces_.clear();
  }
  PieceVector& operator=(PieceVector&& other) noexcept {
    PieceVector taken(std::move(other));
    std::swap(pieces_, taken.pieces_);
    std::swap(size_, taken.size_);
    return *this;
  }
  ~PieceVector() { clear(); }

  std::size_t size() const { return size_; }

  // The elements of a constant vector are not constant.
  T& operator[](std::size_t place) const {
    assert(place < size_);
    return *addressOf(place);
  }

  T& add(T element) {
    if (size_ + kFirst == kFirst << pieces_.size()) pieces_.push_back(Allocator().allocate(size_ + kFirst));
    T* added = std::construct_at(addressOf(size_), std::move(element));
    ++size_;
    return *added;
  }

  // Frees all memory.
  void clear() {
    std::size_t left = std::exchange(size_, 0);
    std::size_t length = kFirst;
    for (T* piece : pieces_) {
      const std::size_t used = left < length ? left : length;
      std::destroy_n(piece, used);
      Allocator().deallocate(piece, length);
      left -= used;
      length *= 2;
    }
    std::vector<T*>().swap(pieces_);
  }

 private:
  using Allocator = std::allocator<T>;
  static constexpr std::size_t kFirst = 2;  // the length of the first piece

  T* addressOf(std::size_t place) const {
    const std::size_t number = place + kFirst;
    const std::size_t begin = std::bit_floor(number);
    const auto piece = static_cast<std::size_t>(std::countr_zero(begin) - std::countr_zero(kFirst));
    return pieces_[piece] + (number - begin);
  }

  std::vector<T*> pieces_;
  std::size_t size_ = 0;
};

}  // namespace tonewerk
