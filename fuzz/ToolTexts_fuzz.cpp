// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as what twctl shows: an answer of the daemon, which holds what clients have chosen, as a
// packed value; or, if the first byte is odd, the request.json of a diagnostic item. Whatever it is, no line
// that is printed controls the terminal, and each line for programs is JSON.
#include <cstddef>
#include <cstdint>
#include <nlohmann/json.hpp>
#include <optional>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "FuzzInput.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/messagepack/RpcValueReader.h"
#include "tools/twctl/Tool.h"
#include "tools/twctl/show/AccountTable.h"
#include "tools/twctl/show/DiagnosticSummary.h"
#include "tools/twctl/show/MessagePrinter.h"
#include "tools/twctl/show/SessionRates.h"
#include "tools/twctl/show/SinkTable.h"
#include "tools/twctl/show/TopFrame.h"
#include "tools/twctl/show/TopView.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

void expectLines(const std::string& text, bool asJson) {
  expect(text.empty() || text.ends_with('\n'));
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    expect(isPrintable(line));
    expect(!asJson || nlohmann::json::accept(line));
  }
}

// Prints with `print(tool)`, for people and for programs.
template <typename Print>
void show(Print print) {
  static const NlohmannJsonService json;
  for (const bool asJson : {false, true}) {
    std::ostringstream out;
    std::ostringstream err;
    const Tool tool{.out = out, .err = err, .json = json, .asJson = asJson};
    print(tool);
    expectLines(out.str(), asJson);
    expect(err.str().empty());
  }
}

void showSessions(const std::vector<ValueMap>& listing) {
  SessionRates rates;
  (void)rates.rowsOf(listing, 1.0);
  const std::vector<SessionRow> rows = rates.rowsOf(listing, 2.5);
  expect(rows.size() == listing.size());
  for (const std::string& line : topFrame(rows, AudioHealth())) expect(isPrintable(line));
  TopView view;
  view.update(rows, AudioHealth());
  for (const TerminalSize size : {TerminalSize{1, 1}, TerminalSize{20, 2}, TerminalSize{80, 4}}) {
    const std::vector<TopLine> page = view.page(size);
    expect(page.size() <= size.rows);
    for (const TopLine& line : page) expect(isPrintable(line.text));
  }
  for (const SessionRow& row : rows) expect(nlohmann::json::accept(topObject(row).text()));
}

void showAnswer(std::string_view bytes) {
  const std::optional<Value> answer = readValue(bytes, ValuePlace::kResult);
  if (!answer) return;
  std::vector<ValueMap> maps;
  if (answer->asMap() != nullptr) maps.push_back(*answer->asMap());
  if (const ValueArray* array = answer->asArray()) {
    for (const Value& element : *array) {
      if (element.asMap() != nullptr) maps.push_back(*element.asMap());
    }
  }
  show([&](const Tool& tool) {
    const MessagePrinter printer(tool);
    for (const ValueMap& map : maps) printer.print(map);
    printer.printMissed(maps.size());
  });
  show([&](const Tool& tool) {
    if (tool.asJson) return;  // these tables are for people
    SinkTable sinks(tool.out);
    AccountTable accounts(tool.out);
    for (const ValueMap& map : maps) {
      sinks.add(map);
      accounts.add(map);
    }
  });
  showSessions(maps);
}

void showDiagnosticItem(std::string_view text) {
  const std::string json = compactJson(text);
  expect(nlohmann::json::accept(json) && isPrintable(printable(json)));
  for (const DiagnosticKind kind :
       {DiagnosticKind::kCapture, DiagnosticKind::kIssueDraft, DiagnosticKind::kWhirlcap}) {
    const std::optional<DiagnosticSummary> summary = DiagnosticSummary::read(kind, text);
    if (!summary) continue;
    for (const std::string& field : {summary->when, summary->what, summary->why, summary->process,
                                     summary->component, summary->duration, summary->payload}) {
      expect(isPrintable(field));
    }
    for (const auto& [file, problem] : summary->problems) expect(isPrintable(file) && isPrintable(problem));
  }
}

void read(FuzzInput input) {
  if (input.below(2) == 0) return showAnswer(input.rest());
  showDiagnosticItem(input.rest());
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({data, size});
  return 0;
}
