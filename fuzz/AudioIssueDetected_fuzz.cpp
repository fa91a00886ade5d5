// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a metric record. A record that was written and read again must be the same.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "platform/linux/protobuf/ProtozeroReader.h"
#include "platform/linux/protobuf/ProtozeroWriter.h"
#include "platform/pb/AudioIssueDetected.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::ProtozeroReader reader(std::string_view(reinterpret_cast<const char*>(data), size));
  tonewerk::diagwiremetrics::AudioIssueDetected record;
  (void)record.readFrom(reader);  // whatever was read before an error must survive as well
  tonewerk::ProtozeroWriter writer;
  record.writeTo(writer);
  tonewerk::ProtozeroReader again(writer.bytes());
  tonewerk::diagwiremetrics::AudioIssueDetected copy;
  if (!copy.readFrom(again) || !(copy == record)) std::abort();
  return 0;
}
