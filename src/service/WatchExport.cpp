// SPDX-License-Identifier: Apache-2.0
#include "service/WatchExport.h"

#include <algorithm>
#include <optional>
#include <string>
#include <utility>

#include "platform/LogLine.h"
#include "platform/SerialQueue.h"
#include "service/MessageTap.h"
#include "service/SessionListing.h"
#include "service/TWReportingServiceDelegateProtocol.h"
#include "service/TapSubscriber.h"
#include "session/TWReportingUtility.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

// In the order of the table below.
enum WatchMethod : std::size_t { kSessions, kOpenMessages, kNextMessages };

MessageFilter::Numbers numbersOf(const Argument& list) {
  MessageFilter::Numbers numbers;
  if (!list) return numbers;
  for (const Value& number : *list->asArray()) numbers.push_back(number.integer());
  std::sort(numbers.begin(), numbers.end());
  return numbers;
}

std::size_t placeOf(const Argument& number) {
  return static_cast<std::size_t>(std::max<std::int64_t>(number->integer(), 0));
}

ReplyError tooManyEntries(std::size_t count) {
  return messagingError(kOverLimit, "the filter has " + std::to_string(count) + " entries, the most is " +
                                        std::to_string(MessageFilter::kMaxEntries));
}

}  // namespace

WatchExport::WatchExport(std::int32_t processIdentifier,
                         std::weak_ptr<TWReportingServiceDelegateProtocol> service)
    : processIdentifier_(processIdentifier),
      service_(std::move(service)),
      watcher_(std::make_shared<TapSubscriber>()) {}

WatchExport::~WatchExport() = default;

const std::vector<Method>& WatchExport::methods() {
  static const std::vector<Method> methods{
      {"watch.sessions",
       {{"first", ParameterType::kInt64}},
       {ResultType::kAny, "sessions"},
       kMaxSessionListingBytes,
       true},
      {"watch.openMessages",
       {{"reporterIDs", ParameterType::kInt64ListOrNone},
        {"categories", ParameterType::kInt64ListOrNone},
        {"types", ParameterType::kInt64ListOrNone}},
       {ResultType::kAny, "answer"},
       0,
       true},
      {"watch.nextMessages", {}, {ResultType::kAny, "messages"}, TapSubscriber::kMaxAnswerBytes, true},
  };
  return methods;
}

void WatchExport::handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) {
  // What runs later holds the watcher, not this object, which goes with the connection.
  const auto onWorkQueue = [&](auto body) {
    TWReportingUtilityGetReportingServerQueue().async(
        [service = service_, body = std::move(body), reply, token = std::move(token)]() mutable {
          if (const auto living = service.lock()) body(*living, reply, token);
        });
  };
  switch (method) {
    case kSessions:
      return onWorkQueue([first = placeOf(arguments[0])](auto& service, const Reply& answer, InFlightToken&) {
        answer(std::nullopt, sessionListing(service, first));
      });
    case kOpenMessages: {
      MessageFilter filter{numbersOf(arguments[0]), numbersOf(arguments[1]), numbersOf(arguments[2])};
      if (filter.size() > MessageFilter::kMaxEntries) return reply(tooManyEntries(filter.size()));
      return onWorkQueue([watcher = watcher_, filter = std::move(filter), client = processIdentifier_](
                             auto& service, const Reply& answer, InFlightToken&) mutable {
        infoLog(TWReportingServiceDelegateCategory(), "client %i watches messages", client);
        watcher->open(std::move(filter));
        service.messageTap().add(watcher);
        answer(std::nullopt, true);
      });
    }
    case kNextMessages:
      return onWorkQueue([watcher = watcher_](auto&, const Reply& answer, InFlightToken& held) {
        if (watcher->isOpen()) return watcher->next(answer, std::move(held));
        answer(messagingError(kInvalidArguments, "watch.nextMessages: watch.openMessages comes first"));
      });
    default:
      return;
  }
}

}  // namespace tonewerk
