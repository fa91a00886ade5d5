// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// The driver-statistics library: channels that drivers publish, each known by driver, group, subgroup and
// name, with a value that is one number, a histogram or a set of states.
//
// Any thread; what it returns is immutable, so that it may be shared between threads.

// As channels say it themselves; a number above kSimpleArray is a format that this side does not know.
using ChanmeterFormat = std::uint8_t;
inline constexpr ChanmeterFormat kChanmeterFormatInvalid = 0;
inline constexpr ChanmeterFormat kChanmeterFormatSimple = 1;
inline constexpr ChanmeterFormat kChanmeterFormatState = 2;
inline constexpr ChanmeterFormat kChanmeterFormatHistogram = 3;
inline constexpr ChanmeterFormat kChanmeterFormatSimpleArray = 4;

// What went wrong. Where a function takes one to fill, it sets it or leaves it alone.
struct ChanmeterError {
  std::int64_t code = 0;
};

// Which channels there are; made by the library alone.
class ChanmeterChannels {
 public:
  virtual ~ChanmeterChannels() = default;
};

// What was subscribed; made by the library alone.
class ChanmeterSubscription {
 public:
  virtual ~ChanmeterSubscription() = default;
};

// One channel's value in a set of samples. Units are the driver's; the label says which. Where a question
// does not fit the sample's format, or an index is out of range, the answer is 0 or empty. Texts live as long
// as the sample does.
class ChanmeterSample {
 public:
  virtual ~ChanmeterSample() = default;

  virtual ChanmeterFormat format() const = 0;
  virtual std::optional<std::string_view> group() const = 0;
  virtual std::optional<std::string_view> subGroup() const = 0;
  virtual std::optional<std::string_view> driverName() const = 0;
  virtual std::optional<std::string_view> channelName() const = 0;
  virtual std::optional<std::string_view> unitLabel() const = 0;

  virtual std::int64_t simpleIntegerValue() const = 0;

  virtual std::int32_t stateCount() const = 0;
  virtual std::string_view stateName(std::int32_t index) const = 0;
  virtual std::uint64_t stateInTransitions(std::int32_t index) const = 0;
  virtual std::uint64_t stateResidency(std::int32_t index) const = 0;
  virtual double stateDutyCycle(std::int32_t index) const = 0;

  virtual std::int32_t histogramBucketCount() const = 0;
  // 0, or an error number; the bounds are then left as they were.
  [[nodiscard]] virtual int histogramBucketBounds(std::int32_t index, std::int64_t& lower,
                                                  std::int64_t& upper) const = 0;
  virtual std::int64_t histogramBucketHits(std::int32_t index) const = 0;
  virtual std::int64_t histogramMinValue() const = 0;
  virtual std::int64_t histogramMaxValue() const = 0;
};

// The values of all subscribed channels at one time, or the changes between two times; made by the library
// alone.
class ChanmeterSamples {
 public:
  virtual ~ChanmeterSamples() = default;
};

class Chanmeter {
 public:
  using Channels = std::shared_ptr<const ChanmeterChannels>;
  using Subscription = std::shared_ptr<const ChanmeterSubscription>;
  using Samples = std::shared_ptr<const ChanmeterSamples>;
  // 0 to go on; anything else ends the iteration.
  using Callback = std::function<int(const ChanmeterSample&)>;

  virtual ~Chanmeter() = default;

  // The channels of that group and subgroup, each of them none for all. Null or, where no channel matches, an
  // empty set. An error may come with a set: some channels then could not be read.
  [[nodiscard]] virtual Channels copyChannelsInGroup(const std::optional<std::string>& group,
                                                     const std::optional<std::string>& subGroup,
                                                     std::optional<ChanmeterError>& error) = 0;

  virtual std::int32_t channelCount(const ChanmeterChannels& channels) = 0;

  // `subscribed` gets the channels that can be sampled, which may be fewer. Null on failure.
  [[nodiscard]] virtual Subscription createSubscription(const Channels& channels, Channels& subscribed,
                                                        std::optional<ChanmeterError>& error) = 0;

  // The current values. Null on failure.
  [[nodiscard]] virtual Samples createSamples(const Subscription& subscription, const Channels& subscribed,
                                              std::optional<ChanmeterError>& error) = 0;

  // What changed from `earlier` to `later`, channel by channel:
  //   values, hits, transitions and residencies subtract; the latter three count from zero where they went
  //   back, which means that the driver began anew; buckets match by bounds, states by name; duty cycles are
  //   recomputed from the residencies, 0 when these sum to 0; minimum, maximum and unit are the later ones; a
  //   channel that is in one of the two only gives nothing.
  // Null with kErrorNothingEarlier when `earlier` is null.
  static constexpr std::int64_t kErrorNothingEarlier = 1;
  [[nodiscard]] virtual Samples createSamplesDelta(const Samples& earlier, const Samples& later,
                                                   std::optional<ChanmeterError>& error) = 0;

  // Once for each channel, in the order of the samples.
  virtual void iterate(const ChanmeterSamples& samples, const Callback& callback) = 0;
};

}  // namespace tonewerk
