// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a file of driver channels. Then calls every function of its samples, takes the
// difference of the file with itself, and reads the file again with other numbers.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>

#include "platform/chanmeter/ChanmeterDifference.h"
#include "platform/chanmeter/ChanmeterRecordSample.h"
#include "platform/linux/channels/ChannelFile.h"
#include "tools/twctl/show/ChannelText.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

void expect(bool condition) {
  if (!condition) std::abort();
}

void ask(const ChanmeterSample& sample) {
  expect(isUtf8(sample.driverName().value()) && isUtf8(sample.group().value()));
  expect(isUtf8(sample.channelName().value()) && isUtf8(sample.unitLabel().value_or("")));
  for (std::int32_t index = -1; index <= sample.histogramBucketCount(); ++index) {
    std::int64_t lower = 0;
    std::int64_t upper = 0;
    const bool isThere = index >= 0 && index < sample.histogramBucketCount();
    expect(isThere || sample.histogramBucketBounds(index, lower, upper) != 0);
    expect(isThere || sample.histogramBucketHits(index) == 0);
  }
  for (std::int32_t index = -1; index <= sample.stateCount(); ++index)
    expect(isUtf8(sample.stateName(index)));
  expect(isUtf8(channelValueText(sample)) && isUtf8(channelFields(sample).text()));
  (void)isChanged(sample);
}

// The difference of a file with itself is zero in its simple channels and in its states.
void expectNoChange(const ChanmeterRecords& records) {
  const ChanmeterRecords changes = chanmeterDifference(records, records);
  expect(changes.size() == records.size());
  for (const auto& change : changes) {
    if (change->format == kChanmeterFormatSimple) expect(change->value == 0);
    if (change->format != kChanmeterFormatState) continue;
    for (const ChanmeterState& state : change->states) expect(state.residency == 0 && state.dutyCycle == 0);
  }
}

bool isSame(const ChanmeterRecords& a, const ChanmeterRecords& b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](const auto& one, const auto& other) { return *one == *other; });
}

// Reads the file again with other digits. If that needs no parsing, the result is that of parsing.
void expectUpdateLikeParsing(std::string_view previous, ChannelFile file) {
  std::string text(previous);
  std::replace(text.begin(), text.end(), '1', '7');
  if (!file.update(previous, text)) return;
  ChannelFileProblem problem;
  const std::optional<ChannelFile> whole = ChannelFile::parse(text, problem);
  expect(whole && whole->driver == file.driver && isSame(whole->records, file.records));
}

void read(std::string_view text) {
  ChannelFileProblem problem;
  const std::optional<ChannelFile> file = ChannelFile::parse(text, problem);
  expect(file.has_value() == (problem.code == 0));
  expect(isUtf8(problem.text) && problem.text.size() < 1000);
  if (!file) return;
  for (const auto& record : file->records) ask(ChanmeterRecordSample(record));
  expectNoChange(file->records);
  expectUpdateLikeParsing(text, *file);
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({reinterpret_cast<const char*>(data), size});
  return 0;
}
