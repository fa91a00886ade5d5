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

// Channels that a test sets. Any thread.
//
//   chanmeter.setRecords({{.key = {.driver = "Amp", .group = "Speaker"}, .format = 1, .value = 12}});
//   chanmeter.fail(MemoryChanmeter::Operation::kCreateSamples, {.code = 5}, {{.group = "Speaker"}});
class MemoryChanmeter final : public RecordChanmeter {
 public:
  enum class Operation {
    kCopyChannels,
    kCreateSubscription,  // neither a handle nor channels
    kSubscriptionHandle,  // createSubscription() gives the channels alone
    kSubscribedChannels,  // and the handle alone
    kCreateSamples,
    kCreateSamplesDelta
  };
  struct Failure {
    std::optional<std::int64_t> code = {};  // none: nothing comes, no error either
    bool resultComes = false;               // all the same
  };
  // As copyChannelsInGroup() was asked for it.
  struct Group {
    std::optional<std::string> group = {};
    std::optional<std::string> subGroup = {};
    friend bool operator==(const Group&, const Group&) = default;
  };

  // The channels and their values from now on.
  void setRecords(std::vector<ChanmeterRecord> records);
  // From now on that operation fails, of one group or of all.
  void fail(Operation operation, Failure failure, std::optional<Group> onlyOf = std::nullopt);
  void failNoMore();

  // Such as "copyChannelsInGroup Speaker-(null)", in order; iterate() and channelCount() are not noted.
  std::vector<std::string> calls() const;
  void forgetCalls();
  // Samples and deltas that somebody still holds.
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

  void note(const std::string& operation, const Group& group) REQUIRES(mutex_);
  // Null when the operation is to succeed.
  const Failure* failureOf(Operation operation, const Group& group) const REQUIRES(mutex_);
  // Fills `error`; whether the result is to be withheld.
  bool fails(Operation operation, const Group& group, std::optional<ChanmeterError>& error) const
      REQUIRES(mutex_);
  Samples remembered(Samples samples, const Group& group) REQUIRES(mutex_);

  mutable Mutex mutex_;
  ChanmeterRecords records_ GUARDED_BY(mutex_);
  std::vector<Rule> rules_ GUARDED_BY(mutex_);
  std::vector<std::string> calls_ GUARDED_BY(mutex_);
  // What was handed out, and for which group.
  std::map<std::weak_ptr<const void>, Group, std::owner_less<>> groups_ GUARDED_BY(mutex_);
  std::vector<std::weak_ptr<const ChanmeterSamples>> samples_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
