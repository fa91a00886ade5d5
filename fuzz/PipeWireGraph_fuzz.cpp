// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as what PipeWire tells of its graph: nodes, clients and links with properties that any
// process may choose, appear, change and leave in any order, while time passes. Each stream that is reported
// has one session after the other, whole and in order, and no text of it is more than the daemon takes.
#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>

#include "FuzzInput.h"
#include "bridges/pipewire/graph/CleanText.h"
#include "bridges/pipewire/graph/GraphModel.h"
#include "bridges/pipewire/sessions/ReporterIdentifiers.h"
#include "bridges/pipewire/sessions/StreamReports.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualEventLoop.h"
#include "support/memory/MemorySessionSink.h"
#include "values/ControlCharacters.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// Values that mean something; others are texts of the input.
constexpr std::array<std::string_view, 8> kKnownTexts = {"Stream/Output/Audio",
                                                         "Stream/Output/Audio",
                                                         "Audio/Sink",
                                                         "Audio/Source/Virtual",
                                                         "true",
                                                         "1",
                                                         "2",
                                                         "Music"};
constexpr std::size_t kMaxObjects = 8;

// A stream is new, changes, and goes. Two reports in a row never say the same.
class CheckingObserver final : public StreamObserver {
 public:
  explicit CheckingObserver(StreamReports& reports) : reports_(reports) {}

  void streamChanged(std::uint32_t stream, const StreamState& state) override {
    const auto [known, isNew] = states_.try_emplace(stream, state);
    expect(isNew || known->second != state);
    known->second = state;
    reports_.streamChanged(stream, state);
  }
  void streamGone(std::uint32_t stream) override {
    expect(states_.erase(stream) == 1);
    reports_.streamGone(stream);
  }
  bool isEmpty() const { return states_.empty(); }

 private:
  StreamReports& reports_;
  std::map<std::uint32_t, StreamState> states_;
};

class Graph {
 public:
  explicit Graph(FuzzInput& input) : input_(input) {
    model_.watchDrivers([this] {
      for (const auto& [node, driver] : model_.drivers()) expectClean(driver.name);
    });
  }

  void run() {
    while (!input_.empty()) step();
    model_.clear();
    expect(observer_.isEmpty() && model_.drivers().empty());
    for (const MemorySessionSink::Session& session : sink_.sessions) check(session);
  }

 private:
  void step() {
    const std::uint32_t object = number();
    switch (input_.below(12)) {
      case 0:
        return model_.nodeAppeared(object, properties());
      case 1: {
        const bool isRunning = input_.below(2) == 1;
        return model_.nodeDescribed(object, isRunning, properties());
      }
      case 2:
        return model_.volumeChanged(object, volume());
      case 3:
        return model_.formatChanged(object, {"lpcm", "F32LE", input_.number<std::uint32_t>(), input_.byte()});
      case 4:
        return model_.clientDescribed(object, properties());
      case 5: {
        const std::uint32_t output = number();
        return model_.linkAppeared(object, output, number());
      }
      case 6:
        return model_.complete();
      case 7:
        return model_.removed(object);
      case 8:
        return reports_.streamOverloaded(object, {clock_.now(), input_.byte(), input_.byte(), 1});
      case 9:
        return clock_.advance(0.05 * input_.byte());
      case 10:
        if (input_.below(2) == 0) return reports_.resendAll();
        isRestarted_ = true;
        return reports_.restartAll();
      default:
        if (input_.below(8) == 0) return model_.clear();
        return clock_.setNow(clock_.now() + input_.number<std::int8_t>());
    }
  }

  std::uint32_t number() { return static_cast<std::uint32_t>(input_.below(kMaxObjects)); }

  Properties properties() {
    Properties properties;
    for (std::size_t count = input_.below(5); count > 0; --count) {
      const std::string_view key = kUsedKeys[input_.below(kUsedKeys.size())];
      const std::size_t choice = input_.below(kKnownTexts.size() + 2);
      const bool isKnown = choice < kKnownTexts.size();
      properties[std::string(key)] = isKnown ? kKnownTexts[choice] : ownText(choice > kKnownTexts.size());
    }
    return properties;
  }

  // A text of the input; a long one is repeated, because no input is so long.
  std::string ownText(bool isLong) {
    std::string text(input_.shortText());
    for (std::size_t times = isLong ? 6 : 0; times > 0; --times) text += text;
    return text;
  }

  StreamVolume volume() {
    StreamVolume volume;
    if (input_.below(4) == 0) volume.mute = input_.below(2) == 1;
    if (input_.below(2) == 0) volume.single = input_.number<float>();
    for (std::size_t count = input_.below(3); count > 0; --count) {
      volume.channels.push_back(input_.number<float>());
    }
    return volume;
  }

  static void expectClean(const std::string& text) {
    expect(isUtf8(text) && text.size() <= kMaxTextBytes && withoutControlCharacters(text) == text);
  }

  static void expectClean(const ValueMap& map) {
    for (const ValueMapEntry& entry : map) {
      if (const SharedString* text = entry.value.asString()) expectClean(text->string());
      if (const double* number = entry.value.asDouble()) expect(std::isfinite(*number));
    }
  }

  // create, configure, start, messages, stop, destroy. One that a restart has replaced is without an end.
  void check(const MemorySessionSink::Session& session) const {
    expect(session.calls.size() >= 3);
    expect(session.calls[0] == "create" && session.calls[1] == "configure" && session.calls[2] == "start");
    const bool hasEnded = session.calls.back() == "destroy";
    expect(hasEnded || isRestarted_);
    expect(session.calls.size() == 3 + session.messages.size() + (hasEnded ? 2 : 0));
    expect(!hasEnded || session.calls[session.calls.size() - 2] == "stop");
    expectClean(session.configuration);
    for (const MemorySessionSink::Message& message : session.messages) {
      expectClean(message.payload);
      if (const Value* volume = message.payload.find("QMSessionVolume")) {
        expect(volume->number() >= 0.0 && volume->number() <= 1.0);
      }
      expect(message.payload.number("session_duration") >= 0.0);
    }
  }

  FuzzInput& input_;
  ManualClock clock_;
  ManualEventLoop loop_{clock_};
  MemorySessionSink sink_;
  ReporterIdentifiers identifiers_{clock_, 1};
  StreamReports reports_{sink_, clock_, identifiers_, loop_};
  CheckingObserver observer_{reports_};
  GraphModel model_{observer_};
  bool isRestarted_ = false;
};

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::size_t kMaxInput = 2048;  // longer scripts only take longer
  if (size > kMaxInput) return 0;
  tonewerk::FuzzInput input(data, size);
  tonewerk::Graph(input).run();
  return 0;
}
