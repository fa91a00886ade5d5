// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/chanmeter/ChanmeterRecord.h"
#include "platform/chanmeter/RecordChanmeter.h"
#include "values/Mutex.h"

namespace tonewerk {

// Provides channels that a test sets. Any thread.
//
//   chanmeter.setRecords({{.key = {.driver = "Amp", .group = "Speaker"}, .format = 1, .value = 12}});
//   chanmeter.fail(MemoryChanmeter::Operation::kCreateSamples, {.code = 5}, {{.group = "Speaker"}});
class MemoryChanmeter final : public RecordChanmeter {
 public:
  enum class Operation {
    kCopyChannels,
    kCreateSubscription,  // createSubscription() returns neither a handle nor channels
    kSubscriptionHandle,  // createSubscription() returns only the channels
    kSubscribedChannels,  // createSubscription() returns only the handle
    kCreateSamples,
    kCreateSamplesDelta
  };
  struct Failure {
    std::optional<std::int64_t> code = {};  // none: it returns nothing and no error
    bool returnsResult = false;             // it returns a result in spite of the error
  };
  // A group as passed to copyChannelsInGroup().
  struct Group {
    std::optional<std::string> group = {};
    std::optional<std::string> subGroup = {};
    friend bool operator==(const Group&, const Group&) = default;
  };

  // Sets the channels and their values from now on.
  void setRecords(std::vector<ChanmeterRecord> records);
  // From now on that operation fails, for one group or for all.
  void fail(Operation operation, Failure failure, std::optional<Group> onlyOf = std::nullopt);
  void stopFailing();

  // Returns the calls in order, such as "copyChannelsInGroup Speaker-(null)". iterate() and channelCount()
  // are not recorded.
  std::vector<std::string> calls() const;
  void clearCalls();
  // Returns how many samples and deltas still exist.
  std::size_t heldSamples() const;

  [[nodiscard]] Channels copyChannelsInGroup(const std::optional<std::string>& group,
                                             const std::optional<std::string>& subGroup,
                                             std::optional<ChanmeterError>& error) override;
  [[nodiscard]] Subscription createSubscription(const Channels& channels, Channels& subscribed,
                                                std::optional<ChanmeterError>& error) override;
  [[nodiscard]] Samples createSamples(const Subscription& subscription, const Channels& subscribed,
                                      std::optional<ChanmeterError>& error) override;
  [[nodiscard]] Samples createSamplesDelta(const Samples& earlier, const Samples& later,
                                           std::optional<ChanmeterError>& error) override;

 private:
  struct Rule {
    Operation operation;
    Failure failure;
    std::optional<Group> onlyOf;
  };

  void record(const std::string& operation, const Group& group) REQUIRES(mutex_);
  // Returns null when the operation is to succeed.
  const Failure* failureOf(Operation operation, const Group& group) const REQUIRES(mutex_);
  // Sets `error`. Returns whether the result is to be withheld.
  bool fails(Operation operation, const Group& group, std::optional<ChanmeterError>& error) const
      REQUIRES(mutex_);
  Samples track(Samples samples, const Group& group) REQUIRES(mutex_);

  mutable Mutex mutex_;
  ChanmeterRecords records_ GUARDED_BY(mutex_);
  std::vector<Rule> rules_ GUARDED_BY(mutex_);
  std::vector<std::string> calls_ GUARDED_BY(mutex_);
  // The objects that were returned, and the group of each.
  std::map<std::weak_ptr<const void>, Group, std::owner_less<>> groups_ GUARDED_BY(mutex_);
  std::vector<std::weak_ptr<const ChanmeterSamples>> samples_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
