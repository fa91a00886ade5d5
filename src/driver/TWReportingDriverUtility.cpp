// SPDX-License-Identifier: Apache-2.0
#include "driver/TWReportingDriverUtility.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <concepts>
#include <cstdint>
#include <system_error>
#include <utility>

#include "platform/JournalPosition.h"
#include "platform/Log.h"
#include "protocol/AudioEvent.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

struct DriverNames {
  const char* group;     // null for every group
  const char* subGroup;  // null for every subgroup
};

// In the order in which they are subscribed to and sampled.
constexpr std::array<DriverNames, 9> kDrivers{{{"OrvaneAE2MCA", nullptr},
                                               {"Speaker", nullptr},
                                               {nullptr, "MCA"},
                                               {"Haptics", "Stats"},
                                               {"StateTransitionTimes_ms", nullptr},
                                               {"Rx", nullptr},
                                               {"Tx", nullptr},
                                               {nullptr, "Pellan2"},
                                               {"pdm", nullptr}}};

// Enough for most keys and values, so that they grow without allocations.
constexpr std::size_t kTextBytes = 256;

std::optional<std::string> optionalName(const char* name) {
  return name == nullptr ? std::nullopt : std::optional<std::string>(name);
}

// Used for samples and for deltas: people look for this line when either of them fails.
void logSamplesError(const std::optional<ChanmeterError>& error) {
  if (!error) return;
  errorLog(TWReportingDriverUtilityCategory(), "ChanmeterCreateSamples error %li", error->code);
}

void appendCleaned(std::string& key, std::string_view name) {
  while (!name.empty()) {
    const std::size_t size = std::min(name.find_first_of("_ "), name.size());
    key += name.substr(0, size);
    name.remove_prefix(std::min(size + 1, name.size()));
  }
}

// Appends the number as std::to_string() writes it, without an allocation.
void appendInteger(std::string& text, std::integral auto number) {
  std::array<char, 24> digits;  // 64 bits and a sign are 20 characters
  text.append(digits.data(), std::to_chars(digits.data(), digits.data() + digits.size(), number).ptr);
}

// Appends a number as "%f" writes it, in a third of the time. A duty cycle is from 0 to 1.
void appendDutyCycle(std::string& text, double dutyCycle) {
  std::array<char, 32> digits;
  const auto [end, error] =
      std::to_chars(digits.data(), digits.data() + digits.size(), dutyCycle, std::chars_format::fixed, 6);
  if (error != std::errc()) return appendLogNumber(text, dutyCycle, 'f');
  text.append(digits.data(), end);
}

void appendBucket(std::string& text, std::int64_t lower, std::int64_t upper, std::int64_t hits) {
  appendInteger(text, lower);
  text += '-';
  appendInteger(text, upper);
  text += ':';
  appendInteger(text, hits);
  text += ';';
}

void appendState(std::string& text, const ChanmeterSample& sample, std::int32_t index) {
  text += "name:";
  text += sample.stateName(index);
  text += ",transition:";
  appendInteger(text, sample.stateInTransitions(index));
  text += ",residency:";
  appendInteger(text, sample.stateResidency(index));
  text += ",duty_cycle:";
  appendDutyCycle(text, sample.stateDutyCycle(index));
  text += ';';
}

void sendStats(TWReportingSession* session, AudioEventType type, ValueMap stats) {
  if (session == nullptr || stats.empty()) return;
  JournalPosition ofNoRequest;  // a played session has no such message
  const JournalPosition::Scope scope(ofNoRequest);
  session->sendMessage(
      std::make_shared<TWReportingSessionMessage>(std::move(stats), kCategoryChanmetering, type));
}

}  // namespace

// One map for each format.
struct TWReportingDriverUtility::Stats {
  DriverStatsMap simple;
  DriverStatsMap histograms;
  DriverStatsMap states;
};

TWReportingDriverUtility::TWReportingDriverUtility()
    : chanmeter_(TWReportingContext::current().platform().chanmeter) {
  infoLog(TWReportingDriverUtilityCategory(), "creating chanmetering driver utility");
  for (const DriverNames& names : kDrivers) {
    subscribe(
        TWReportingDriver::driverWithGroupName(optionalName(names.group), optionalName(names.subGroup)));
  }
}

