// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/DiagnosticSummary.h"

#include <initializer_list>
#include <nlohmann/json.hpp>

#include "values/PrintableText.h"

namespace tonewerk {
namespace {

using Json = nlohmann::ordered_json;

// No item holds values that nest deeper. The library writes values recursively, so a text that is deep enough
// would exhaust the stack.
constexpr int kMaxDepth = 200;

// Discarded when `text` is not JSON, or nests deeper than kMaxDepth.
Json parsed(std::string_view text) {
  bool isTooDeep = false;
  const auto take = [&](int levelsAround, Json::parse_event_t event, Json& /*value*/) {
    const bool isStart =
        event == Json::parse_event_t::object_start || event == Json::parse_event_t::array_start;
    isTooDeep = isTooDeep || (isStart && levelsAround >= kMaxDepth);
    return !isTooDeep;
  };
  Json json = Json::parse(text, take, false);
  return isTooDeep ? Json(Json::value_t::discarded) : json;
}

// Null when a key of the path is missing.
const Json* find(const Json& root, std::initializer_list<const char*> path) {
  const Json* at = &root;
  for (const char* key : path) {
    if (!at->is_object()) return nullptr;
    const auto found = at->find(key);
    if (found == at->end()) return nullptr;
    at = &*found;
  }
  return at;
}

// Texts as they are, other values as JSON. Bytes that are not UTF-8 are replaced.
std::string textOf(const Json* value) {
  if (value == nullptr || value->is_null()) return "";
  if (value->is_string()) return printable(value->get<std::string>());
  return printable(value->dump(-1, ' ', false, Json::error_handler_t::replace));
}

std::string textAt(const Json& root, std::initializer_list<const char*> path) {
  return textOf(find(root, path));
}

// Joins the texts that are not empty.
std::string joined(std::initializer_list<std::string> texts, const char* separator) {
  std::string all;
  for (const std::string& text : texts) {
    if (text.empty()) continue;
    if (!all.empty()) all += separator;
    all += text;
  }
  return all;
}

void readCapture(const Json& request, DiagnosticSummary& summary) {
  summary.what = joined({textAt(request, {"signature", "type"}), textAt(request, {"signature", "subType"}),
                         textAt(request, {"signature", "subtypeContext"})},
                        " / ");
  summary.why = textAt(request, {"signature", "domain"});
  summary.process = textAt(request, {"signature", "detectedProcess"});
  summary.duration = textAt(request, {"duration"});
}

void readDraft(const Json& request, DiagnosticSummary& summary) {
  summary.what = textAt(request, {"title"});
  summary.why = textAt(request, {"displayReason"});
  summary.process = textAt(request, {"processName"});
  summary.component = joined(
      {textAt(request, {"component", "name"}), textAt(request, {"component", "version"})}, ", version ");
}

void readWhirlcap(const Json& request, DiagnosticSummary& summary) {
  summary.what = textAt(request, {"reason"});
  summary.why = joined({"requested by", textAt(request, {"requester"})}, " ");
  summary.process = textAt(request, {"description"});
}

}  // namespace

std::optional<DiagnosticSummary> DiagnosticSummary::read(DiagnosticKind kind, std::string_view text) {
  const Json request = parsed(text);
  if (!request.is_object()) return std::nullopt;
  DiagnosticSummary summary;
  switch (kind) {
    case DiagnosticKind::kCapture:
      readCapture(request, summary);
      break;
    case DiagnosticKind::kIssueDraft:
      readDraft(request, summary);
      break;
    case DiagnosticKind::kWhirlcap:
      readWhirlcap(request, summary);
      break;
  }
  summary.when = textAt(request, {"requestedAt"});
  summary.payload = textAt(request, {"payload"});
  const Json* problems = find(request, {"problems"});
  if (problems == nullptr || !problems->is_object()) return summary;
  for (const auto& [file, problem] : problems->items()) {
    summary.problems.emplace_back(printable(file), textOf(&problem));
  }
  return summary;
}

std::string compactJson(std::string_view text) {
  const Json value = parsed(text);
  return value.is_discarded() ? "null" : value.dump(-1, ' ', false, Json::error_handler_t::replace);
}

}  // namespace tonewerk
