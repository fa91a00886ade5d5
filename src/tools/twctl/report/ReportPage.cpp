// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/ReportPage.h"

#include <array>
#include <cstddef>
#include <random>
#include <utility>

#include "tools/twctl/report/ReportAssets.h"
#include "values/CompactJson.h"

namespace tonewerk {
namespace {

// The JSON of `data` for a script element. Texts of clients may have what would end the element.
std::string scriptJson(const ValueMap& data) {
  std::string json;
  appendCompactJson(json, data);
  std::string safe;
  safe.reserve(json.size());
  for (const char c : json) {
    if (c == '<') {
      safe += "\\u003c";
    } else {
      safe += c;
    }
  }
  return safe;
}

}  // namespace

std::string reportPage(const ValueMap& data, std::string_view nonce, PageConnections connections) {
  const std::string json = scriptJson(data);
  const std::array<std::pair<std::string_view, std::string_view>, 6> parts{
      {{"{{connections}}", connections == PageConnections::kOwnServer ? "'self'" : "'none'"},
       {"{{style}}", report_assets::style()},
       {"{{data}}", json},
       {"{{charts}}", report_assets::charts()},
       {"{{script}}", report_assets::script()},
       {"{{nonce}}", nonce}}};
  std::string page;
  page.reserve(json.size() + report_assets::charts().size() + (std::size_t{1} << 17U));
  // Only the places of page.html count, not what looks like one in a part.
  for (std::string_view rest = report_assets::html(); !rest.empty();) {
    const std::size_t place = rest.find("{{");
    page += rest.substr(0, place);
    if (place == std::string_view::npos) break;
    rest.remove_prefix(place);
    for (const auto& [mark, text] : parts) {
      if (!rest.starts_with(mark)) continue;
      page += text;
      rest.remove_prefix(mark.size());
      break;
    }
  }
  return page;
}

std::string newNonce() {
  constexpr std::string_view kLetters = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789";
  constexpr std::size_t kLength = 24;
  std::random_device random;
  std::uniform_int_distribution<std::size_t> letter(0, kLetters.size() - 1);
  std::string nonce;
  for (std::size_t i = 0; i < kLength; ++i) nonce += kLetters[letter(random)];
  return nonce;
}

}  // namespace tonewerk
