// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstdint>
#include <utility>

namespace tonewerk {

// Points to a T that copies share until one of them writes. A copy costs a reference count; write() gives the
// writer a T of its own. It is null until the first write.
//
// std::shared_ptr does not fit: its use_count() does not order a writer after the last other reader.
template <typename T>
class CopyOnWrite {
 public:
  CopyOnWrite() = default;
  CopyOnWrite(const CopyOnWrite& other) : node_(other.node_) {
    if (node_ != nullptr) node_->references.fetch_add(1, std::memory_order_relaxed);
  }
  CopyOnWrite(CopyOnWrite&& other) noexcept : node_(std::exchange(other.node_, nullptr)) {}
  CopyOnWrite& operator=(CopyOnWrite other) noexcept {
    std::swap(node_, other.node_);
    return *this;
  }
  ~CopyOnWrite() {
    if (node_ != nullptr && node_->references.fetch_sub(1, std::memory_order_acq_rel) == 1) delete node_;
  }

  const T* read() const { return node_ == nullptr ? nullptr : &node_->value; }

  // Returns a T that no other pointer shares. Copies the old one when it is shared.
  T& write() {
    if (node_ == nullptr) {
      node_ = new Node();
    } else if (node_->references.load(std::memory_order_acquire) != 1) {
      *this = CopyOnWrite(new Node(node_->value));
    }
    return node_->value;
  }

  bool sharesWith(const CopyOnWrite& other) const { return node_ == other.node_; }

 private:
  struct Node {
    Node() = default;
    explicit Node(const T& from) : value(from) {}
    std::atomic<std::uint32_t> references{1};
    T value;
  };
  explicit CopyOnWrite(Node* node) : node_(node) {}

  Node* node_ = nullptr;
};

}  // namespace tonewerk
