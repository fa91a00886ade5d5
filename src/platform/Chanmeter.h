// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// The driver-statistics library gives access to channels that drivers publish. A channel is identified by
// driver, group, subgroup and name; its value is one number, a histogram or a set of states.
//
// Any thread. Threads may share everything that it returns.

// A channel's own statement of its format. This side does not know formats above kSimpleArray.
using ChanmeterFormat = std::uint8_t;
inline constexpr ChanmeterFormat kChanmeterFormatInvalid = 0;
inline constexpr ChanmeterFormat kChanmeterFormatSimple = 1;
inline constexpr ChanmeterFormat kChanmeterFormatState = 2;
inline constexpr ChanmeterFormat kChanmeterFormatHistogram = 3;
inline constexpr ChanmeterFormat kChanmeterFormatSimpleArray = 4;

// What went wrong. A function with an error parameter sets it on an error and otherwise leaves it unchanged.
struct ChanmeterError {
  std::int64_t code = 0;
};

// A set of channels. Only the library makes it.
class ChanmeterChannels {
 public:
  virtual ~ChanmeterChannels() = default;
};

// A subscription to channels. Only the library makes it.
class ChanmeterSubscription {
 public:
  virtual ~ChanmeterSubscription() = default;
};

// Lets several sets of samples share one look at the sources. Only the library makes it.
class ChanmeterReading {
 public:
  virtual ~ChanmeterReading() = default;
};

// Gives one channel's value in a set of samples. The driver chooses units; the label names them. An accessor
// that does not fit the sample's format, or gets an index out of range, returns 0 or an empty text. Texts
// live as long as the sample.
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
  // Returns 0, or an error number; the bounds are then unchanged.
  [[nodiscard]] virtual int histogramBucketBounds(std::int32_t index, std::int64_t& lower,
                                                  std::int64_t& upper) const = 0;
  virtual std::int64_t histogramBucketHits(std::int32_t index) const = 0;
  virtual std::int64_t histogramMinValue() const = 0;
  virtual std::int64_t histogramMaxValue() const = 0;
};

// The values of all subscribed channels at one time, or the changes between two times. Only the library makes
// them.
class ChanmeterSamples {
 public:
  virtual ~ChanmeterSamples() = default;

  // The bytes that these samples hold of their own, without those that they share with other samples.
  virtual std::uint64_t ownBytes() const = 0;
};

class Chanmeter {
 public:
  using Channels = std::shared_ptr<const ChanmeterChannels>;
  using Subscription = std::shared_ptr<const ChanmeterSubscription>;
  using Samples = std::shared_ptr<const ChanmeterSamples>;
  using Reading = std::shared_ptr<ChanmeterReading>;
  // Returns 0 to continue; any other result ends the iteration.
  using Callback = std::function<int(const ChanmeterSample&)>;

  virtual ~Chanmeter() = default;

  // Returns the channels of that group and subgroup; none stands for all. Returns null or an empty set where
  // no channel matches. An error may come together with a set: some channels could then not be read.
  [[nodiscard]] virtual Channels copyChannelsInGroup(const std::optional<std::string>& group,
                                                     const std::optional<std::string>& subGroup,
                                                     std::optional<ChanmeterError>& error) = 0;

  virtual std::int32_t channelCount(const ChanmeterChannels& channels) = 0;

  // Sets `subscribed` to the channels that can be sampled, which may be fewer than `channels`. Returns null
  // on failure.
  [[nodiscard]] virtual Subscription createSubscription(const Channels& channels, Channels& subscribed,
                                                        std::optional<ChanmeterError>& error) = 0;

  // Returns the current values, or null on failure.
  [[nodiscard]] virtual Samples createSamples(const Subscription& subscription, const Channels& subscribed,
                                              std::optional<ChanmeterError>& error) = 0;

  // Begins a reading, for samples of several subscriptions, taken one after the other. Returns null if
  // there is nothing to share.
  [[nodiscard]] virtual Reading beginReading() { return nullptr; }

  // Does the same as createSamples(), but samples of the same reading may share what was read of a source. No
  // value is older than the reading's begin.
  [[nodiscard]] virtual Samples createSamplesIn(const Reading& /*reading*/, const Subscription& subscription,
                                                const Channels& subscribed,
                                                std::optional<ChanmeterError>& error) {
    return createSamples(subscription, subscribed, error);
  }

  // Returns what changed from `earlier` to `later`, channel by channel:
  // - Values, hits, transitions and residencies are subtracted. Hits, transitions and residencies that went
  //   back count from zero, because the driver restarted.
  // - Buckets match by their bounds, states by their names.
  // - Duty cycles are recomputed from the residencies; they are 0 when the residencies sum to 0.
  // - Minimum, maximum and unit are those of `later`.
  // - A channel that is in only one of the two gives nothing.
  // Returns null with kErrorNoEarlierSamples when `earlier` is null.
  static constexpr std::int64_t kErrorNoEarlierSamples = 1;
  [[nodiscard]] virtual Samples createSamplesDelta(const Samples& earlier, const Samples& later,
                                                   std::optional<ChanmeterError>& error) = 0;

  // Calls `callback` once for each channel, in the order of the samples.
  virtual void iterate(const ChanmeterSamples& samples, const Callback& callback) = 0;
};

}  // namespace tonewerk
