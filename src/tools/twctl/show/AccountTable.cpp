// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/AccountTable.h"

#include <array>
#include <cstdint>
#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

#include "protocol/WatchKeys.h"
#include "tools/twctl/show/UserName.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr std::string_view kLogLines = "logLines";

std::string amountText(std::uint64_t amount, bool isBytes) {
  if (!isBytes) return std::to_string(amount);
  constexpr std::array<std::string_view, 4> kUnits{"B", "KiB", "MiB", "GiB"};
  auto number = static_cast<double>(amount);
  std::size_t unit = 0;
  while (number >= 1024 && unit + 1 < kUnits.size()) {
    number /= 1024;
    ++unit;
  }
  std::array<char, 48> text{};
  std::snprintf(text.data(), text.size(), unit == 0 ? "%.0f " : "%.1f ", number);
  return text.data() + std::string(kUnits[unit]);
}

Table::Cell amount(std::uint64_t number, bool isBytes) {
  return {amountText(number, isBytes), std::to_string(number)};
}

std::uint64_t numberUnder(const SharedString& key, const ValueMap& map) {
  return static_cast<std::uint64_t>(map.integer(key));
}

}  // namespace

AccountTable::AccountTable(std::ostream& out)
    : table_(out, false, {"user", "resource", "held", "share", "refused"}) {}

void AccountTable::add(const ValueMap& account) {
  if (const Value* list = account.find(kWatchKeyResources); list != nullptr && list->asArray() != nullptr) {
    for (const Value& entry : *list->asArray()) {
      if (entry.asMap() == nullptr) continue;
      const ValueMap& resource = *entry.asMap();
      const std::string name = resource.text(kWatchKeyName);
      const bool isBytes = name.ends_with("Bytes");
      addRow(account, name, amount(numberUnder(kWatchKeyHeld, resource), isBytes),
             amount(numberUnder(kWatchKeyShare, resource), isBytes), numberUnder(kWatchKeyRefused, resource));
    }
  }
  const std::uint64_t heldBack = numberUnder(kWatchKeyLinesHeldBack, account);
  if (heldBack > 0) addRow(account, std::string(kLogLines), {"-", "null"}, {"-", "null"}, heldBack);
}

void AccountTable::addRow(const ValueMap& account, const std::string& resource, const Table::Cell& held,
                          const Table::Cell& share, std::uint64_t refused) {
  table_.add({Value(userName(numberUnder(kWatchKeyUser, account))), Value(printable(resource)), held, share,
              Value(refused)});
}

}  // namespace tonewerk
