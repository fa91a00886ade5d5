// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionDPWorker.h"

#include <cassert>
#include <optional>

#include "platform/Clock.h"
#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "platform/NotificationService.h"
#include "platform/WhirlcapRequest.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingDefaults.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "values/ValueView.h"
#include "workers/sinks/TWReportingDPSettings.h"

namespace tonewerk {
namespace {

constexpr std::string_view kEnableWhirlcap = "enable_whirlcap";
constexpr std::string_view kIoBufferSize = "io_buffer_size";
constexpr std::string_view kIoCycle = "io_cycle";
constexpr std::string_view kWaitTime = "wait_time";
constexpr std::string_view kSmallestBufferFrameSize = "smallest_buffer_frame_size";

constexpr std::int32_t kDefaultIoBufferSize = 512;
constexpr double kSecondsBetweenRequests = 10.0;
constexpr std::string_view kDroppedWhirlcapNotification = "com.orvane.tonewerk.dropped-whirlcap";

TWReportingDPSettings& settings() {
  return TWReportingContext::current().singletons().get<TWReportingDPSettings>();
}

std::optional<Value> readDefault(std::string_view key) {
  std::optional<Value> value = TWReportingSessionDPWorker::getUserDefaults().read(key);
  if (value) debugLog(TWReportingDPLogCategory(), "Value of %@ is %@", key, *value);
  return value;
}

std::int32_t bufferSizeOf(const TWReportingSessionMessage& message) {
  return message.message.view(kSmallestBufferFrameSize).integer32();
}

// Whole microseconds; 0 for a number that is no time.
std::chrono::microseconds waitTimeOf(double microseconds) {
  constexpr std::chrono::microseconds kMax = TWReportingSessionDPWorker::kMaxWaitTime;
  if (!(microseconds > 0.0)) return std::chrono::microseconds(0);
  if (microseconds >= static_cast<double>(kMax.count())) return kMax;
  return std::chrono::microseconds(static_cast<std::int64_t>(microseconds));
}

void requestTrace(const TWReportingSessionMessage& message) {
  const Platform& platform = TWReportingContext::current().platform();
  {
    const Heartbeat::LongWork waiting(settings().waitTime);
    platform.clock.sleep(settings().waitTime);
  }
  ValueMap payload = message.message;  // later changes of the message do not reach it
  const ValueView application = payload.view(TWReportingApplicationName);
  const Value* noName = nullptr;
  infoLog(TWReportingDPLogCategory(), "Dropping whirlcap %@", message);
  platform.whirlcaps.request("com.orvane.tonewerk", "AudioOverloads",
                             application ? application.text() : textOf(noName), payload,
                             {.first = true, .second = true});
  if (const std::error_code error = platform.notifications.post(kDroppedWhirlcapNotification)) {
    errorLog(TWReportingDPLogCategory(), "cannot post %@: %@", kDroppedWhirlcapNotification, error.message());
  }
  infoLog(TWReportingDPLogCategory(), "Dropped whirlcap");
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionDPWorker::kWorkerClass =
    workerClassOf<TWReportingSessionDPWorker>("TWReportingSessionDPWorker");

std::shared_ptr<TWReportingSessionDPWorker> TWReportingSessionDPWorker::initWithSession(
    const std::shared_ptr<TWReportingSession>& session) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const bool isInternalBuild = TWReportingUtilityIsInternalBuild();
  // Elsewhere the flag is only shown in the log. Looking for its files takes long for a short session.
  if (!isInternalBuild && !TWReportingDPLogCategory()->isEnabled(LogLevel::kDebug)) return nullptr;
  const bool isEnabled = getEnableFlag(kEnableWhirlcap);
  if (!isInternalBuild || !isEnabled) return nullptr;
  auto worker = std::make_shared<TWReportingSessionDPWorker>();
  worker->session = session;
  const std::int32_t ioBufferSize = getRunTimeDefaults(kIoBufferSize);
  settings().ioBufferSize = ioBufferSize == 0 ? kDefaultIoBufferSize : ioBufferSize;
  settings().ioCycle = getRunTimeDefaults(kIoCycle);
  settings().waitTime = waitTimeOf(getDoubleRunTimeDefaults(kWaitTime));
  return worker;
}

std::optional<bool> TWReportingSessionDPWorker::start() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  started = true;
  return true;
}

bool TWReportingSessionDPWorker::interestedInMessage(const TWReportingSessionMessage& message) const {
  if (message.type != kTypeError || message.category != kCategoryIo) return false;
  infoLog(TWReportingDPLogCategory(), "Interested in overload");
  return true;
}

bool TWReportingSessionDPWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const double now = TWReportingContext::current().platform().clock.now();
  if (meetsConditions(message, now)) {
    requestTrace(message);
    lastMessageTime_ = now;
    return false;
  }
  debugLog(TWReportingDPLogCategory(),
           "Did not drop whirlcap, right conditions not met: buffer size : %d, time diff : %f, io cycle: %d",
           bufferSizeOf(message), now - lastMessageTime_, message.message.integer(kIoCycle));
  return false;
}

bool TWReportingSessionDPWorker::meetsConditions(const TWReportingSessionMessage& message, double now) const {
  if (!interestedInMessage(message)) return false;
  if (bufferSizeOf(message) < settings().ioBufferSize) return false;
  if (lastMessageTime_ != 0.0 && now - lastMessageTime_ <= kSecondsBetweenRequests) return false;
  return message.message.integer(kIoCycle) >= settings().ioCycle;
}

const TWReportingDefaults& TWReportingSessionDPWorker::getUserDefaults() {
  TWReportingContext& context = TWReportingContext::current();
  return context.singletons().get<TWReportingDefaults>(context.platform().preferences);
}

bool TWReportingSessionDPWorker::getEnableFlag(std::string_view key) {
  const std::optional<Value> value = readDefault(key);
  return value && value->boolean();
}

std::int32_t TWReportingSessionDPWorker::getRunTimeDefaults(std::string_view key) {
  const std::optional<Value> value = readDefault(key);
  return value ? value->integer32() : 0;
}

double TWReportingSessionDPWorker::getDoubleRunTimeDefaults(std::string_view key) {
  const std::optional<Value> value = readDefault(key);
  return value ? value->number() : 0.0;
}

}  // namespace tonewerk
