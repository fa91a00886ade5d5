// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// The current row of a query. Columns count from 0. Valid until the next row.
class ViewRow {
 public:
  explicit ViewRow(const SqlQuery& query) : query_(query) {}

  // None for null.
  std::optional<std::string> text(int column) const;
  std::optional<std::int64_t> integer(int column) const;
  std::optional<double> number(int column) const;

 private:
  const SqlQuery& query_;
};

// Calls `take` for each row of `sql`, in which ?1, ?2, ... are `parameters`; null where there is none. False
// when the store cannot be read; `problem` says why.
[[nodiscard]] bool eachRow(SqlReader& reader, const std::string& sql,
                           const std::vector<std::optional<std::string>>& parameters, std::string& problem,
                           const std::function<void(const ViewRow& row)>& take);

}  // namespace tonewerk
