// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Where real-time-communication messages go: what the preference "backends" of the domain
// "com.orvane.linkreport" says, an array of texts: "local", or the base address of an OTLP/HTTP endpoint.
struct LinkReportBackends {
  static constexpr std::size_t kMaxEndpoints = 8;

  struct Endpoint {
    std::string base;  // as configured
    std::string url;   // as posted to
  };

  bool local = false;
  std::vector<Endpoint> endpoints;
  std::vector<std::string> problems;  // what was left out and why

  // Without the preference "local" alone.
  static LinkReportBackends from(const std::optional<Value>& preference);

  // In the order of the preference, "local" first. None without any.
  [[nodiscard]] std::optional<std::vector<std::string>> names() const;

 private:
  void add(const std::string& entry);
};

}  // namespace tonewerk
