// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <string>
#include <vector>

#include "platform/linux/json/ValueMapFormatter.h"
#include "platform/linux/protobuf/ProtozeroReader.h"
#include "platform/linux/store/StoreReader.h"
#include "platform/pb/AudioIssueDetected.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

using diagwiremetrics::AudioIssueDetected;

std::string hexOf(std::string_view bytes) {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    text += kDigits[byte >> 4];
    text += kDigits[byte & 15];
  }
  return text;
}

// The record's fields, or its bytes in hexadecimal when the record is of an unknown kind or damaged.
Value decoded(const StoredMetric& metric) {
  AudioIssueDetected record;
  ProtozeroReader reader(metric.record);
  if (metric.identifier != AudioIssueDetected::kMetricIdentifier || !record.readFrom(reader)) {
    return hexOf(metric.record);
  }
  ValueMapFormatter formatter;
  record.formatText(formatter, "record");
  return *formatter.map().find("record");
}

bool print(Tool& tool, StoreReader& reader, const EventFilter& filter) {
  Table table(tool, tool.asJson ? std::vector<std::string>{"id", "posted_at", "identifier", "record"}
                                : std::vector<std::string>{"id", "time", "identifier", "record"});
  table.dropWhenNarrow({"identifier", "id"});
  return reader.readMetrics(filter, [&](const StoredMetric& metric) {
    table.add(
        {Value(metric.id), Table::Cell::time(metric.postedAt), Value(metric.identifier), decoded(metric)});
  });
}

void metrics(Tool& tool, const EventFilterOptions& options) {
  const auto filter = options.filter(tool);
  if (!filter) return;
  const PagedOutput pages(tool);
  StoreReader reader;
  if (reader.open(tool.directories().state) != StoreReader::Outcome::kDone || !print(tool, reader, *filter)) {
    tool.status = tool.fail(kRefused, reader.problem());
  }
}

}  // namespace

void addMetricsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "metrics", "The metric records in the store, decoded, oldest first");
  const auto options = std::make_shared<EventFilterOptions>();
  options->addTo(command, "metric records", {});
  command.callback([&tool, options] { metrics(tool, *options); });
}

}  // namespace tonewerk
