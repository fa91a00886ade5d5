// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace tonewerk {

// Holds an immutable text that many holders share: a copy costs a reference count.
//
// A payload's keys and texts are of this type. Storing a message, merging it into the previous values and
// passing it to a sink therefore copy no characters.
//
// As thread-safe as an int: threads may use different objects at the same time, even when these share their
// characters.
class SharedString {
 public:
  // The empty text. Allocates nothing.
  SharedString() = default;
  // Copies `text` into one allocation. Implicit, because the conversion loses nothing.
  SharedString(std::string_view text);
  SharedString(const char* text) : SharedString(std::string_view(text)) {}
  SharedString(const std::string& text) : SharedString(std::string_view(text)) {}

  SharedString(const SharedString& other) : rep_(other.rep_) { retain(); }
  SharedString(SharedString&& other) noexcept : rep_(other.rep_) { other.rep_ = nullptr; }
  SharedString& operator=(SharedString other) noexcept {
    std::swap(rep_, other.rep_);
    return *this;
  }
  ~SharedString() { release(); }

  std::string_view view() const {
    return rep_ == nullptr ? std::string_view() : std::string_view(rep_->text(), rep_->size);
  }
  operator std::string_view() const { return view(); }
  std::string string() const { return std::string(view()); }
  std::size_t size() const { return rep_ == nullptr ? 0 : rep_->size; }
  bool empty() const { return size() == 0; }

  // The hash that hashOf() returns for the same characters. It is computed once, when the text is made.
  std::size_t hash() const { return rep_ == nullptr ? hashOf({}) : rep_->hash; }
  // The seed is new in each process, so that no client can choose keys that collide.
  static std::size_t hashOf(std::string_view text);

  // True when both share one allocation (or both are empty). Cheaper than ==; when it is false, the texts may
  // still be equal.
  bool sharesStorageWith(const SharedString& other) const { return rep_ == other.rep_; }

  friend bool operator==(const SharedString& a, const SharedString& b) {
    return a.rep_ == b.rep_ || a.view() == b.view();
  }
  friend bool operator==(const SharedString& a, std::string_view b) { return a.view() == b; }
  friend bool operator==(const SharedString& a, const char* b) { return a.view() == std::string_view(b); }

 private:
  struct Rep {
    std::atomic<std::uint32_t> references;
    std::uint32_t size;
    std::size_t hash;
    char* text() { return reinterpret_cast<char*>(this + 1); }
  };

  void retain() const {
    if (rep_ != nullptr) rep_->references.fetch_add(1, std::memory_order_relaxed);
  }
  void release();

  Rep* rep_ = nullptr;  // null for the empty text
};

}  // namespace tonewerk