void TWReportingDriverUtility::subscribe(const TWReportingDriver& driver) {
  std::optional<ChanmeterError> error;
  const Chanmeter::Channels channels =
      chanmeter_.copyChannelsInGroup(driver.groupName(), driver.subGroupName(), error);
  if (error) {
    errorLog(TWReportingDriverUtilityCategory(), "error %li getting channels for driver %@-%@", error->code,
             driver.groupName(), driver.subGroupName());
  }
  if (channels == nullptr) return;
  if (chanmeter_.channelCount(*channels) < 1) {
    infoLog(TWReportingDriverUtilityCategory(), "couldn't find any channels for driver group %@-%@",
            driver.groupName(), driver.subGroupName());
    return;
  }

  TWReportingIOChannelSubscription created(driver);
  error.reset();
  created.subscription = chanmeter_.createSubscription(channels, created.subscribedChannels, error);
  if (created.subscription != nullptr && created.subscribedChannels != nullptr) {
    ioChannelSubscriptions_.push_back(std::move(created));
    infoLog(TWReportingDriverUtilityCategory(), "subscribed to group group %@-%@", driver.groupName(),
            driver.subGroupName());
  } else if (error) {
    errorLog(TWReportingDriverUtilityCategory(), "error %li creating subscription for %@-%@", error->code,
             driver.groupName(), driver.subGroupName());
  }
}

TWReportingDriverUtility::Snapshot TWReportingDriverUtility::getSnapShot() const {
  Snapshot snapshot;
  const Chanmeter::Reading reading = chanmeter_.beginReading();
  for (const TWReportingIOChannelSubscription& source : ioChannelSubscriptions_) {
    infoLog(TWReportingDriverUtilityCategory(), "sampling driver %@", source.driver);
    std::optional<ChanmeterError> error;
    Chanmeter::Samples samples =
        chanmeter_.createSamplesIn(reading, source.subscription, source.subscribedChannels, error);
    if (samples == nullptr) {
      logSamplesError(error);
      continue;
    }
    snapshot[source.driver.description()] = std::move(samples);
  }
  return snapshot;
}

std::uint64_t TWReportingDriverUtility::ownBytesOf(const Snapshot& snapshot) {
  std::uint64_t bytes = 0;
  for (const auto& [driver, samples] : snapshot) {
    bytes += sizeof(Snapshot::value_type) + driver.size() + samples->ownBytes();
  }
  return bytes;
}

void TWReportingDriverUtility::sendDriverLogsForSession(TWReportingSession* session,
                                                        const Snapshot* driverSnapShot) const {
  Stats stats;
  const Chanmeter::Reading reading = chanmeter_.beginReading();
  for (const TWReportingIOChannelSubscription& source : ioChannelSubscriptions_) {
    collectChanges(source, reading, driverSnapShot, stats);
  }
  sendStats(session, kTypeSimple, std::move(stats.simple));
  sendStats(session, kTypeHistogram, std::move(stats.histograms));
  sendStats(session, kTypeState, std::move(stats.states));
}

// Releases the samples that it takes when it returns, so that it never holds those of two drivers.
void TWReportingDriverUtility::collectChanges(const TWReportingIOChannelSubscription& source,
                                              const Chanmeter::Reading& reading,
                                              const Snapshot* driverSnapShot, Stats& stats) const {
  infoLog(TWReportingDriverUtilityCategory(), "getting latest samples");
  std::optional<ChanmeterError> error;
  const Chanmeter::Samples latest =
      chanmeter_.createSamplesIn(reading, source.subscription, source.subscribedChannels, error);
  infoLog(TWReportingDriverUtilityCategory(), "done getting latest samples");
  if (latest == nullptr) return logSamplesError(error);
  if (driverSnapShot == nullptr) return;

  const auto earlier = driverSnapShot->find(source.driver.description());
  error.reset();
  const Chanmeter::Samples delta = chanmeter_.createSamplesDelta(
      earlier == driverSnapShot->end() ? nullptr : earlier->second, latest, error);
  if (delta == nullptr) return logSamplesError(error);
  chanmeter_.iterate(*delta, [&stats](const ChanmeterSample& sample) {
    process(sample, stats);
    return 0;
  });
}

