// SPDX-License-Identifier: Apache-2.0
#include "values/ValueArray.h"

#include <algorithm>
#include <cassert>
#include <utility>

#include "values/Value.h"

namespace tonewerk {

struct ValueArray::Rep {
  std::vector<Value> values;
  std::size_t bytes = 0;

  void add(Value value) {
    bytes += sizeof(Value) + value.bytes();
    values.push_back(std::move(value));
  }
};

ValueArray::ValueArray() = default;
ValueArray::ValueArray(const ValueArray&) = default;
ValueArray::ValueArray(ValueArray&&) noexcept = default;
ValueArray& ValueArray::operator=(const ValueArray&) = default;
ValueArray& ValueArray::operator=(ValueArray&&) noexcept = default;
ValueArray::~ValueArray() = default;

ValueArray::ValueArray(std::initializer_list<Value> values) : ValueArray(std::vector<Value>(values)) {}

ValueArray::ValueArray(std::vector<Value> values) {
  if (values.empty()) return;
  Rep& rep = rep_.write();
  rep.values = std::move(values);
  for (const Value& value : rep.values) rep.bytes += sizeof(Value) + value.bytes();
}

std::size_t ValueArray::size() const {
  const Rep* rep = rep_.read();
  return rep == nullptr ? 0 : rep->values.size();
}

const Value& ValueArray::operator[](std::size_t index) const {
  assert(index < size());
  return rep_.read()->values[index];
}

const Value* ValueArray::begin() const {
  const Rep* rep = rep_.read();
  return rep == nullptr ? nullptr : rep->values.data();
}

const Value* ValueArray::end() const { return begin() + size(); }

void ValueArray::append(Value value) { rep_.write().add(std::move(value)); }

std::size_t ValueArray::bytes() const {
  const Rep* rep = rep_.read();
  return rep == nullptr ? 0 : rep->bytes;
}

bool operator==(const ValueArray& a, const ValueArray& b) {
  if (a.rep_.sharesWith(b.rep_)) return true;
  return std::equal(a.begin(), a.end(), b.begin(), b.end());
}

}  // namespace tonewerk
