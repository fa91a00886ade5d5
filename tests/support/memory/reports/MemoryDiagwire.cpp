// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryDiagwire.h"

#include <utility>

#include "platform/pb/Base.h"
#include "platform/pb/Writer.h"

namespace tonewerk {
namespace {

class FieldList final : public PB::Writer {
 public:
  void writeVarint(std::uint32_t tag, std::uint64_t value) override {
    fields.push_back(std::to_string(tag) + "=" + std::to_string(value));
  }
  void writeBytes(std::uint32_t tag, std::string_view value) override {
    fields.push_back(std::to_string(tag) + "=" + std::string(value));
  }

  std::vector<std::string> fields;
};

}  // namespace

void MemoryDiagwire::post(std::uint32_t metricIdentifier, const PB::Base& record) {
  FieldList list;
  record.writeTo(list);
  const MutexLock lock(mutex_);
  posts_.push_back({metricIdentifier, std::move(list.fields)});
}

std::vector<MemoryDiagwire::Post> MemoryDiagwire::posts() const {
  const MutexLock lock(mutex_);
  return posts_;
}

}  // namespace tonewerk
