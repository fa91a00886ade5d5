// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpAnswer.h"

#include <charconv>
#include <nlohmann/json.hpp>

#include "values/ControlCharacters.h"

namespace tonewerk {
namespace {

using Json = nlohmann::json;

constexpr std::size_t kMaxQuoted = 200;

// OTLP writes a 64-bit integer as a JSON text. A JSON number is accepted, too.
std::optional<std::int64_t> countIn(const Json& json) {
  if (json.is_number_integer()) return json.get<std::int64_t>();
  if (!json.is_string()) return std::nullopt;
  const auto& text = json.get_ref<const std::string&>();
  std::int64_t count = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), count);
  if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return count;
}

}  // namespace

std::optional<OtlpAnswer> parseOtlpAnswer(std::string_view body) {
  if (body.empty()) return OtlpAnswer();
  const Json json = Json::parse(body, nullptr, false);
  if (!json.is_object()) return std::nullopt;
  const auto partial = json.find("partialSuccess");
  if (partial == json.end()) return OtlpAnswer();
  if (!partial->is_object()) return std::nullopt;
  OtlpAnswer answer;
  if (const auto rejected = partial->find("rejectedLogRecords"); rejected != partial->end()) {
    const auto count = countIn(*rejected);
    if (!count) return std::nullopt;
    answer.rejectedRecords = *count;
  }
  if (const auto message = partial->find("errorMessage"); message != partial->end()) {
    if (!message->is_string()) return std::nullopt;
    answer.message = message->get<std::string>();
  }
  return answer;
}

std::string quotable(std::string_view text) {
  // Bytes beyond ASCII are replaced, too, because substr() may have cut within a character.
  return printableAscii(std::string(text.substr(0, kMaxQuoted)));
}

}  // namespace tonewerk
