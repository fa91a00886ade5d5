// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/DeviceFacts.h"
#include "platform/NotificationHandlers.h"
#include "platform/NotificationService.h"
#include "platform/PreferenceStore.h"
#include "platform/ProcessInformation.h"
#include "platform/SystemInformation.h"
#include "platform/chanmeter/ChanmeterRecord.h"
#include "platform/chanmeter/RecordChanmeter.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;
class JsonService;

// The device of a recording: what the recording says of it, or else the same values on every machine. What a
// class here does not say more about, is used on the replay's one thread.

// Processes with the names that the recording gives them.
class OfflineProcesses final : public ProcessInformation {
 public:
  static constexpr std::int32_t kOwnProcess = 1;

  // Makes a process and returns its identifier.
  std::int32_t add(std::string name);

  std::optional<std::string> processName(std::int32_t processIdentifier) const override;
  std::int32_t ownProcessIdentifier() const override { return kOwnProcess; }
  [[nodiscard]] std::variant<std::uint64_t, std::string> physicalFootprint() const override;
  std::int64_t processorTimeMicroseconds() const override { return 0; }

 private:
  std::vector<std::string> names_;
};

class OfflineSystem final : public SystemInformation {
 public:
  // `clock` outlives it. `uptime`: the seconds that the device has run when the recording begins.
  OfflineSystem(const Clock& clock, double uptime) : clock_(clock), uptime_(uptime) {}

  int thermalLevel() const override { return thermalLevel_; }
  bool isLowPowerModeEnabled() const override { return isLowPower_; }
  std::array<double, 3> loadAverages() const override { return loads_; }
  double uptimeSeconds() const override;

  // Takes over what the recording says of the device.
  void change(const ValueMap& device);

 private:
  const Clock& clock_;
  const double uptime_;
  int thermalLevel_ = 0;
  bool isLowPower_ = false;
  std::array<double, 3> loads_{};
};

class OfflineFacts final : public DeviceFacts {
 public:
  explicit OfflineFacts(ValueMap facts) : facts_(std::move(facts)) {}
  std::optional<bool> boolean(std::string_view property) const override;

 private:
  const ValueMap facts_;
};

// The recording's preferences; what the daemon writes lasts as long as the replay. The bounds of the store
// are those of no daemon: a replay keeps everything. Any thread, because the store reads its own.
class OfflinePreferences final : public PreferenceStore {
 public:
  OfflinePreferences();

  std::optional<Value> read(std::string_view domain, std::string_view key) const override;
  ValueMap readAll(std::string_view domain) const override;
  [[nodiscard]] std::error_code write(std::string_view domain, std::string_view key, const Value& value,
                                      std::string* problem = nullptr) override;
  [[nodiscard]] std::error_code remove(std::string_view domain, std::string_view key,
                                       std::string* problem = nullptr) override;

  void change(const ValueMap& device);

 private:
  mutable Mutex mutex_;
  std::map<std::string, ValueMap, std::less<>> domains_ GUARDED_BY(mutex_);
};

class OfflineNotifications final : public NotificationService {
 public:
  [[nodiscard]] Registration registerHandler(std::string_view name, SerialQueue& queue,
                                             std::function<void(Token)> handler) override;
  [[nodiscard]] std::optional<std::uint64_t> state(Token token) const override;
  void cancel(Token token) override { handlers_.remove(token); }
  [[nodiscard]] std::error_code post(std::string_view name) override;

  // Posts what the recording says.
  void change(const ValueMap& device);

 private:
  NotificationHandlers handlers_;
  std::map<std::string, std::uint64_t, std::less<>> states_;
};

// The channels that the recording's drivers publish.
class OfflineChanmeter final : public RecordChanmeter {
 public:
  explicit OfflineChanmeter(const JsonService& json) : json_(json) {}

  [[nodiscard]] Channels copyChannelsInGroup(const std::optional<std::string>& group,
                                             const std::optional<std::string>& subGroup,
                                             std::optional<ChanmeterError>& error) override;
  [[nodiscard]] Subscription createSubscription(const Channels& channels, Channels& subscribed,
                                                std::optional<ChanmeterError>& error) override;
  [[nodiscard]] Samples createSamples(const Subscription& subscription, const Channels& subscribed,
                                      std::optional<ChanmeterError>& error) override;

  // Returns what is wrong with the channels of the recording, or an empty text.
  [[nodiscard]] std::string change(const ValueMap& device);

 private:
  const JsonService& json_;
  ChanmeterRecords records_;
};

}  // namespace tonewerk
