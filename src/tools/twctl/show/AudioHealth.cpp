// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/AudioHealth.h"

#include <algorithm>
#include <map>
#include <string_view>
#include <tuple>
#include <utility>

namespace tonewerk {
namespace {

constexpr double kPercent = 100.0;
constexpr double kPermille = 1000.0;

using DeviceKey = std::tuple<std::string, std::string, bool>;  // device, driver, whether it is an input
using NodeKey = std::pair<std::string, std::string>;           // node, driver

// Adds up what the samples say.
class Tally {
 public:
  void addTotals(const ChanmeterSample& sample) {
    const std::string_view group = sample.group().value_or("");
    const std::string_view name = sample.channelName().value_or("");
    if (sample.format() == kChanmeterFormatSimple && group == "Nodes") addNode(sample, name);
    DeviceHealth* device = deviceOf(sample);
    if (device != nullptr && sample.format() == kChanmeterFormatSimple && name == "Xruns")
      device->xruns = sample.simpleIntegerValue();
  }

  void addChange(const ChanmeterSample& sample) {
    if (sample.format() != kChanmeterFormatHistogram || sample.channelName() != "Processing Time") return;
    DeviceHealth* device = deviceOf(sample);
    if (device == nullptr) return;
    double sum = 0.0;
    double hits = 0.0;
    for (std::int32_t bucket = 0; bucket < sample.histogramBucketCount(); ++bucket) {
      std::int64_t lower = 0;
      std::int64_t upper = 0;
      const auto count = static_cast<double>(sample.histogramBucketHits(bucket));
      if (!(count > 0) || sample.histogramBucketBounds(bucket, lower, upper) != 0) continue;
      sum += count * (static_cast<double>(lower) + static_cast<double>(upper)) / 2.0;
      hits += count;
      device->worst = std::max(device->worst.value_or(0.0), static_cast<double>(upper) / kPercent);
    }
    if (hits > 0) device->load = sum / hits / kPercent;
  }

  AudioHealth health() {
    AudioHealth health;
    for (auto& [key, device] : devices_) health.devices.push_back(std::move(device));
    for (auto& [key, node] : nodes_) health.nodes.push_back(std::move(node));
    return health;
  }

 private:
  // Null for other channels: those of no device, or the totals of all devices.
  DeviceHealth* deviceOf(const ChanmeterSample& sample) {
    const std::string_view group = sample.group().value_or("");
    const std::string_view name = sample.channelName().value_or("");
    const bool isDevice =
        (group == "Tx" || group == "Rx") && sample.subGroup() && !sample.subGroup()->empty();
    if (!isDevice || (name != "Xruns" && name != "Processing Time")) return nullptr;
    const DeviceKey key{*sample.subGroup(), sample.driverName().value_or(""), group == "Rx"};
    if (!devices_.contains(key) && devices_.size() >= AudioHealthReader::kMaxDevices) return nullptr;
    DeviceHealth& device = devices_[key];
    device.device = *sample.subGroup();
    device.isInput = group == "Rx";
    return &device;
  }

  void addNode(const ChanmeterSample& sample, std::string_view name) {
    const NodeKey key{sample.subGroup().value_or(""), sample.driverName().value_or("")};
    if (key.first.empty() || (!nodes_.contains(key) && nodes_.size() >= AudioHealthReader::kMaxNodes)) return;
    NodeHealth& node = nodes_[key];
    node.node = key.first;
    const std::int64_t value = sample.simpleIntegerValue();
    if (name == "Busy") node.busy = static_cast<double>(value) / kPermille;
    if (name == "Worst") node.worst = static_cast<double>(value) / kPermille;
    if (name == "Glitches") node.glitches = value;
    if (name == "PID") node.process = value;
  }

  std::map<DeviceKey, DeviceHealth> devices_;
  std::map<NodeKey, NodeHealth> nodes_;
};

}  // namespace

AudioHealth AudioHealthReader::read() {
  std::optional<ChanmeterError> error;
  const Chanmeter::Channels channels = chanmeter_.copyChannelsInGroup(std::nullopt, std::nullopt, error);
  if (!channels) return {};
  Chanmeter::Channels subscribed;
  const Chanmeter::Subscription subscription = chanmeter_.createSubscription(channels, subscribed, error);
  Chanmeter::Samples now =
      subscription && subscribed ? chanmeter_.createSamples(subscription, subscribed, error) : nullptr;
  if (!now) return {};
  Tally tally;
  chanmeter_.iterate(*now, [&](const ChanmeterSample& sample) {
    tally.addTotals(sample);
    return 0;
  });
  const Chanmeter::Samples earlier = std::exchange(earlier_, now);
  const Chanmeter::Samples changes = earlier ? chanmeter_.createSamplesDelta(earlier, now, error) : nullptr;
  if (changes) {
    chanmeter_.iterate(*changes, [&](const ChanmeterSample& sample) {
      tally.addChange(sample);
      return 0;
    });
  }
  return tally.health();
}

}  // namespace tonewerk
