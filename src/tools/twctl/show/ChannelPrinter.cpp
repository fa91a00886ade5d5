// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/ChannelPrinter.h"

#include <ostream>
#include <utility>

#include "tools/twctl/Pattern.h"
#include "tools/twctl/Tool.h"
#include "tools/twctl/show/ChannelText.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/Table.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

// Moves the cursor to the top left corner and clears the screen.
constexpr char kClearTerminal[] = "\x1b[H\x1b[2J";

bool fitsText(const std::optional<std::string>& pattern, const std::optional<std::string_view>& text) {
  return fitsPattern(pattern, std::string(text.value_or("")));
}

Table::Cell shown(const std::optional<std::string_view>& text) { return Value(text.value_or("")); }

}  // namespace

bool ChannelFilter::fits(const ChanmeterSample& sample) const {
  return fitsText(driver, sample.driverName()) && fitsText(group, sample.group());
}

bool ChannelPrinter::printValues() {
  std::optional<ChanmeterError> error;
  const Chanmeter::Samples samples = takeSamples(error);
  if (samples) print(*samples, std::nullopt);
  return !error;
}

void ChannelPrinter::printChanges(double at) {
  std::optional<ChanmeterError> error;
  Chanmeter::Samples now = takeSamples(error);
  if (!now) return;
  const Chanmeter::Samples earlier = std::exchange(earlier_, now);
  const Chanmeter::Samples changes = earlier ? chanmeter_.createSamplesDelta(earlier, now, error) : nullptr;
  if (!changes) return;
  if (!tool_.asJson) {
    if (tool_.outIsTerminal) tool_.out << kClearTerminal;
    tool_.out << localTime(at) << '\n';
  }
  const std::size_t count = print(*changes, at);
  if (!tool_.asJson) tool_.out << (count == 0 ? "nothing changed\n\n" : "\n");
  tool_.out.flush();
}

Chanmeter::Samples ChannelPrinter::takeSamples(std::optional<ChanmeterError>& error) {
  const Chanmeter::Channels channels = chanmeter_.copyChannelsInGroup(std::nullopt, std::nullopt, error);
  if (!channels) return nullptr;
  Chanmeter::Channels subscribed;
  const Chanmeter::Subscription subscription = chanmeter_.createSubscription(channels, subscribed, error);
  return subscription && subscribed ? chanmeter_.createSamples(subscription, subscribed, error) : nullptr;
}

std::size_t ChannelPrinter::print(const ChanmeterSamples& samples, std::optional<double> changedAt) {
  std::size_t count = 0;
  Table table(tool_, {"driver", "group", "subgroup", "name", "value", "unit"});
  table.dropWhenNarrow({"unit", "subgroup", "driver"});
  chanmeter_.iterate(samples, [&](const ChanmeterSample& sample) {
    if (!filter_.fits(sample) || (changedAt && !isChanged(sample))) return 0;
    ++count;
    if (!tool_.asJson) {
      table.add({shown(sample.driverName()), shown(sample.group()), shown(sample.subGroup()),
                 shown(sample.channelName()), Value(channelValueText(sample)), shown(sample.unitLabel())});
      return 0;
    }
    ValueMap line;
    if (changedAt) line.set("at", *changedAt);
    line.merge(channelFields(sample));
    tool_.out << printable(line.text()) << '\n';
    return 0;
  });
  return count;
}

}  // namespace tonewerk
