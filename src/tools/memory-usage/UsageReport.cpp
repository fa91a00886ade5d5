// SPDX-License-Identifier: Apache-2.0
#include "tools/memory-usage/UsageReport.h"

#include <algorithm>
#include <cstdio>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>

namespace tonewerk {
namespace {

using Json = nlohmann::ordered_json;

double sizeOf(const MemoryUsage& usage, UsageOrder order) {
  switch (order) {
    case UsageOrder::kFootprint:
      return static_cast<double>(usage.footprint());
    case UsageOrder::kResident:
      return static_cast<double>(usage.resident());
    case UsageOrder::kWired:
      return static_cast<double>(usage.wired());
    case UsageOrder::kProcessorTime:
      return usage.seconds();
    case UsageOrder::kProcess:
      break;
  }
  return 0.0;
}

std::string textOf(std::uint64_t number) { return std::to_string(number); }
std::string textOf(double seconds) {
  char text[352];
  std::snprintf(text, sizeof(text), "%.2f", seconds);
  return text;
}

void writeRow(std::ostream& out, const char* name, const std::string& total, const std::string& first,
              const std::string& second, const std::string& mostly, const std::string& more = {}) {
  char row[256];
  std::snprintf(row, sizeof(row), "%15s %10s %11s %11s %11s", name, total.c_str(), first.c_str(),
                second.c_str(), mostly.c_str());
  out << row << more << '\n';
}

template <typename Number>
void writeResource(std::ostream& out, const char* name, Number first, Number second, const char* firstName,
                   const char* secondName) {
  const Number total = first + second;
  const char* mostly = first >= second ? firstName : secondName;
  writeRow(out, name, textOf(total), textOf(first), textOf(second), total == 0 ? "none" : mostly);
}

void writeBlock(std::ostream& out, const std::string& whose, const MemoryUsage& usage,
                const char* pinnedName) {
  writeRow(out, "RESOURCE", "TOTAL", "FIRST", "SECOND", "MOSTLY", "  " + whose);
  writeResource(out, "cpu_time", usage.userSeconds, usage.systemSeconds, "user", "system");
  writeResource(out, "phys_mem", usage.anonymous, usage.shared, "anonymous", "shared");
  writeResource(out, "wired_mem", usage.locked, usage.pinned, "locked", pinnedName);
  writeResource(out, "phys_footprint", usage.anonymous, usage.swapped, "resident", "swapped");
}

MemoryUsage totalOf(const UsageSnapshot& snapshot) {
  MemoryUsage total;
  for (const ProcessUsage& process : snapshot.processes) total += process.usage;
  return total;
}

std::string counted(std::size_t count, const char* noun) {
  return std::to_string(count) + " " + noun + (count == 1 ? "" : "es");
}

void addUsage(Json& object, const MemoryUsage& usage, const char* pinnedName) {
  object["cpu_time"] = {
      {"total", usage.seconds()}, {"user", usage.userSeconds}, {"system", usage.systemSeconds}};
  object["phys_mem"] = {
      {"total", usage.resident()}, {"anonymous", usage.anonymous}, {"shared", usage.shared}};
  object["wired_mem"] = {{"total", usage.wired()}, {"locked", usage.locked}, {pinnedName, usage.pinned}};
  object["phys_footprint"] = {
      {"total", usage.footprint()}, {"resident", usage.anonymous}, {"swapped", usage.swapped}};
}

}  // namespace

void sortProcesses(std::vector<ProcessUsage>& processes, UsageOrder order) {
  std::sort(processes.begin(), processes.end(), [&](const ProcessUsage& a, const ProcessUsage& b) {
    const double sizeA = sizeOf(a.usage, order);
    const double sizeB = sizeOf(b.usage, order);
    return sizeA != sizeB ? sizeA > sizeB : a.process < b.process;
  });
}

void writeUsageText(std::ostream& out, const UsageSnapshot& snapshot, std::size_t maxProcesses) {
  for (std::size_t at = 0; at < std::min(maxProcesses, snapshot.processes.size()); ++at) {
    const ProcessUsage& process = snapshot.processes[at];
    writeBlock(
        out,
        std::to_string(process.process) + " " + process.name + " (user " + std::to_string(process.user) + ")",
        process.usage, "pinned");
  }
  std::string all = "total of " + counted(snapshot.processes.size(), "process");
  if (snapshot.unreadable > 0) all += ", " + counted(snapshot.unreadable, "process") + " could not be read";
  writeBlock(out, all, totalOf(snapshot), "pinned");
  writeBlock(out, "the whole system", snapshot.system, "kernel");
}

void writeUsageJson(std::ostream& out, const UsageSnapshot& snapshot, std::size_t maxProcesses) {
  for (std::size_t at = 0; at < std::min(maxProcesses, snapshot.processes.size()); ++at) {
    const ProcessUsage& process = snapshot.processes[at];
    Json object{{"pid", process.process}, {"name", process.name}, {"user", process.user}};
    addUsage(object, process.usage, "pinned");
    out << object.dump() << '\n';
  }
  Json total{
      {"total", "processes"}, {"count", snapshot.processes.size()}, {"unreadable", snapshot.unreadable}};
  addUsage(total, totalOf(snapshot), "pinned");
  out << total.dump() << '\n';
  Json system{{"total", "system"}};
  addUsage(system, snapshot.system, "kernel");
  out << system.dump() << '\n';
}

}  // namespace tonewerk
