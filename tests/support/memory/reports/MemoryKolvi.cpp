// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryKolvi.h"

#include "platform/Kolvi.h"

namespace tonewerk {
namespace {

class MemoryModel final : public KolviModel, private KolviTimeModel {
 public:
  MemoryModel(std::map<std::string, std::vector<std::uint64_t>> intervals, std::optional<double> beginTime)
      : intervals_(std::move(intervals)), beginTime_(beginTime) {}

  const KolviTimeModel& timeModel() const override { return *this; }
  double secondsFromSystemTimeDuration(std::uint64_t duration) const override {
    return static_cast<double>(duration) * MemoryKolvi::kUnitSeconds;
  }
  std::vector<KolviProbe> makeProbes(const ValueArray& dictionaries) const override {
    return makeKolviProbes(dictionaries, [this](const std::string& signpost) {
      std::vector<KolviEvent> events;
      const auto found = intervals_.find(signpost);
      if (found == intervals_.end()) return events;
      for (const std::uint64_t duration : found->second) events.push_back({duration, beginTime_});
      return events;
    });
  }

 private:
  const std::map<std::string, std::vector<std::uint64_t>> intervals_;
  const std::optional<double> beginTime_;
};

}  // namespace

std::unique_ptr<KolviModel> MemoryKolvi::openModel(const std::string& traceLocation, std::string& problem) {
  opened.push_back(traceLocation);
  if (failure) {
    problem = *failure;
    return nullptr;
  }
  return std::make_unique<MemoryModel>(intervals, beginTime);
}

}  // namespace tonewerk
