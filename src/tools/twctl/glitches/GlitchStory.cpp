// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/glitches/GlitchStory.h"

#include <cmath>
#include <ostream>
#include <string>
#include <utility>

#include "tools/twctl/glitches/GlitchAdvice.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/WrappedLines.h"

namespace tonewerk {
namespace {

constexpr std::size_t kLabelWidth = 8;

// "org.example.Player in session 41 (waiting for another)"
std::string hearer(const GlitchVerdict& verdict) {
  std::string text = verdict.application.value_or("an unknown application");
  if (verdict.session) text += " in session " + std::to_string(*verdict.session);
  if (verdict.cause) text += " (" + *verdict.cause + ")";
  return text;
}

std::string timeOf(const GlitchVerdict& verdict) {
  std::string text = localTime(verdict.at);
  if (verdict.overloads > 1) text += ", " + std::to_string(verdict.overloads) + " times within a second";
  return text;
}

// "256 frames at 48000 Hz: 5.33 ms"
std::string cycleText(const GlitchVerdict& verdict) {
  std::string text;
  if (verdict.quantum) text = std::to_string(*verdict.quantum) + " frames";
  if (verdict.rate) text += (text.empty() ? "" : " at ") + std::to_string(*verdict.rate) + " Hz";
  if (verdict.periodMs) text += (text.empty() ? "" : ": ") + millisecondsText(*verdict.periodMs);
  return text;
}

void setText(ValueMap& map, const char* key, const std::optional<std::string>& text) {
  if (text) map.set(key, *text);
}

template <typename Number>
void setNumber(ValueMap& map, const char* key, const std::optional<Number>& number) {
  if (number) map.set(key, *number);
}

ValueMap objectOf(const GlitchCycle& cycle) {
  std::vector<Value> nodes;
  for (const GlitchCycle::Node& node : cycle.nodes) {
    ValueMap one{{"name", node.name}, {"process", node.process}, {"signal", node.signal}};
    setNumber(one, "awake", node.awake);
    setNumber(one, "finish", node.finish);
    nodes.emplace_back(std::move(one));
  }
  return {{"begin", cycle.begin}, {"period", cycle.period}, {"nodes", ValueArray(std::move(nodes))}};
}

}  // namespace

void GlitchStory::print(std::ostream& out, GlitchPicture::Look look, std::optional<std::size_t> width) const {
  const GlitchVerdict& worst = glitch_.verdicts.front();
  const GlitchPicture picture(look);
  const std::string drawn = picture.draw(cycles_);
  if (!drawn.empty()) out << drawn << picture.legend() << "\n\n";

  WrappedLines lines(out, kLabelWidth, width);
  lines.add("glitch", worst.id.value_or("event " + std::to_string(worst.event)));
  lines.add("time", timeOf(worst));
  lines.add("cause", worst.causeText() + ": " + meaningOf(worst));
  lines.add("culprit", culpritOf(worst));
  for (std::size_t at = 0; at < glitch_.verdicts.size(); ++at) {
    lines.add(at == 0 ? "heard by" : "", hearer(glitch_.verdicts[at]));
  }
  const std::int64_t more = glitch_.sessions - static_cast<std::int64_t>(glitch_.verdicts.size());
  if (more > 0) lines.add("", "and in " + std::to_string(more) + " more sessions");
  if (worst.lostMs) lines.add("lost", millisecondsText(*worst.lostMs) + " of audio");
  if (worst.chain) lines.add("chain", *worst.chain);
  if (const std::string text = cycleText(worst); !text.empty()) lines.add("cycle", text);
  if (worst.device) lines.add("device", *worst.device);
  if (worst.reason) lines.add("reason", *worst.reason);
  constexpr double kPercent = 100.0;
  if (worst.confidence) {
    lines.add("sure", std::to_string(std::lround(*worst.confidence * kPercent)) + " %");
  }
  if (drawn.empty() && worst.isJudged()) lines.add("", "The cycles around it are not known.");
  out << '\n';
  bool isFirst = true;
  for (const std::string& remedy : remediesFor(worst)) {
    lines.add(std::exchange(isFirst, false) ? "to do" : "", "- " + remedy);
  }
}

ValueMap GlitchStory::object() const {
  const GlitchVerdict& worst = glitch_.verdicts.front();
  ValueMap object{{"event", worst.event}, {"at", worst.at}, {"overloads", worst.overloads}};
  setText(object, "glitch_id", worst.id);
  setText(object, "cause", worst.cause);
  setText(object, "first_cause", worst.firstCause);
  setNumber(object, "confidence", worst.confidence);
  setText(object, "culprit_application", worst.culpritApplication);
  setText(object, "culprit_process", worst.culpritProcess);
  setNumber(object, "culprit_pid", worst.culpritPid);
  setText(object, "culprit_node", worst.culpritNode);
  setText(object, "device", worst.device);
  setText(object, "chain", worst.chain);
  setNumber(object, "over_ms", worst.overMs);
  setNumber(object, "period_ms", worst.periodMs);
  setNumber(object, "quantum", worst.quantum);
  setNumber(object, "rate", worst.rate);
  setNumber(object, "lost_ms", worst.lostMs);
  setText(object, "reason", worst.reason);
  std::vector<Value> heard;
  for (const GlitchVerdict& verdict : glitch_.verdicts) {
    ValueMap one{{"event", verdict.event}};
    setNumber(one, "session", verdict.session);
    setText(one, "application", verdict.application);
    setText(one, "cause", verdict.cause);
    setText(one, "node", verdict.node);
    setNumber(one, "lost_ms", verdict.lostMs);
    heard.emplace_back(std::move(one));
  }
  object.set("heard_by", ValueArray(std::move(heard)));
  object.set("sessions", glitch_.sessions);
  object.set("meaning", meaningOf(worst));
  std::vector<Value> remedies;
  for (const std::string& remedy : remediesFor(worst)) remedies.emplace_back(remedy);
  object.set("remedies", ValueArray(std::move(remedies)));
  std::vector<Value> cycles;
  for (const GlitchCycle& cycle : cycles_) cycles.emplace_back(objectOf(cycle));
  object.set("cycles", ValueArray(std::move(cycles)));
  return object;
}

}  // namespace tonewerk
