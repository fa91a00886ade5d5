// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <string>

#include "platform/linux/otlp/HttpClient.h"

namespace tonewerk {

// Sends HTTP requests with libcurl. It reuses connections, verifies certificates, and supports only http and
// https.
class CurlHttpClient final : public HttpClient {
 public:
  struct Timeouts {
    std::chrono::milliseconds connect{10'000};
    std::chrono::milliseconds whole{30'000};
  };

  explicit CurlHttpClient(std::string userAgent);
  CurlHttpClient(std::string userAgent, const Timeouts& timeouts);
  CurlHttpClient(const CurlHttpClient&) = delete;
  CurlHttpClient& operator=(const CurlHttpClient&) = delete;
  ~CurlHttpClient() override;

  [[nodiscard]] HttpAnswer post(const HttpRequest& request) override;
  void cancel() override;

 private:
  struct Handles;

  const std::string userAgent_;
  const Timeouts timeouts_;
  std::unique_ptr<Handles> handles_;
  std::atomic<bool> isCancelled_ = false;
};

struct OtlpLogsAddress {
  std::string url{};      // empty with a problem
  std::string problem{};  // why there is none
  bool isChecked = true;  // false when the base could not be checked, because libcurl could not be loaded
};

// The URL "<base>/v1/logs" for the base address of an endpoint. The base must be an http or https URL with a
// host and without user, password, query and fragment.
[[nodiscard]] OtlpLogsAddress otlpLogsAddressOf(const std::string& base);

}  // namespace tonewerk
