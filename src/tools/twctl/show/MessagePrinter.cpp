// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/MessagePrinter.h"

#include <ostream>
#include <string>

#include "protocol/EventTexts.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/Tool.h"
#include "tools/twctl/show/LocalTime.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

std::string categoryNameOf(const ValueMap& message) {
  return TWReportingUtilityCategoryString(
      static_cast<AudioEventCategory>(message.integer(kWatchKeyCategory)));
}

std::string typeNameOf(const ValueMap& message) {
  return TWReportingUtilityTypeString(static_cast<AudioEventType>(message.integer(kWatchKeyType)));
}

std::string serviceNameOf(const ValueMap& message) {
  return TWReportingUtilityGenerateServiceNameFromServiceType(
      static_cast<AudioServiceType>(message.integer(kWatchKeyServiceType)));
}

std::string lineOf(const ValueMap& message) {
  std::string line = localTime(message.number(kWatchKeyTime));
  line += "  " + message.text(kWatchKeyReporterID);
  line += "  " + serviceNameOf(message);
  line += "  " + categoryNameOf(message) + "/" + typeNameOf(message);
  if (message.boolean(kWatchKeyRedundant)) line += "  (redundant)";
  return line + "  " + message.text(kWatchKeyPayload);
}

ValueMap objectOf(const ValueMap& message) {
  ValueMap object = message;
  object.erase(kWatchKeyPayload);
  object.set(kWatchKeyServiceName, serviceNameOf(message));
  object.set("categoryName", categoryNameOf(message));
  object.set("typeName", typeNameOf(message));
  if (const Value* payload = message.find(kWatchKeyPayload)) object.set(kWatchKeyPayload, *payload);
  return object;
}

}  // namespace

void MessagePrinter::print(const ValueMap& message) const {
  tool_.out << printable(tool_.asJson ? objectOf(message).text() : lineOf(message)) << '\n';
}

void MessagePrinter::printMissed(std::uint64_t count) const {
  if (tool_.asJson) {
    tool_.out << ValueMap{{kWatchKeyMissed, count}}.text() << '\n';
  } else {
    tool_.out << "... missed " << count << (count == 1 ? " message\n" : " messages\n");
  }
}

}  // namespace tonewerk
