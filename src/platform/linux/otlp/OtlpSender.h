// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <optional>
#include <string>

#include "platform/linux/otlp/HttpClient.h"
#include "platform/linux/otlp/OtlpLogRecord.h"
#include "platform/linux/otlp/OtlpOutbox.h"
#include "platform/linux/otlp/RetryPolicy.h"

namespace tonewerk {

class Clock;
class LogCategory;

// Gets records out of an outbox to one endpoint, one request after the other. One thread.
//
//   delivered        said so in the log when it was otherwise before
//   cannot be now    kept, and tried again after a while, for as long as it takes
//   too large        sent in halves; a record that is too large alone is dropped
//   refused          dropped and counted
//
// While an endpoint cannot be reached nothing else is sent to it; what then finds no room in the outbox is
// dropped there. Nothing is dropped without being counted in the log.
class OtlpSender {
 public:
  using ResourceSource = std::function<OtlpResource()>;  // asked for every request

  // `url` as it is posted to. Everything outlives it.
  OtlpSender(std::string url, OtlpOutbox& outbox, HttpClient& client, ResourceSource resource,
             const Clock& clock, const LogCategory& log, RetryPolicy retry);

  // Sends what is due. How long until something will be; none when nothing waits.
  std::optional<OtlpOutbox::Time> sendDue();

  // The end is near: no more waiting between tries, except where the endpoint asked for it.
  void hurry();

  // Says what is lost, and what was dropped in all. Last.
  void logLosses();

 private:
  enum class Outcome { kGoOn, kWait };

  [[nodiscard]] Outcome sendNext();
  [[nodiscard]] HttpAnswer post(const OtlpOutbox::Batch& batch);
  void delivered(const OtlpOutbox::Batch& batch, const HttpAnswer& answer);
  void takeAnswer(const OtlpOutbox::Batch& batch, const HttpAnswer& answer);
  [[nodiscard]] Outcome retryLater(const HttpAnswer& answer);
  void split();
  void drop(const OtlpOutbox::Batch& batch, const std::string& why);
  void logOnce(const std::string& problem);

  const std::string url_;
  OtlpOutbox& outbox_;
  HttpClient& client_;
  const ResourceSource resource_;
  const Clock& clock_;
  const LogCategory& log_;
  RetryPolicy retry_;

  std::deque<OtlpOutbox::Batch> taken_;  // more than one after a split
  std::optional<OtlpOutbox::Time> notBefore_;
  bool waitIsAsked_ = false;     // by the endpoint
  std::string loggedProblem_;    // empty while records are taken
  std::string loggedComplaint_;  // about the last answer
  std::uint64_t dropped_ = 0;    // since the last delivery
  std::uint64_t allDropped_ = 0;
};

}  // namespace tonewerk
