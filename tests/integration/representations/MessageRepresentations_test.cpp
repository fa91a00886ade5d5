// SPDX-License-Identifier: Apache-2.0
//
// Two sessions get the same bytes, one as packed maps and one as trees. They must do the same with them.
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/linux/messagepack/RandomMaps.h"
#include "platform/linux/messagepack/RpcFrameDecoder.h"
#include "platform/linux/messagepack/RpcFrameScanner.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "session/MessageShapes.h"
#include "support/ReportingTest.h"
#include "workers/producers/TWReportingSessionGatherMessagesWorker.h"
#include "workers/producers/TWReportingSessionInputMessagesWorker.h"
#include "workers/producers/TWReportingSessionVolumeMessagesWorker.h"
#include "workers/sinks/TWReportingSessionSummaryWorker.h"

namespace tonewerk {
namespace {

#ifdef NDEBUG
constexpr int kMessages = 1'000'000;
#else
constexpr int kMessages = 10'000;  // slow builds
#endif
constexpr int kMessagesOfALife = 500;  // between a session's start and its stop
constexpr std::uint64_t kSeed = 20261122;

// Notes what a session delivers: clients' messages and those that producers derive.
class Listener final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  explicit Listener(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }
  bool handleRedundantMessages() const override { return true; }
  bool handleMessage(const TWReportingSessionMessage& message) override {
    heard.push_back((message.isRedundant ? "redundant " : "") + message.description());
    return false;
  }

  std::vector<std::string> heard;
};
const TWReportingSessionWorkerClass Listener::kWorkerClass = workerClassOf<Listener>("Listener");

class MessageRepresentationsTest : public ReportingTest {
 protected:
  MessageRepresentationsTest() : ReportingTest(withListener()) {}

  static Classes withListener() {
    return {&TWReportingSessionVolumeMessagesWorker::kWorkerClass,
            &TWReportingSessionGatherMessagesWorker::kWorkerClass,
            &TWReportingSessionInputMessagesWorker::kWorkerClass,
            &TWReportingSessionSummaryWorker::kWorkerClass, &Listener::kWorkerClass};
  }

  // One way to keep messages.
  struct Side {
    std::shared_ptr<MessageShapes> shapes;  // null for trees
    RpcFrameDecoder decoder;
    std::shared_ptr<TWReportingSession> session;

    void begin() {
      if (shapes != nullptr) shapes = makeMessageShapes();
      session = TWReportingSession::initWithID(77, {4711}, nullptr, shapes);
      session->setServiceType(kServiceTest);
      session->start();
    }
    Listener& listener() const {
      for (const auto& worker : session->consumingMessageWorkers()) {
        if (auto* found = dynamic_cast<Listener*>(worker.get())) return *found;
      }
      throw std::logic_error("the session has no listener");
    }
    std::shared_ptr<TWReportingSessionMessage> decode(std::string_view bytes, AudioEventCategory category,
                                                      AudioEventType type) {
      RpcFrameScanner scanner;
      EXPECT_EQ(scanner.scan(bytes), RpcFrameScanner::Result::kFrame);
      if (shapes != nullptr) {
        IncomingMessage* const taken =
            decoder.decodeMessage({bytes, scanner.frame().argumentCount, scanner.frame().arguments}, *shapes);
        if (taken != nullptr) return message(std::move(taken->payload), category, type);
      }
      RpcFrame& frame = decoder.decode(bytes);
      if (frame.refused) return nullptr;
      return message(*frame.arguments.front()->asMap(), category, type);
    }
  };

  // A message that the daemon's rules do something with.
  ValueMap nextPayload() {
    ValueMap payload = kinds[maps.below(kinds.size())];
    if (maps.isOneIn(20)) payload = maps.map();
    if (maps.isOneIn(20)) payload = maps.changed(payload);
    const double now = test.clock.now();
    if (maps.isOneIn(2)) payload.set("session_output_running", maps.isOneIn(2));
    if (maps.isOneIn(2)) payload.set("QMSessionVolume", static_cast<double>(maps.below(5)) / 4);
    if (maps.isOneIn(4)) payload.set("active_devices", maps.isOneIn(2) ? "Speaker" : "Headphones");
    if (maps.isOneIn(8)) payload.set("session_duration", 3);
    if (maps.isOneIn(4)) payload.set("HostApplicationDisplayID", maps.isOneIn(2) ? "Unknown" : "player");
    if (!maps.isOneIn(8)) payload.set("twreporting_timestamp", now - (maps.isOneIn(8) ? 4e7 : 0.0));
    last = payload;
    return payload;
  }

