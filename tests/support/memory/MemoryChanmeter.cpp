// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryChanmeter.h"

#include <algorithm>
#include <utility>

#include "platform/chanmeter/ChanmeterChannelSet.h"
#include "platform/chanmeter/ChanmeterRecordSamples.h"

namespace tonewerk {
namespace {

std::string textOf(const MemoryChanmeter::Group& group) {
  return group.group.value_or("(null)") + "-" + group.subGroup.value_or("(null)");
}

}  // namespace

void MemoryChanmeter::setRecords(std::vector<ChanmeterRecord> records) {
  const MutexLock lock(mutex_);
  records_.clear();
  for (ChanmeterRecord& record : records) {
    records_.push_back(std::make_shared<const ChanmeterRecord>(std::move(record)));
  }
}

void MemoryChanmeter::fail(Operation operation, Failure failure, std::optional<Group> onlyOf) {
  const MutexLock lock(mutex_);
  rules_.push_back({operation, failure, std::move(onlyOf)});
}

void MemoryChanmeter::stopFailing() {
  const MutexLock lock(mutex_);
  rules_.clear();
}

std::vector<std::string> MemoryChanmeter::calls() const {
  const MutexLock lock(mutex_);
  return calls_;
}

void MemoryChanmeter::clearCalls() {
  const MutexLock lock(mutex_);
  calls_.clear();
}

std::size_t MemoryChanmeter::heldSamples() const {
  const MutexLock lock(mutex_);
  const auto held =
      std::count_if(samples_.begin(), samples_.end(), [](const auto& samples) { return !samples.expired(); });
  return static_cast<std::size_t>(held);
}

void MemoryChanmeter::record(const std::string& operation, const Group& group) {
  calls_.push_back(operation + " " + textOf(group));
}

const MemoryChanmeter::Failure* MemoryChanmeter::failureOf(Operation operation, const Group& group) const {
  const auto rule = std::find_if(rules_.begin(), rules_.end(), [&](const Rule& candidate) {
    return candidate.operation == operation && (!candidate.onlyOf || candidate.onlyOf == group);
  });
  return rule == rules_.end() ? nullptr : &rule->failure;
}

bool MemoryChanmeter::fails(Operation operation, const Group& group,
                            std::optional<ChanmeterError>& error) const {
  const Failure* failure = failureOf(operation, group);
  if (failure == nullptr) return false;
  if (failure->code) error = ChanmeterError{*failure->code};
  return !failure->returnsResult;
}

Chanmeter::Channels MemoryChanmeter::copyChannelsInGroup(const std::optional<std::string>& group,
                                                         const std::optional<std::string>& subGroup,
                                                         std::optional<ChanmeterError>& error) {
  const MutexLock lock(mutex_);
  const Group asked{group, subGroup};
  record("copyChannelsInGroup", asked);
  if (fails(Operation::kCopyChannels, asked, error)) return nullptr;
  auto channels = std::make_shared<ChanmeterChannelSet>(chanmeterRecordsIn(records_, group, subGroup));
  groups_[channels] = asked;
  return channels;
}

Chanmeter::Subscription MemoryChanmeter::createSubscription(const Channels& channels, Channels& subscribed,
                                                            std::optional<ChanmeterError>& error) {
  const MutexLock lock(mutex_);
  const Group group = groups_.at(channels);
  record("createSubscription", group);
  if (fails(Operation::kCreateSubscription, group, error)) return nullptr;
  if (!fails(Operation::kSubscribedChannels, group, error)) subscribed = channels;
  if (fails(Operation::kSubscriptionHandle, group, error)) return nullptr;
  auto subscription = std::make_shared<ChanmeterSubscription>();
  groups_[subscription] = group;
  return subscription;
}

Chanmeter::Samples MemoryChanmeter::createSamples(const Subscription& subscription,
                                                  const Channels& subscribed,
                                                  std::optional<ChanmeterError>& error) {
  const MutexLock lock(mutex_);
  const Group group = groups_.at(subscription);
  record("createSamples", group);
  if (fails(Operation::kCreateSamples, group, error)) return nullptr;
  const auto& channels = static_cast<const ChanmeterChannelSet&>(*subscribed);
  return track(std::make_shared<ChanmeterRecordSamples>(channels.selectedFrom(records_)), group);
}

Chanmeter::Samples MemoryChanmeter::createSamplesDelta(const Samples& earlier, const Samples& later,
                                                       std::optional<ChanmeterError>& error) {
  const MutexLock lock(mutex_);
  const Group group = groups_.at(later);
  record("createSamplesDelta", group);
  if (fails(Operation::kCreateSamplesDelta, group, error)) return nullptr;
  Samples delta = RecordChanmeter::createSamplesDelta(earlier, later, error);
  return delta == nullptr ? nullptr : track(std::move(delta), group);
}

Chanmeter::Samples MemoryChanmeter::track(Samples samples, const Group& group) {
  groups_[samples] = group;
  samples_.emplace_back(samples);
  return samples;
}

}  // namespace tonewerk
