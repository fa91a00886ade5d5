// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/ThermalZones.h"

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <optional>
#include <string_view>

#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

constexpr int kMaxTripPoints = 64;  // the kernel's own limit is lower

std::optional<std::string> lineOf(const std::string& path) {
  std::string text;
  if (readTextFile(path, text)) return std::nullopt;
  text.resize(std::min(text.find('\n'), text.size()));
  return text;
}

// In thousandths of a degree Celsius.
std::optional<int> temperatureIn(const std::string& path) {
  const std::optional<std::string> line = lineOf(path);
  int temperature = 0;
  if (!line || std::from_chars(line->data(), line->data() + line->size(), temperature).ec != std::errc()) {
    return std::nullopt;
  }
  return temperature;
}

int levelOfTripPoint(std::string_view type) {
  if (type == "active" || type == "passive") return 1;
  if (type == "hot") return 2;
  if (type == "critical") return 3;
  return 0;
}

int levelOfZone(const std::string& zone) {
  if (lineOf(zone + "/mode").value_or("enabled") == "disabled") return 0;
  const std::optional<int> temperature = temperatureIn(zone + "/temp");
  if (!temperature) return 0;
  int level = 0;
  for (int number = 0; number < kMaxTripPoints; ++number) {
    const std::string point = zone + "/trip_point_" + std::to_string(number);
    const std::optional<std::string> type = lineOf(point + "_type");
    if (!type) break;
    const std::optional<int> from = temperatureIn(point + "_temp");
    if (from && *from > 0 && *temperature >= *from) level = std::max(level, levelOfTripPoint(*type));
  }
  return level;
}

}  // namespace

int thermalLevelOf(const std::string& directory) {
  int level = 0;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(directory, error), end; !error && entry != end;
       entry.increment(error)) {
    if (!entry->path().filename().string().starts_with("thermal_zone")) continue;
    level = std::max(level, levelOfZone(entry->path().string()));
  }
  return level;
}

}  // namespace tonewerk
