// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Lists the destinations of real-time-communication messages. They come from the preference "backends" of the
// domain "com.orvane.linkreport": an array of texts, each "local" or the base address of an OTLP/HTTP
// endpoint.
struct LinkReportBackends {
  static constexpr std::size_t kMaxEndpoints = 8;

  struct Endpoint {
    std::string base;  // as configured
    std::string url;   // as posted to
  };

  bool local = false;
  std::vector<Endpoint> endpoints;
  std::vector<std::string> problems;  // entries that were left out, and why

  // Without the preference, "local" is the only backend.
  static LinkReportBackends from(const std::optional<Value>& preference);

  // "local" first, then the endpoints in the order of the preference. None without backends.
  [[nodiscard]] std::optional<std::vector<std::string>> names() const;

 private:
  void add(const std::string& entry);
};

}  // namespace tonewerk
