// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/glitches/GlitchPicture.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <string_view>

#include "tools/twctl/sessions/GlitchVerdict.h"
#include "values/PrintableText.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr double kMicrosecondsPerMs = 1000.0;
constexpr std::size_t kIndent = 2;
constexpr std::size_t kLongestName = 18;
constexpr std::size_t kShortestName = 6;
constexpr std::size_t kTimeWidth = 10;  // " not woken"
// No picture shows more periods, so that one can still see the first of them.
constexpr double kMostPeriods = 4.0;

// What a node does at a moment.
enum class Part : std::uint8_t { kNothing, kWaits, kRuns, kRunsLate, kDeadline, kGoesOn };

struct Sign {
  Part part;
  std::string_view unicode;
  std::string_view ascii;
  std::string_view colour;  // an escape sequence
};
constexpr Sign kSigns[] = {{Part::kNothing, " ", " ", ""},
                           {Part::kWaits, "\u2591", ".", "\x1b[33m"},
                           {Part::kRuns, "\u2588", "#", "\x1b[32m"},
                           {Part::kRunsLate, "\u2593", "X", "\x1b[31m"},
                           {Part::kDeadline, "\u2502", "|", "\x1b[1m"},
                           {Part::kGoesOn, "\u2192", ">", "\x1b[31m"}};
constexpr std::string_view kNoColour = "\x1b[0m";

const Sign& signOf(Part part) { return kSigns[static_cast<std::size_t>(part)]; }

std::string msText(double microseconds) { return millisecondsText(microseconds / kMicrosecondsPerMs); }

// At most `width` characters.
std::string cut(std::string text, std::size_t width, bool isUnicode) {
  if (utf8Characters(text) <= width) return text;
  const std::string_view end = isUnicode ? "\u2026" : "~";
  while (utf8Characters(text) >= width) {
    do text.pop_back();
    while (!text.empty() && isUtf8Continuation(text.back()));
    // The first byte of the character whose other bytes are gone.
    if (!text.empty() && static_cast<unsigned char>(text.back()) >= 0xC0U) text.pop_back();
  }
  return text.append(end);
}

std::string headingOf(const GlitchCycle& cycle) {
  const std::string length = ", of " + msText(cycle.period);
  if (cycle.isOfGlitch()) return "the glitch's cycle" + length;
  return "the cycle " + msText(std::abs(cycle.begin)) + (cycle.begin < 0 ? " before" : " after") + length;
}

// The glitch's own cycle and the nearest ones.
std::vector<const GlitchCycle*> chosen(const std::vector<GlitchCycle>& cycles) {
  std::vector<const GlitchCycle*> before;
  std::vector<const GlitchCycle*> found;
  std::size_t after = 0;
  for (const GlitchCycle& cycle : cycles) {
    if (cycle.begin < 0) {
      before.push_back(&cycle);
    } else if (cycle.isOfGlitch() || after++ < GlitchPicture::kMostAround) {
      found.push_back(&cycle);
    }
  }
  const std::size_t kept = std::min(before.size(), GlitchPicture::kMostAround);
  found.insert(found.begin(), before.end() - static_cast<std::ptrdiff_t>(kept), before.end());
  return found;
}

}  // namespace

// Where times of a cycle are in a line.
struct GlitchPicture::Scale {
  std::size_t nameWidth = 0;
  std::size_t columns = 0;  // of the bars
  double longest = 0.0;     // microseconds at their end

  std::size_t columnOf(double microseconds) const {
    const double place = microseconds / longest * static_cast<double>(columns);
    return static_cast<std::size_t>(std::clamp(place, 0.0, static_cast<double>(columns)));
  }
};

std::string GlitchPicture::draw(const std::vector<GlitchCycle>& cycles) const {
  const std::vector<const GlitchCycle*> shown = chosen(cycles);
  if (shown.empty()) return {};
  Scale scale;
  double longestPeriod = 0.0;
  for (const GlitchCycle* cycle : shown) {
    longestPeriod = std::max(longestPeriod, cycle->period);
    for (const GlitchCycle::Node& node : cycle->nodes) {
      scale.nameWidth = std::max(scale.nameWidth, utf8Characters(printable(node.name)));
      scale.longest = std::max(scale.longest, node.finish.value_or(node.awake.value_or(node.signal)));
    }
  }
  constexpr double kRoom = 1.05;  // so that the deadline is not the last column
  scale.longest = std::clamp(scale.longest * kRoom, longestPeriod * kRoom, longestPeriod * kMostPeriods);
  const std::size_t width = std::max(look_.width, kNarrowest);
  scale.nameWidth = std::clamp(scale.nameWidth, kShortestName, std::min(kLongestName, width / 4));
  scale.columns = width - kIndent - scale.nameWidth - 1 - kTimeWidth;
  std::string text;
  for (const GlitchCycle* cycle : shown) {
    text.append(headingOf(*cycle)).append("\n");
    for (const GlitchCycle::Node& node : cycle->nodes) drawNode(text, *cycle, node, scale);
    if (cycle->nodes.empty()) text.append(kIndent, ' ').append("no node ran\n");
  }
  return text;
}

void GlitchPicture::drawNode(std::string& text, const GlitchCycle& cycle, const GlitchCycle::Node& node,
                             const Scale& scale) const {
  const double end = node.finish.value_or(scale.longest);
  const double awake = node.awake.value_or(node.finish ? node.signal : scale.longest);
  const std::size_t deadline = std::min(scale.columnOf(cycle.period), scale.columns - 1);
  std::vector<Part> parts(scale.columns, Part::kNothing);
  // Whatever lasts at all has a column, so that one sees that the node was there.
  const auto fill = [&](double from, double until, Part part) {
    std::size_t last = scale.columnOf(until);
    const std::size_t first = std::min(scale.columnOf(from), scale.columns - 1);
    if (last == first && until > from) ++last;
    for (std::size_t at = first; at < std::min(last, scale.columns); ++at) parts[at] = part;
  };
  fill(node.signal, awake, Part::kWaits);
  fill(awake, end, Part::kRuns);
  for (std::size_t at = deadline; at < scale.columns; ++at) {
    if (parts[at] == Part::kRuns) parts[at] = Part::kRunsLate;
  }
  parts[deadline] = Part::kDeadline;
  if (!node.finish || *node.finish > scale.longest) parts.back() = Part::kGoesOn;

  const std::string name = cut(printable(node.name), scale.nameWidth, look_.isUnicode);
  text.append(kIndent, ' ').append(name).append(scale.nameWidth - utf8Characters(name) + 1, ' ');
  Part last = Part::kNothing;
  for (const Part part : parts) {
    const Sign& sign = signOf(part);
    if (look_.isColoured && part != last) text.append(kNoColour).append(sign.colour);
    text.append(look_.isUnicode ? sign.unicode : sign.ascii);
    last = part;
  }
  if (look_.isColoured && last != Part::kNothing) text.append(kNoColour);
  text.append(" ").append(node.finish ? msText(*node.finish) : node.awake ? "no answer" : "not woken");
  text.append("\n");
}

std::string GlitchPicture::legend() const {
  const auto sign = [this](Part part) {
    return std::string(look_.isUnicode ? signOf(part).unicode : signOf(part).ascii);
  };
  return sign(Part::kWaits) + " waits  " + sign(Part::kRuns) + " runs  " + sign(Part::kRunsLate) +
         " runs too late  " + sign(Part::kDeadline) + " the deadline";
}

}  // namespace tonewerk
