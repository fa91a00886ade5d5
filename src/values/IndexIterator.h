// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <compare>
#include <cstddef>
#include <iterator>
#include <type_traits>
#include <utility>

namespace tonewerk {

// Walks over anything with operator[], whose elements it returns as that does. The container outlives it.
template <typename Container>
class IndexIterator {
 public:
  using iterator_category = std::random_access_iterator_tag;
  using reference = decltype(std::declval<const Container&>()[0]);
  using value_type = std::remove_cvref_t<reference>;
  using difference_type = std::ptrdiff_t;
  using pointer = const value_type*;

  IndexIterator() = default;
  IndexIterator(const Container& container, std::size_t place) : container_(&container), place_(place) {}

  reference operator*() const { return (*container_)[place_]; }
  reference operator[](difference_type distance) const { return *(*this + distance); }

  IndexIterator& operator++() { return *this += 1; }
  IndexIterator& operator--() { return *this += -1; }
  IndexIterator operator++(int) {
    IndexIterator before = *this;
    ++*this;
    return before;
  }
  IndexIterator operator--(int) {
    IndexIterator before = *this;
    --*this;
    return before;
  }
  IndexIterator& operator+=(difference_type distance) {
    place_ += static_cast<std::size_t>(distance);
    return *this;
  }
  IndexIterator& operator-=(difference_type distance) { return *this += -distance; }
  friend IndexIterator operator+(IndexIterator from, difference_type distance) { return from += distance; }
  friend IndexIterator operator+(difference_type distance, IndexIterator from) { return from += distance; }
  friend IndexIterator operator-(IndexIterator from, difference_type distance) { return from -= distance; }
  friend difference_type operator-(IndexIterator to, IndexIterator from) {
    return static_cast<difference_type>(to.place_ - from.place_);
  }
  friend bool operator==(IndexIterator a, IndexIterator b) { return a.place_ == b.place_; }
  friend auto operator<=>(IndexIterator a, IndexIterator b) { return a.place_ <=> b.place_; }

 private:
  const Container* container_ = nullptr;
  std::size_t place_ = 0;
};

}  // namespace tonewerk
