// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/CycleStatistics.h"

#include <chrono>
#include <utility>

#include "values/Value.h"

namespace tonewerk {

namespace {

class ChannelList {
 public:
  ChannelList(ValueArray& channels, std::string_view group, std::string_view subgroup)
      : channels_(channels), group_(group), subgroup_(subgroup) {}

  void addSimple(std::string_view name, std::string_view unit, std::int64_t value) {
    ValueMap channel = begin(name, unit, "simple");
    channel.set("value", value);
    channels_.append(std::move(channel));
  }
  void addHistogram(std::string_view name, std::string_view unit, const Histogram& histogram) {
    ValueMap channel = begin(name, unit, "histogram");
    histogram.describe(channel);
    channels_.append(std::move(channel));
  }

 private:
  ValueMap begin(std::string_view name, std::string_view unit, std::string_view format) const {
    ValueMap channel{{"group", group_}};
    if (!subgroup_.empty()) channel.set("subgroup", subgroup_);
    channel.set("name", name);
    channel.set("unit", unit);
    channel.set("format", format);
    return channel;
  }

  ValueArray& channels_;
  std::string_view group_;
  std::string_view subgroup_;
};

}  // namespace

void CycleStatistics::count(const ProfiledCycle& cycle, const CycleXruns& xruns) {
  xruns_ += xruns.driver;
  if (!xruns.followers.empty()) ++incompleteCycles_;
  if (xruns.isRepeat) return;
  ++cycles_;
  periods_.add(std::chrono::duration_cast<std::chrono::microseconds>(cycle.period).count());
  if (cycle.processing && cycle.period.count() > 0) {
    processing_.add(*cycle.processing * 100 / cycle.period);
  }
}

void CycleStatistics::describe(ValueArray& channels, std::string_view group,
                               std::string_view subgroup) const {
  ChannelList list(channels, group, subgroup);
  list.addSimple("Cycles", "cycles", cycles_);
  list.addSimple("Incomplete Cycles", "cycles", incompleteCycles_);
  list.addSimple("Xruns", "xruns", xruns_);
  list.addHistogram("Period", "us", periods_);
  list.addHistogram("Processing Time", "%", processing_);
}

}  // namespace tonewerk
