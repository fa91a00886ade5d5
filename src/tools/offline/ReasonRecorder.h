// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <iosfwd>
#include <map>
#include <optional>
#include <string_view>
#include <utility>

#include "session/ReasonTrace.h"

namespace tonewerk {

// Writes why the core did what it did, as tools/recording/ReasonKeys.h says. One thread.
//
//   ReasonRecorder recorder(std::cout);
//   const ReasonTrace::Scope scope(recorder);
//   offline.play(recording, store, isInterrupted);
class ReasonRecorder final : public ReasonTrace {
 public:
  // `out` outlives it.
  explicit ReasonRecorder(std::ostream& out) : out_(out) {}

  void lifeBegan(const TWReportingSession& session, const SessionBeginning& beginning) override;
  void lifeEnded(const TWReportingSession& session, const SessionEnd& end) override;
  void messageArrived(const TWReportingSession& session, const Arrival& arrival) override;
  void stopping(const TWReportingSession& session) override;
  void walkBegan(const Walk& walk) override;
  void rapidMessage(const Merge& merge) override;
  void stretchBegan(const Begin& begin) override;
  void stretchEnded(const End& end) override;
  void walkEnded(std::size_t summaries, std::optional<double> runsSince) override;

 private:
  using Number = std::int64_t;
  // What distinguishes messages when their session has sorted them.
  using Kind = std::pair<std::pair<AudioEventCategory, AudioEventType>, double>;

  // The life of a session, also before the core begins it with a later message.
  struct Life {
    Number number = 0;
    Number messages = 0;
    std::map<const ValueMap*, Number> byPayload;  // the kept messages
    std::multimap<Kind, Number> byKind;           // equal ones in the order of their arrival
  };

  Life& lifeOf(const TWReportingSession& session);
  ValueMap line(std::string_view what) const;
  // The number of a kept message of the stopping session; 0 for one of the session itself.
  Number numberOf(const ValueMap& message) const;
  void setMessage(ValueMap& line, std::string_view key, const ValueMap& message) const;
  void write(const ValueMap& line);

  std::ostream& out_;
  std::map<const TWReportingSession*, Life> lives_;
  Number lastLife_ = 0;
  const Life* stopping_ = nullptr;
};

}  // namespace tonewerk
