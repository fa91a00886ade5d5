// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tonewerk {

// What the users of the daemon share, and one of them could use up.
enum class Resource : std::uint8_t {
  kConnections,
  kBusConnections,
  kReadBytes,
  kUnfinishedBytes,
  kKeptBytes,
  kSnapshotBytes,
  kSinkBytes,
  kStoredBytes,
};

// Describes a resource. This table is the one place where the totals are named; docs/users.md shows it.
struct ResourceFacts {
  Resource resource;
  // In answers to watch.accounts and in log lines.
  std::string_view name;
  std::string_view meaning;
  // What all users together may hold, in pieces or bytes. The listener and the store replace the totals of
  // connections and stored bytes, which depend on the process's limits and on the store's preferences.
  std::uint64_t total;
  // The key of the preference, in MiB, that replaces the total; empty when there is none.
  std::string_view preference;
};

inline constexpr std::uint64_t kMiB = std::uint64_t{1} << 20;

inline constexpr std::array<ResourceFacts, 8> kResources{{
    {Resource::kConnections, "connections", "connections over the socket", 1024, ""},
    {Resource::kBusConnections, "busConnections", "clients on D-Bus", 256, ""},
    {Resource::kReadBytes, "readBytes", "frames that have not arrived as a whole", 128 * kMiB, ""},
    {Resource::kUnfinishedBytes, "unfinishedBytes", "requests that have not finished, times their sessions",
     128 * kMiB, "unfinished_megabytes"},
    {Resource::kKeptBytes, "keptBytes", "messages, previous values and configurations of sessions",
     512 * kMiB, "kept_megabytes"},
    {Resource::kSnapshotBytes, "snapshotBytes", "driver statistics that sessions took at their start",
     64 * kMiB, "snapshot_megabytes"},
    {Resource::kSinkBytes, "sinkBytes", "reports that are not written yet", 16 * kMiB, ""},
    {Resource::kStoredBytes, "storedBytes", "rows in the store", 256 * kMiB, ""},
}};

constexpr std::size_t indexOf(Resource resource) { return static_cast<std::size_t>(resource); }

constexpr bool areResourcesInOrder() {
  for (std::size_t at = 0; at < kResources.size(); ++at) {
    if (indexOf(kResources[at].resource) != at) return false;
  }
  return true;
}
static_assert(areResourcesInOrder());

}  // namespace tonewerk
