// SPDX-License-Identifier: Apache-2.0
//
// The contract of Capsa, for the Linux adapter and the double.

#include <gmock/gmock.h>
#include <memory>

#include "platform/Log.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/diagnostics/LinuxCapsa.h"
#include "platform/linux/threads/ThreadQueueFactory.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualTimers.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"
#include "support/memory/reports/MemoryCapsa.h"

namespace tonewerk {
namespace {

struct MemoryCapsaMaker {
  MemoryCapsaMaker() { capsa->answerAtOnce(MemoryCapsa::started("S1")); }
  std::unique_ptr<MemoryCapsa> capsa = std::make_unique<MemoryCapsa>();
};

struct LinuxCapsaMaker {
  TemporaryDirectory directory;
  ManualClock clock;
  ManualTimers timers{clock};
  MemoryLog log;
  const LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  MemoryJsonService json;
  MemoryPreferenceStore preferences;
  ThreadQueueFactory queues;
  DiagnosticsStore store{directory.path(), {}, json, preferences, clock, category, {}};
  std::unique_ptr<LinuxCapsa> capsa =
      std::make_unique<LinuxCapsa>(store, preferences, queues, timers, clock, category);
};

template <typename Maker>
class CapsaContract : public testing::Test {
 protected:
  const FaultsignSignature signature{"AudioAnalytics", "alarms", "Error", "IssueDetector", "player", {}};
  Maker maker;
  std::unique_ptr<FaultsignReporter> reporter = maker.capsa->makeReporter();
  int replyCount = 0;
  bool wasSuccess = false;
  FaultsignReporter::Reply reply = [this](const std::optional<ValueMap>& map) {
    ++replyCount;
    wasSuccess = map && map->boolean(kFaultsignReplySuccess) && !map->text(kFaultsignReplySessionID).empty();
  };
};

using Makers = testing::Types<MemoryCapsaMaker, LinuxCapsaMaker>;
TYPED_TEST_SUITE(CapsaContract, Makers);

TYPED_TEST(CapsaContract, ASignatureIsMadeOfWhatItIsGiven) {
  const FaultsignSignature made =
      this->reporter->signatureWithDomain("a", "b", "c", "d", "e", ValueMap{{"level", 1}});
  EXPECT_EQ(made.domain, "a");
  EXPECT_EQ(made.type, "b");
  EXPECT_EQ(made.subType, "c");
  EXPECT_EQ(made.subtypeContext, "d");
  EXPECT_EQ(made.detectedProcess, "e");
  EXPECT_EQ(made.triggerThresholdValues, (ValueMap{{"level", 1}}));
}

TYPED_TEST(CapsaContract, AnImmediateCaptureIsAcceptedAndAnsweredOnce) {
  EXPECT_TRUE(this->reporter->snapshotWithSignature(this->signature, 0.0, {}, {}, this->reply));
  EXPECT_EQ(this->replyCount, 1);
  EXPECT_TRUE(this->wasSuccess);
}

TYPED_TEST(CapsaContract, ALaterCaptureIsAcceptedAndAnsweredOnce) {
  EXPECT_TRUE(this->reporter->startSessionWithSignature(this->signature, 60.0, {}, {}, {}, this->reply));
  EXPECT_EQ(this->replyCount, 1);
  EXPECT_TRUE(this->wasSuccess);
}

TYPED_TEST(CapsaContract, CancellingAnUnknownSessionDoesNothing) {
  this->reporter->cancelSession("NONE_RETURNED");
  EXPECT_EQ(this->replyCount, 0);
}

TYPED_TEST(CapsaContract, AReporterThatOutlivesItRefusesEverything) {
  this->maker.capsa.reset();
  // It may refuse by its result or by its reply.
  (void)this->reporter->snapshotWithSignature(this->signature, 0.0, {}, {}, this->reply);
  (void)this->reporter->startSessionWithSignature(this->signature, 60.0, {}, {}, {}, this->reply);
  EXPECT_FALSE(this->wasSuccess);
  this->reporter->cancelSession("S1");
}

}  // namespace
}  // namespace tonewerk
