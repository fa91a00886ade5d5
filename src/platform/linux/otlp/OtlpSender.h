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
#include "platform/linux/store/StoreRow.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;
class LogCategory;

// Sends the records of an outbox to one endpoint, one request at a time. One thread. A batch is handled by
// the result of its request:
//
//   delivered        logged if an earlier batch was not delivered
//   not possible now kept and sent again later, without a limit
//   too large        sent in halves; a single record that is too large is dropped
//   refused          dropped and counted
//
// While a batch waits to be sent again, no other batch is sent. Records that do not fit into the outbox
// meanwhile are dropped there. All dropped records are counted in the log. The ledger is told of every
// request.
class OtlpSender {
 public:
  using ResourceSource = std::function<OtlpResource()>;   // called for every request
  using Ledger = std::function<void(const SendingRow&)>;  // called after every request; must not wait

  // `url` is the complete URL of the requests, without user, password and query. The references must outlive
  // the sender.
  OtlpSender(std::string url, OtlpOutbox& outbox, HttpClient& client, ResourceSource resource, Ledger ledger,
             const Clock& clock, const LogCategory& log, RetryPolicy retry);

  // Sends all records that are due. Returns how long to wait until the next ones are due; none if no records
  // wait.
  std::optional<OtlpOutbox::Time> sendDue();

  // Any thread. Why the last sending failed; empty while the endpoint accepts records.
  std::string problem() const;

  // Lets the next sendDue() try again at once, unless the endpoint asked for a delay. For the end.
  void skipRetryDelay();

  // Logs how many records are lost and how many were dropped in all. To be called last.
  void logLosses();

 private:
  enum class Outcome { kContinue, kWait };

  [[nodiscard]] Outcome sendNext();
  [[nodiscard]] HttpRequest requestOf(const OtlpOutbox::Batch& batch) const;
  // Does what the answer to the first batch asks for, and completes its row of the ledger.
  [[nodiscard]] Outcome handle(const HttpAnswer& answer, SendingRow& sending);
  void delivered(const HttpAnswer& answer, SendingRow& sending);
  void takeAnswer(const HttpAnswer& answer, SendingRow& sending);
  [[nodiscard]] Outcome retryLater(const HttpAnswer& answer);
  void split();
  void drop(const OtlpOutbox::Batch& batch, const std::string& why);
  void logOnce(const std::string& problem);
  // Returns the problem before.
  std::string exchangeProblem(std::string problem);

  const std::string url_;
  OtlpOutbox& outbox_;
  HttpClient& client_;
  const ResourceSource resource_;
  const Ledger ledger_;
  const Clock& clock_;
  const LogCategory& log_;
  RetryPolicy retry_;

  std::deque<OtlpOutbox::Batch> taken_;  // more than one after a split
  std::optional<OtlpOutbox::Time> notBefore_;
  bool waitIsAsked_ = false;     // whether the endpoint asked for the delay
  std::string loggedComplaint_;  // about the last answer
  std::uint64_t dropped_ = 0;    // since the last delivery
  std::uint64_t allDropped_ = 0;

  mutable Mutex problemMutex_;
  std::string loggedProblem_ GUARDED_BY(problemMutex_);  // empty while the endpoint accepts records
};

}  // namespace tonewerk
