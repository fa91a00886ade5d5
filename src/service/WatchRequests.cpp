// SPDX-License-Identifier: Apache-2.0
#include "service/WatchRequests.h"

#include <algorithm>
#include <optional>
#include <string>
#include <utility>

#include "platform/DaemonStatus.h"
#include "platform/Log.h"
#include "platform/Platform.h"
#include "platform/SerialQueue.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/TurnQueue.h"
#include "protocol/WatchKeys.h"
#include "service/AccountListing.h"
#include "service/DaemonListing.h"
#include "service/MessageTap.h"
#include "service/SessionListing.h"
#include "service/SinkListing.h"
#include "service/TWReportingServiceDelegateProtocol.h"
#include "service/TapSubscriber.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

MessageFilter::Numbers numbersOf(const Argument& list) {
  MessageFilter::Numbers numbers;
  if (!list) return numbers;
  for (const Value& number : *list->asArray()) numbers.push_back(number.integer());
  std::sort(numbers.begin(), numbers.end());
  return numbers;
}

std::size_t startIndexOf(const Argument& number) {
  return static_cast<std::size_t>(std::max<std::int64_t>(number->integer(), 0));
}

ReplyError tooManyEntries(std::size_t count) {
  return messagingError(kOverLimit, "the filter has " + std::to_string(count) + " entries, the most is " +
                                        std::to_string(MessageFilter::kMaxEntries));
}

}  // namespace

WatchRequests::WatchRequests(std::int32_t processIdentifier, std::shared_ptr<Account> account,
                             std::weak_ptr<TWReportingServiceDelegateProtocol> service)
    : processIdentifier_(processIdentifier),
      account_(std::move(account)),
      service_(std::move(service)),
      subscriber_(std::make_shared<TapSubscriber>()) {}

template <class Body>
void WatchRequests::onWorkQueue(Body body, Reply reply, InFlightToken token) {
  if (TWReportingUtilityGetReportingServerQueue().isCurrent()) {
    if (const auto service = service_.lock()) body(*service, reply, token);
    return;
  }
  TWReportingContext::current().turns().add(
      account_, [service = service_, body = std::move(body), reply = std::move(reply),
                 token = std::move(token)]() mutable {
        if (const auto living = service.lock()) body(*living, reply, token);
        return TurnQueue::Progress::kDone;
      });
}

void WatchRequests::sessions(const Arguments& arguments, Reply reply, InFlightToken token) {
  onWorkQueue(
      [first = startIndexOf(arguments[0])](auto& service, const Reply& answer, InFlightToken&) {
        answer(std::nullopt, sessionListing(service, first));
      },
      std::move(reply), std::move(token));
}

void WatchRequests::openMessages(const Arguments& arguments, Reply reply, InFlightToken token) {
  MessageFilter filter{numbersOf(arguments[0]), numbersOf(arguments[1]), numbersOf(arguments[2])};
  if (filter.size() > MessageFilter::kMaxEntries) return reply(tooManyEntries(filter.size()));
  onWorkQueue(
      [subscriber = subscriber_, filter = std::move(filter), client = processIdentifier_](
          auto& service, const Reply& answer, InFlightToken&) mutable {
        infoLog(TWReportingServiceDelegateCategory(), "client %i watches messages", client);
        subscriber->open(std::move(filter));
        service.messageTap().add(subscriber);
        answer(std::nullopt, true);
      },
      std::move(reply), std::move(token));
}

void WatchRequests::nextMessages(Reply reply, InFlightToken token) {
  onWorkQueue(
      [subscriber = subscriber_](auto&, const Reply& answer, InFlightToken& held) {
        if (subscriber->isOpen()) return subscriber->next(answer, std::move(held));
        answer(messagingError(kInvalidArguments, "watch.nextMessages: watch.openMessages comes first"));
      },
      std::move(reply), std::move(token));
}

void WatchRequests::accounts(const Reply& reply) const {
  TWReportingContext& context = TWReportingContext::current();
  ValueMap listing = accountListing(context.platform().accounts, *account_);
  const DaemonStatus* status = context.platform().status;
  if (status != nullptr) listing.set(kWatchKeyDaemon, daemonListing(*status, context.isInternalBuild()));
  // How much waits, where it goes and what is logged says what other users do.
  if (account_->isTrusted()) {
    listing.set(kWatchKeySinks, sinkListing(context.sinks()));
    if (status != nullptr) {
      listing.set(kWatchKeyEndpoints, endpointListing(*status));
      listing.set(kWatchKeyTroubles, troubleListing(*status));
    }
  }
  reply(std::nullopt, listing);
}

}  // namespace tonewerk