  // What the clients of this life send again and again; most have no key with a space.
  void makeKinds() {
    kinds.clear();
    while (kinds.size() < 20) {
      ValueMap kind = maps.map();
      if (kind.contains("with space") && !maps.isOneIn(8)) continue;
      kinds.push_back(std::move(kind));
    }
  }

  std::string frameOf(const ValueMap& payload) {
    RandomMaps::Faults faults;
    faults.doubledKeys = maps.isOneIn(50);
    faults.otherOrder = maps.isOneIn(20);
    faults.otherNumbers = maps.isOneIn(5);
    // All arguments, because other calls are not decoded into packed maps.
    std::string frame = "\x93\x02\xABsendMessage\x94";
    frame += maps.bytesOf(payload, faults);
    return frame + "\x04\x01\xC0";  // a category, a type and no sessions
  }

  RandomMaps maps{kSeed};
  std::vector<ValueMap> kinds;
  ValueMap last;
  Side packed{makeMessageShapes(), {}, nullptr};
  Side plain{nullptr, {}, nullptr};
};

TEST_F(MessageRepresentationsTest, PackedMessagesAndTreesAreTreatedAlike) {
  test.log.setThreshold(LogLevel::kError);
  std::size_t packedMessages = 0;
  std::size_t redundant = 0;
  for (int sent = 0; sent < kMessages; ++sent) {
    if (sent % kMessagesOfALife == 0) {
      packed.begin();
      plain.begin();
      makeKinds();
    }
    test.clock.advance(static_cast<double>(maps.below(3'000)) / 1000);
    const AudioEventCategory category = 1 + static_cast<AudioEventCategory>(maps.below(4));
    const auto type = static_cast<AudioEventType>(maps.below(8));
    const std::string frame = frameOf(nextPayload());
    const auto first = packed.decode(frame, category, type);
    const auto second = plain.decode(frame, category, type);
    ASSERT_EQ(first == nullptr, second == nullptr) << "seed " << kSeed << " message " << sent;
    if (first == nullptr) continue;
    packed.session->sendMessage(first);
    plain.session->sendMessage(second);
    ASSERT_EQ(first->isRedundant, second->isRedundant) << "seed " << kSeed << " message " << sent;
    ASSERT_EQ(first->message.text(), second->message.text()) << "seed " << kSeed << " message " << sent;
    ASSERT_EQ(first->message, second->message) << "seed " << kSeed << " message " << sent;
    packedMessages += first->message.packed() != nullptr ? 1 : 0;
    redundant += first->isRedundant ? 1 : 0;
    // Again the same values: mostly redundant, also when other numbers that are equal came.
    if (maps.isOneIn(4)) {
      const std::string again = frameOf(last);
      const auto third = packed.decode(again, category, type);
      const auto fourth = plain.decode(again, category, type);
      ASSERT_EQ(third == nullptr, fourth == nullptr);
      if (third != nullptr) {
        packed.session->sendMessage(third);
        plain.session->sendMessage(fourth);
        ASSERT_EQ(third->isRedundant, fourth->isRedundant) << "seed " << kSeed << " message " << sent;
        redundant += third->isRedundant ? 1 : 0;
      }
    }
    if (sent % 50 == 0) {
      ASSERT_EQ(packed.session->previousValues().text(), plain.session->previousValues().text())
          << "seed " << kSeed << " message " << sent;
    }
    if (sent % kMessagesOfALife == kMessagesOfALife - 1) {
      ASSERT_EQ(packed.session->messages().size(), plain.session->messages().size());
      for (std::size_t at = 0; at < packed.session->messages().size(); ++at) {
        ASSERT_EQ(packed.session->messages()[at]->description(),
                  plain.session->messages()[at]->description());
      }
      packed.session->stop();
      plain.session->stop();
      ASSERT_EQ(packed.listener().heard, plain.listener().heard) << "seed " << kSeed << " message " << sent;
    }
  }
  // Most messages are packed, and the test is about something.
  EXPECT_GT(packedMessages, static_cast<std::size_t>(kMessages) / 3);
  EXPECT_GT(redundant, static_cast<std::size_t>(kMessages) / 20);
}

}  // namespace
}  // namespace tonewerk
