// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <deque>
#include <utility>
#include <vector>

#include "platform/linux/otlp/HttpClient.h"

namespace tonewerk {

// Records requests and answers them from a list, then with 200. One thread.
class ScriptedHttpClient final : public HttpClient {
 public:
  HttpAnswer post(const HttpRequest& request) override {
    requests.push_back(request);
    HttpAnswer answer;
    answer.status = 200;
    if (!answers.empty()) {
      answer = std::move(answers.front());
      answers.pop_front();
    }
    return answer;
  }
  void cancel() override {}

  std::vector<HttpRequest> requests;
  std::deque<HttpAnswer> answers;
};

}  // namespace tonewerk