void TWReportingDriverUtility::process(const ChanmeterSample& sample, Stats& stats) {
  switch (const ChanmeterFormat format = sample.format()) {
    case kChanmeterFormatSimple:
      return processSimpleData(sample, stats.simple);
    case kChanmeterFormatState:
      return processStateData(sample, stats.states);
    case kChanmeterFormatHistogram:
      return processHistogramData(sample, stats.histograms);
    case kChanmeterFormatInvalid:
    case kChanmeterFormatSimpleArray:
      return debugLog(TWReportingDriverUtilityCategory(),
                      "Dropping sample of type : %hhu for group : %@ subgroup : %@", format, sample.group(),
                      sample.subGroup());
    default:
      return errorLog(TWReportingDriverUtilityCategory(),
                      "The ChanmeteringFormat %hhu is not supported group : %@ subgroup : %@", format,
                      sample.group(), sample.subGroup());
  }
}

void TWReportingDriverUtility::processSimpleData(const ChanmeterSample& sample, DriverStatsMap& driverStats) {
  const std::int64_t value = sample.simpleIntegerValue();
  if (value < 1) return;
  driverStats.set(getDriverStatsKey(sample, "Simple"), value);
}

void TWReportingDriverUtility::processHistogramData(const ChanmeterSample& sample,
                                                    DriverStatsMap& driverStats) {
  const std::int32_t count = sample.histogramBucketCount();
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  // A bucket whose bounds cannot be read gets the bounds of the bucket before it.
  std::int64_t bucketLower = 0;
  std::int64_t bucketUpper = 0;
  std::string buckets;
  buckets.reserve(kTextBytes);
  for (std::int32_t i = 0; i < count; ++i) {
    const int error = sample.histogramBucketBounds(i, bucketLower, bucketUpper);
    if (error != 0) {
      infoLog(TWReportingDriverUtilityCategory(), "Error in getting the bucket bounds : %d", error);
    }
    lower = std::min(lower, bucketLower);
    upper = std::max(upper, bucketUpper);
    const std::int64_t hits = sample.histogramBucketHits(i);
    if (hits != 0) appendBucket(buckets, bucketLower, bucketUpper, hits);
  }
  if (buckets.empty()) return;
  buckets.pop_back();  // the last ";"

  std::string text;
  text.reserve(kTextBytes);
  text += "count=";
  appendInteger(text, count);
  text += ",lower=";
  appendInteger(text, lower);
  text += ",upper=";
  appendInteger(text, upper);
  text += ",min=";
  appendInteger(text, sample.histogramMinValue());
  text += ",max=";
  appendInteger(text, sample.histogramMaxValue());
  text += ",unit=";
  text += sample.unitLabel().value_or("(null)");
  text += "::";
  text += buckets;
  driverStats.set(getDriverStatsKey(sample, "Histogram"), text);
}

void TWReportingDriverUtility::processStateData(const ChanmeterSample& sample, DriverStatsMap& driverStats) {
  std::string text;
  text.reserve(kTextBytes);
  const std::int32_t count = sample.stateCount();
  for (std::int32_t i = 0; i < count; ++i) {
    if (sample.stateResidency(i) != 0) appendState(text, sample, i);
  }
  debugLog(TWReportingDriverUtilityCategory(), "the current reported data is : %@", text);
  driverStats.set(getDriverStatsKey(sample, "State"), text);
}

std::string TWReportingDriverUtility::getDriverStatsKey(const ChanmeterSample& sample,
                                                        std::string_view type) {
  std::string key;
  key.reserve(kTextBytes);
  if (const auto driver = sample.driverName()) {
    appendCleaned(key, driver->substr(0, driver->find('<')));
    key += '_';
  }
  if (const auto group = sample.group()) {
    appendCleaned(key, *group);
    key += '_';
  }
  if (const auto subGroup = sample.subGroup()) {
    appendCleaned(key, *subGroup);
    key += '_';
  }
  key += type;
  key += '_';
  if (const auto channel = sample.channelName()) appendCleaned(key, *channel);
  return key;
}

}  // namespace tonewerk
