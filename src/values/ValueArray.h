// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <initializer_list>
#include <vector>

#include "values/CopyOnWrite.h"

namespace tonewerk {

class Value;  // values/Value.h, which a user of this header includes

// Holds a list of values with value semantics. A copy costs a reference count; appending to a shared list
// copies it first.
class ValueArray {
 public:
  ValueArray();
  ValueArray(std::initializer_list<Value> values);
  explicit ValueArray(std::vector<Value> values);
  ValueArray(const ValueArray&);
  ValueArray(ValueArray&&) noexcept;
  ValueArray& operator=(const ValueArray&);
  ValueArray& operator=(ValueArray&&) noexcept;
  ~ValueArray();

  std::size_t size() const;
  bool empty() const { return size() == 0; }
  const Value& operator[](std::size_t index) const;
  const Value* begin() const;
  const Value* end() const;
  void append(Value value);

  // Returns about how many bytes the array holds on the heap. O(1).
  std::size_t bytes() const;

  // Compares element by element.
  friend bool operator==(const ValueArray& a, const ValueArray& b);

 private:
  struct Rep;
  CopyOnWrite<Rep> rep_;
};

}  // namespace tonewerk
