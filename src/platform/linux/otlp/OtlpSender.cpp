// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpSender.h"

#include <algorithm>
#include <iterator>
#include <utility>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/linux/otlp/Gzip.h"
#include "platform/linux/otlp/OtlpAnswer.h"

namespace tonewerk {
namespace {

std::string problemOf(const HttpAnswer& answer) {
  if (answer.status == 0) return answer.problem;
  return "HTTP status " + std::to_string(answer.status);
}

}  // namespace

OtlpSender::OtlpSender(std::string url, OtlpOutbox& outbox, HttpClient& client, ResourceSource resource,
                       Ledger ledger, const Clock& clock, const LogCategory& log, RetryPolicy retry)
    : url_(std::move(url)),
      outbox_(outbox),
      client_(client),
      resource_(std::move(resource)),
      ledger_(std::move(ledger)),
      clock_(clock),
      log_(log),
      retry_(std::move(retry)) {}

std::optional<OtlpOutbox::Time> OtlpSender::sendDue() {
  for (;;) {
    const OtlpOutbox::Time now = clock_.monotonic();
    if (notBefore_ && *notBefore_ > now) return *notBefore_ - now;
    notBefore_.reset();
    if (taken_.empty()) {
      OtlpOutbox::Batch batch = outbox_.take(now);
      if (batch.records.empty()) {
        const auto due = outbox_.nextDue();
        // A record that was added since take() may be due before `now`.
        return due ? std::optional(std::max(*due - now, OtlpOutbox::Time(0))) : std::nullopt;
      }
      taken_.push_back(std::move(batch));
    }
    if (sendNext() == Outcome::kWait) return *notBefore_ - now;
  }
}

OtlpSender::Outcome OtlpSender::sendNext() {
  const HttpRequest request = requestOf(taken_.front());
  SendingRow sending;
  sending.facts.sentAt = clock_.now();
  sending.facts.signal = "logs";
  sending.facts.records = taken_.front().records.size();
  sending.facts.bytes = request.body.size();
  sending.endpoint = url_;
  const HttpAnswer answer = client_.post(request);
  if (answer.status != 0) sending.facts.status = answer.status;
  sending.problem = answer.problem;
  const Outcome outcome = handle(answer, sending);
  ledger_(sending);
  return outcome;
}

HttpRequest OtlpSender::requestOf(const OtlpOutbox::Batch& batch) const {
  HttpRequest request;
  request.url = url_;
  request.headers = {"Content-Type: application/json"};
  request.body = otlpRequestOf(resource_(), batch.records);
  if (auto packed = gzip(request.body)) {
    request.body = std::move(*packed);
    request.headers.emplace_back("Content-Encoding: gzip");
  }
  return request;
}

OtlpSender::Outcome OtlpSender::handle(const HttpAnswer& answer, SendingRow& sending) {
  using Sent = SendingFacts::Outcome;
  const OtlpOutbox::Batch& batch = taken_.front();
  switch (RetryPolicy::verdictOf(answer.status)) {
    case RetryPolicy::Verdict::kRetry:
      sending.facts.outcome = Sent::kKept;
      return retryLater(answer);
    case RetryPolicy::Verdict::kSplit:
      if (batch.records.size() > 1) {
        sending.facts.outcome = Sent::kSplit;
        split();
        return Outcome::kContinue;
      }
      sending.facts.outcome = Sent::kDropped;
      drop(batch, "a record is too large for it");
      break;
    case RetryPolicy::Verdict::kDrop:
      sending.facts.outcome = Sent::kDropped;
      drop(batch, problemOf(answer));
      break;
    case RetryPolicy::Verdict::kDelivered:
      sending.facts.outcome = Sent::kDelivered;
      delivered(answer, sending);
      break;
  }
  outbox_.settle(batch, clock_.monotonic());
  taken_.pop_front();
  return Outcome::kContinue;
}

void OtlpSender::delivered(const HttpAnswer& answer, SendingRow& sending) {
  retry_.succeeded();
  const std::uint64_t full = outbox_.takeDropped();
  allDropped_ += full;
  const std::uint64_t dropped = std::exchange(dropped_, 0) + full;
  if (!exchangeProblem({}).empty() || dropped > 0) {
    errorLog(log_, "sending to %@ goes on; records dropped meanwhile: %lu", url_, dropped);
  }
  takeAnswer(answer, sending);
}

// Reads the body of a successful answer. The status alone says that the records were accepted, so a body that
// cannot be read is only logged.
void OtlpSender::takeAnswer(const HttpAnswer& answer, SendingRow& sending) {
  std::string complaint;
  const std::optional<OtlpAnswer> parsed = parseOtlpAnswer(answer.body);
  if (!answer.problem.empty()) {
    complaint = "its answer is not whole: " + answer.problem;
  } else if (!parsed) {
    complaint = "its answer cannot be read";
  } else {
    const auto claimed = static_cast<std::uint64_t>(std::max<std::int64_t>(0, parsed->rejectedRecords));
    const std::uint64_t rejected = std::min(claimed, sending.facts.records);
    const std::string said = quotable(parsed->message);
    allDropped_ += rejected;
    sending.facts.rejected = rejected;
    sending.problem = said;
    if (rejected > 0) {
      errorLog(log_, "%@ rejected records: %lu (%@)", url_, rejected, said);
    } else if (!said.empty()) {
      defaultLog(log_, "%@ says: %@", url_, said);
    }
  }
  if (!complaint.empty()) sending.problem = complaint;
  if (!complaint.empty() && complaint != loggedComplaint_) errorLog(log_, "%@: %@", url_, complaint);
  loggedComplaint_ = std::move(complaint);
}

OtlpSender::Outcome OtlpSender::retryLater(const HttpAnswer& answer) {
  std::optional<std::chrono::seconds> asked;
  if (answer.status != 0) asked = parseRetryAfter(answer.retryAfter, clock_.now());
  waitIsAsked_ = asked.has_value();
  notBefore_ = clock_.monotonic() + retry_.delayAfterFailure(asked);
  logOnce(problemOf(answer) + "; records are kept while there is room");
  return Outcome::kWait;
}

// Splits the first batch into halves. Their `bytes` add up to those of the batch, so settle() frees all its
// room.
void OtlpSender::split() {
  OtlpOutbox::Batch whole = std::move(taken_.front());
  taken_.pop_front();
  OtlpOutbox::Batch second;
  const auto middle = whole.records.begin() + static_cast<std::ptrdiff_t>(whole.records.size() / 2);
  second.records.assign(std::make_move_iterator(middle), std::make_move_iterator(whole.records.end()));
  whole.records.erase(middle, whole.records.end());
  second.bytes = whole.bytes / 2;
  whole.bytes -= second.bytes;
  taken_.push_front(std::move(second));
  taken_.push_front(std::move(whole));
}

void OtlpSender::drop(const OtlpOutbox::Batch& batch, const std::string& why) {
  retry_.succeeded();  // the endpoint can be reached
  dropped_ += batch.records.size();
  allDropped_ += batch.records.size();
  logOnce(why + "; what it refuses is dropped");
}

void OtlpSender::logOnce(const std::string& problem) {
  if (exchangeProblem(problem) == problem) return;
  errorLog(log_, "sending to %@: %@", url_, problem);
}

std::string OtlpSender::exchangeProblem(std::string problem) {
  const MutexLock lock(problemMutex_);
  return std::exchange(loggedProblem_, std::move(problem));
}

std::string OtlpSender::problem() const {
  const MutexLock lock(problemMutex_);
  return loggedProblem_;
}

void OtlpSender::skipRetryDelay() {
  if (!waitIsAsked_) notBefore_.reset();
}

void OtlpSender::logLosses() {
  allDropped_ += outbox_.takeDropped();
  const std::size_t lost = outbox_.count();
  if (lost > 0) errorLog(log_, "records lost that could not be sent to %@: %zu", url_, lost);
  if (allDropped_ > 0) errorLog(log_, "records for %@ dropped in all: %lu", url_, allDropped_);
}

}  // namespace tonewerk
