// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

#include "platform/pb/Reader.h"

namespace tonewerk {

// Reads protocol-buffer bytes. Safe for hostile input: a length is checked before memory is allocated, and
// groups are skipped only up to a depth of kMaxGroups.
class ProtozeroReader final : public PB::Reader {
 public:
  static constexpr int kMaxGroups = 32;

  // `bytes` must outlive the reader.
  explicit ProtozeroReader(std::string_view bytes) : at_(bytes.data()), end_(bytes.data() + bytes.size()) {}

  [[nodiscard]] std::optional<Key> nextKey() override;
  [[nodiscard]] std::optional<std::uint64_t> readVarint() override;
  [[nodiscard]] std::optional<std::string> readBytes() override;
  [[nodiscard]] bool skip(const Key& key) override;
  bool hasError() const override { return hasError_; }

 private:
  [[nodiscard]] bool skip(const Key& key, int groups);
  [[nodiscard]] bool skipBytes(std::uint64_t count);
  bool fail();

  const char* at_;
  const char* end_;
  bool hasError_ = false;
};

}  // namespace tonewerk
