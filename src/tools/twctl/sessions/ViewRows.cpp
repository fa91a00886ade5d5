// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/ViewRows.h"

#include <memory>
#include <variant>

namespace tonewerk {

std::optional<std::string> ViewRow::text(int column) const {
  const SqlValue value = query_.value(column);
  const auto* text = std::get_if<std::string>(&value);
  return text == nullptr ? std::nullopt : std::optional(*text);
}

std::optional<std::int64_t> ViewRow::integer(int column) const {
  const SqlValue value = query_.value(column);
  const auto* number = std::get_if<std::int64_t>(&value);
  return number == nullptr ? std::nullopt : std::optional(*number);
}

std::optional<double> ViewRow::number(int column) const {
  const SqlValue value = query_.value(column);
  if (const auto* integer = std::get_if<std::int64_t>(&value)) return static_cast<double>(*integer);
  const auto* number = std::get_if<double>(&value);
  return number == nullptr ? std::nullopt : std::optional(*number);
}

bool eachRow(SqlReader& reader, const std::string& sql,
             const std::vector<std::optional<std::string>>& parameters, std::string& problem,
             const std::function<void(const ViewRow& row)>& take) {
  std::optional<SqlProblem> failure;
  std::size_t from = 0;
  const std::unique_ptr<SqlQuery> query = reader.prepare(sql, from, failure);
  if (query != nullptr) {
    for (std::size_t at = 0; at < parameters.size(); ++at) {
      if (parameters[at]) query->bind(static_cast<int>(at) + 1, *parameters[at]);
    }
    const ViewRow row(*query);
    while (query->next(failure)) take(row);
  }
  if (failure) problem = failure->text;
  return !failure;
}

}  // namespace tonewerk
