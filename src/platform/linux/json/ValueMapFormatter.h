// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "platform/pb/TextFormatter.h"
#include "values/Value.h"

namespace tonewerk {

// Formats a record as a map. A nested object becomes a map under its name. If a byte string is not UTF-8, its
// bytes above 0x7F are written as "\xNN".
class ValueMapFormatter final : public PB::TextFormatter {
 public:
  void beginObject(std::string_view name) override;
  void format(std::string_view name, std::uint64_t value) override;
  void format(std::string_view name, std::string_view value) override;
  void endObject() override;

  // The result: the outermost objects under their names.
  const ValueMap& map() const { return map_; }

 private:
  struct Open {
    SharedString name;
    ValueMap map;
  };

  ValueMap& current() { return open_.empty() ? map_ : open_.back().map; }

  ValueMap map_;
  std::vector<Open> open_;
};

}  // namespace tonewerk
