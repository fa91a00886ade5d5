// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineDevice.h"

#include <chrono>
#include <memory>
#include <utility>

#include "platform/Clock.h"
#include "platform/JsonService.h"
#include "platform/chanmeter/ChanmeterChannelSet.h"
#include "platform/chanmeter/ChanmeterRecordSamples.h"
#include "platform/linux/channels/ChannelFile.h"
#include "platform/linux/store/ReportStore.h"
#include "tools/recording/RecordedProperties.h"

namespace tonewerk {
namespace {

constexpr const char* kOwnName = "twreportingd";
constexpr std::uint64_t kFootprint = std::uint64_t{8} << 20;
// More than any store has, and few enough that the store can express them in bytes and seconds.
constexpr double kNoBound = 1e9;

const ValueMap* mapUnder(std::string_view key, const ValueMap& map) {
  const Value* found = map.find(key);
  return found == nullptr ? nullptr : found->asMap();
}

}  // namespace

std::int32_t OfflineProcesses::add(std::string name) {
  names_.push_back(std::move(name));
  return kOwnProcess + static_cast<std::int32_t>(names_.size());
}

std::optional<std::string> OfflineProcesses::processName(std::int32_t processIdentifier) const {
  if (processIdentifier == kOwnProcess) return kOwnName;
  const auto place = static_cast<std::size_t>(processIdentifier - kOwnProcess - 1);
  return place < names_.size() ? std::optional(names_[place]) : std::nullopt;
}

std::variant<std::uint64_t, std::string> OfflineProcesses::physicalFootprint() const { return kFootprint; }

double OfflineSystem::uptimeSeconds() const {
  return uptime_ + std::chrono::duration<double>(clock_.monotonic()).count();
}

void OfflineSystem::change(const ValueMap& device) {
  if (device.contains(recorded::kThermalLevel)) {
    thermalLevel_ = static_cast<int>(device.integer(recorded::kThermalLevel));
  }
  if (device.contains(recorded::kLowPowerMode)) isLowPower_ = device.boolean(recorded::kLowPowerMode);
  if (const Value* loads = device.find(recorded::kLoadAverages)) {
    for (std::size_t at = 0; at < loads_.size(); ++at) loads_[at] = (*loads->asArray())[at].number();
  }
}

std::optional<bool> OfflineFacts::boolean(std::string_view property) const {
  const Value* fact = facts_.find(property);
  return fact == nullptr ? std::nullopt : std::optional(fact->boolean());
}

OfflinePreferences::OfflinePreferences() = default;

std::optional<Value> OfflinePreferences::read(std::string_view domain, std::string_view key) const {
  if (domain == ReportStore::kPreferenceDomain &&
      (key == ReportStore::kMaxMegabytesKey || key == ReportStore::kMaxDaysKey)) {
    return kNoBound;
  }
  const MutexLock lock(mutex_);
  const auto values = domains_.find(domain);
  const Value* value = values == domains_.end() ? nullptr : values->second.find(key);
  return value == nullptr ? std::nullopt : std::optional(*value);
}

ValueMap OfflinePreferences::readAll(std::string_view domain) const {
  const MutexLock lock(mutex_);
  const auto values = domains_.find(domain);
  return values == domains_.end() ? ValueMap() : values->second;
}

std::error_code OfflinePreferences::write(std::string_view domain, std::string_view key, const Value& value,
                                          std::string* /*problem*/) {
  const MutexLock lock(mutex_);
  domains_[std::string(domain)].set(key, value);
  return {};
}

std::error_code OfflinePreferences::remove(std::string_view domain, std::string_view key,
                                           std::string* /*problem*/) {
  const MutexLock lock(mutex_);
  const auto values = domains_.find(domain);
  if (values == domains_.end() || !values->second.contains(key)) {
    return std::make_error_code(std::errc::no_such_file_or_directory);
  }
  values->second.erase(key);
  return {};
}

void OfflinePreferences::change(const ValueMap& device) {
  const ValueMap* domains = mapUnder(recorded::kPreferences, device);
  if (domains == nullptr) return;
  const MutexLock lock(mutex_);
  for (const ValueMap::Entry& domain : *domains) domains_[domain.key.string()].merge(*domain.value.asMap());
}

NotificationService::Registration OfflineNotifications::registerHandler(std::string_view name,
                                                                        SerialQueue& queue,
                                                                        std::function<void(Token)> handler) {
  if (!NotificationHandlers::isName(name)) return {kStatusInvalidName, kNoToken};
  return {kStatusOk, handlers_.add(name, queue, std::move(handler))};
}

std::optional<std::uint64_t> OfflineNotifications::state(Token token) const {
  const std::optional<std::string> name = handlers_.nameOf(token);
  if (!name) return std::nullopt;
  const auto state = states_.find(*name);
  return state == states_.end() ? 0 : state->second;
}

std::error_code OfflineNotifications::post(std::string_view name) {
  handlers_.tell(name);
  return {};
}

void OfflineNotifications::change(const ValueMap& device) {
  const ValueMap* states = mapUnder(recorded::kNotifications, device);
  if (states == nullptr) return;
  for (const ValueMap::Entry& state : *states) {
    states_[state.key.string()] = state.value.asUnsigned() != nullptr
                                      ? *state.value.asUnsigned()
                                      : static_cast<std::uint64_t>(state.value.integer());
    handlers_.tell(state.key.string());
  }
}

Chanmeter::Channels OfflineChanmeter::copyChannelsInGroup(const std::optional<std::string>& group,
                                                          const std::optional<std::string>& subGroup,
                                                          std::optional<ChanmeterError>& /*error*/) {
  return std::make_shared<ChanmeterChannelSet>(chanmeterRecordsIn(records_, group, subGroup));
}

Chanmeter::Subscription OfflineChanmeter::createSubscription(const Channels& channels, Channels& subscribed,
                                                             std::optional<ChanmeterError>& /*error*/) {
  subscribed = channels;
  return std::make_shared<ChanmeterSubscription>();
}

Chanmeter::Samples OfflineChanmeter::createSamples(const Subscription& /*subscription*/,
                                                   const Channels& subscribed,
                                                   std::optional<ChanmeterError>& /*error*/) {
  const auto& channels = static_cast<const ChanmeterChannelSet&>(*subscribed);
  return std::make_shared<ChanmeterRecordSamples>(channels.selectedFrom(records_));
}

std::string OfflineChanmeter::change(const ValueMap& device) {
  const Value* drivers = device.find(recorded::kChannels);
  if (drivers == nullptr) return {};
  ChanmeterRecords records;
  for (const Value& driver : *drivers->asArray()) {
    ChannelFileProblem problem;
    const auto file = ChannelFile::parse(json_.compact(*driver.asMap()), problem);
    if (!file) return "channels: " + problem.text;
    records.insert(records.end(), file->records.begin(), file->records.end());
  }
  records_ = std::move(records);
  return {};
}

}  // namespace tonewerk
