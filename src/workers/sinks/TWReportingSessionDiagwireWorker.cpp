// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionDiagwireWorker.h"

#include <cassert>
#include <string>
#include <string_view>

#include "platform/Diagwire.h"
#include "platform/Log.h"
#include "platform/pb/AudioIssueDetected.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

// None when the message lacks the key, which is logged.
ValueView valueOf(const ValueMap& message, std::string_view key) {
  const ValueView value = message.view(key);
  if (!value) errorLog(TWReportingDiagwireLogCategory(), "Failed to get %@ for AudioIssueDetected", key);
  return value;
}

// The fields of the record end at a zero byte, like C strings.
void setBytes(std::string& field, const ValueMap& message, std::string_view key) {
  const ValueView value = valueOf(message, key);
  if (!value) return;
  const std::string text = value.text();
  field = text.substr(0, text.find('\0'));
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionDiagwireWorker::kWorkerClass =
    workerClassOf<TWReportingSessionDiagwireWorker>("TWReportingSessionDiagwireWorker");

bool TWReportingSessionDiagwireWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (message.type != kTypeIssueDetector) return false;
  diagwiremetrics::AudioIssueDetected record;
  setBytes(record.issuetype, message.message, "issue_type");
  setBytes(record.rtaidclient, message.message, "rtaid_client");
  setBytes(record.node, message.message, "node");
  if (const ValueView silence = valueOf(message.message, "any_channel_silence_seconds")) {
    record.duration = static_cast<std::uint32_t>(silence.integer32());
  }
  TWReportingContext::current().platform().diagwire.post(record.kMetricIdentifier, record);
  return false;
}

}  // namespace tonewerk
