// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/TopView.h"

#include <algorithm>
#include <numeric>
#include <optional>
#include <utility>

#include "tools/twctl/show/TopCells.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

using Style = TopLine::Style;

constexpr std::size_t kGap = 2;             // spaces between columns
constexpr std::size_t kMaxDeviceLines = 4;  // further devices are counted
constexpr std::size_t kMaxFilterBytes = 80;
constexpr std::size_t kNarrowest = 8;  // what a cut column keeps
constexpr std::size_t kReadable = 16;  // rather than to cut texts more, columns are left out
constexpr std::size_t kPage = 10;      // rows

constexpr std::string_view kDown = "\u2193";
constexpr std::string_view kUp = "\u2191";

// ASCII letters only, like the tools that people filter with.
char lower(char letter) {
  return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

bool containsAnyCase(std::string_view text, std::string_view part) {
  return std::search(text.begin(), text.end(), part.begin(), part.end(),
                     [](char a, char b) { return lower(a) == lower(b); }) != text.end();
}

void appendUtf8(std::string& text, char32_t character) {
  const auto code = static_cast<std::uint32_t>(character);
  const auto add = [&text](std::uint32_t byte) { text += static_cast<char>(byte); };
  if (code < 0x80) {
    add(code);
  } else if (code < 0x800) {
    add(0xC0 | code >> 6);
    add(0x80 | (code & 0x3F));
  } else if (code < 0x10000) {
    add(0xE0 | code >> 12);
    add(0x80 | (code >> 6 & 0x3F));
    add(0x80 | (code & 0x3F));
  } else {
    add(0xF0 | code >> 18);
    add(0x80 | (code >> 12 & 0x3F));
    add(0x80 | (code >> 6 & 0x3F));
    add(0x80 | (code & 0x3F));
  }
}

std::string cut(const std::string& text, std::size_t width) {
  if (utf8Characters(text) <= width) return text;
  std::size_t end = 0;
  for (std::size_t kept = 1; kept < width; ++kept) {
    ++end;
    while (end < text.size() && isUtf8Continuation(text[end])) ++end;
  }
  return text.substr(0, end) + "\u2026";
}

// A table that fits a width: columns are left out by their expendability, and then the widest ones are cut.
class FittedTable {
 public:
  FittedTable(const TopCells& cells, std::vector<std::string> titles, std::vector<bool> isHidden)
      : cells_(cells), titles_(std::move(titles)), isHidden_(std::move(isHidden)) {
    for (std::size_t column = 0; column < titles_.size(); ++column) {
      std::size_t width = utf8Characters(titles_[column]);
      for (const auto& row : cells_.rows) width = std::max(width, utf8Characters(row[column].text));
      widths_.push_back(width);
    }
  }

  void fit(std::size_t width) {
    while (length(kReadable) > width && leaveOneOut()) {
    }
    while (length(std::string::npos) > width) {
      std::size_t* widest = nullptr;
      for (std::size_t column = 0; column < widths_.size(); ++column) {
        const bool isText = !isHidden_[column] && !cells_.columns[column].isNumber;
        if (isText && (widest == nullptr || widths_[column] > *widest)) widest = &widths_[column];
      }
      if (widest == nullptr || *widest <= kNarrowest) return;
      --*widest;
    }
  }

  std::string titles() const {
    return line([&](std::size_t column) { return titles_[column]; });
  }
  std::string row(std::size_t number) const {
    return line([&](std::size_t column) { return cells_.rows[number][column].text; });
  }

 private:
  // The length of a line whose texts are cut to `most` characters; numbers are never cut.
  std::size_t length(std::size_t most) const {
    std::size_t length = 0;
    for (std::size_t column = 0; column < widths_.size(); ++column) {
      if (isHidden_[column]) continue;
      const std::size_t width = widths_[column];
      length += (length == 0 ? 0 : kGap) + (cells_.columns[column].isNumber ? width : std::min(width, most));
    }
    return length;
  }

  bool leaveOneOut() {
    std::optional<std::size_t> most;
    for (std::size_t column = 0; column < widths_.size(); ++column) {
      const std::size_t expendability = cells_.columns[column].expendability;
      if (isHidden_[column] || expendability == 0) continue;
      if (!most || expendability > cells_.columns[*most].expendability) most = column;
    }
    if (most) isHidden_[*most] = true;
    return most.has_value();
  }

  template <typename TextOf>
  std::string line(TextOf textOf) const {
    std::string line;
    std::size_t owed = 0;  // spaces before the next text
    for (std::size_t column = 0; column < widths_.size(); ++column) {
      if (isHidden_[column]) continue;
      const std::string text = cut(textOf(column), widths_[column]);
      line.append(owed, ' ').append(text);
      owed = widths_[column] - utf8Characters(text) + kGap;
    }
    return line;
  }

  const TopCells& cells_;
  const std::vector<std::string> titles_;
  std::vector<bool> isHidden_;
  std::vector<std::size_t> widths_;
};

bool fits(const std::vector<TopCell>& row, const std::string& filter) {
  return filter.empty() || std::any_of(row.begin(), row.end(), [&](const TopCell& cell) {
           return containsAnyCase(cell.text, filter);
         });
}

// Numbers from the largest, texts from A; reversed the other way. Equal rows keep their order.
void sort(TopCells& cells, std::size_t column, bool isReversed) {
  const bool isNumber = cells.columns[column].isNumber;
  const auto isBefore = [&](const TopCell& a, const TopCell& b) {
    return isNumber ? a.number > b.number : a.text < b.text;
  };
  std::stable_sort(cells.rows.begin(), cells.rows.end(),
                   [&](const std::vector<TopCell>& a, const std::vector<TopCell>& b) {
                     return isReversed ? isBefore(b[column], a[column]) : isBefore(a[column], b[column]);
                   });
}

TopCells cellsOf(TopView::Pane pane, const std::vector<SessionRow>& sessions, const AudioHealth& health) {
  return pane == TopView::Pane::kSessions ? sessionCells(sessions) : nodeCells(health.nodes);
}

}  // namespace

void TopView::update(std::vector<SessionRow> sessions, AudioHealth health) {
  sessions_ = std::move(sessions);
  health_ = std::move(health);
}

bool TopView::press(char32_t key) {
  if (key == kKeyControlC) return false;
  if (editsFilter_) {
    editFilter(key);
    return true;
  }
  if (showsHelp_) {
    showsHelp_ = false;
    return key != U'q' && key != U'Q';
  }
  const std::size_t columns = cellsOf(pane_, {}, {}).columns.size();
  if (key >= U'1' && key < U'1' + columns) {
    bool& isHidden = choice().isHidden[key - U'1'];
    isHidden = !isHidden;
    return true;
  }
  switch (key) {
    case U'q':
    case U'Q':
      return false;
    case U'h':
    case U'?':
      showsHelp_ = true;
      break;
    case U'<':
    case kKeyLeft:
      moveSorting(false);
      break;
    case U'>':
    case kKeyRight:
      moveSorting(true);
      break;
    case U'r':
      choice().isReversed = !choice().isReversed;
      break;
    case U'/':
      editsFilter_ = true;
      break;
    case kKeyEscape:
      choice().filter.clear();
      break;
    case U'p':
    case U' ':
      isPaused_ = !isPaused_;
      break;
    case U'n':
    case kKeyTab:
      pane_ = pane_ == Pane::kSessions ? Pane::kNodes : Pane::kSessions;
      break;
    default:
      scroll(key);
      break;
  }
  return true;
}

void TopView::editFilter(char32_t key) {
  std::string& filter = choice().filter;
  if (key == kKeyEnter || key == U'\n') {
    editsFilter_ = false;
  } else if (key == kKeyEscape) {
    filter.clear();
    editsFilter_ = false;
  } else if (key == kKeyBackspace || key == 0x7F || key == 0x08) {
    while (!filter.empty() && isUtf8Continuation(filter.back())) filter.pop_back();
    if (!filter.empty()) filter.pop_back();
  } else if (key >= U' ' && key < 0x110000 && !(key >= 0x7F && key < 0xA0) &&
             filter.size() < kMaxFilterBytes) {
    appendUtf8(filter, key);
  }
  choice().first = 0;
}

void TopView::moveSorting(bool toTheRight) {
  const std::size_t columns = cellsOf(pane_, {}, {}).columns.size();
  std::size_t& sorted = choice().sortedBy;
  for (std::size_t tried = 0; tried < columns; ++tried) {
    sorted = (sorted + (toTheRight ? 1 : columns - 1)) % columns;
    if (!choice().isHidden[sorted]) break;
  }
  choice().isReversed = false;
}

void TopView::scroll(char32_t key) {
  std::size_t& first = choice().first;
  const std::size_t rows = pane_ == Pane::kSessions ? sessions_.size() : health_.nodes.size();
  const std::size_t step = key == kKeyPageUp || key == kKeyPageDown ? kPage : 1;
  if (key == kKeyUp || key == kKeyPageUp) first -= std::min(first, step);
  if (key == kKeyDown || key == kKeyPageDown) first = std::min(first + step, rows == 0 ? 0 : rows - 1);
}

std::vector<TopLine> TopView::helpPage() const {
  std::vector<TopLine> lines{{"twctl top", Style::kTitle},
                             {"< >     sort by the column to the left or right"},
                             {"r       reverse the order"},
                             {"/       show only rows with a text; Esc shows all"},
                             {"n Tab   the audio graph's nodes, or the sessions"},
                             {"p       pause, and go on"},
                             {"Up Down PgUp PgDn   scroll"},
                             {"h ?     this page; any key leaves it"},
                             {"q       quit"},
                             {""},
                             {"Columns, switched with their digits:"}};
  const TopCells cells = cellsOf(pane_, {}, {});
  for (std::size_t column = 0; column < cells.columns.size(); ++column) {
    lines.push_back({std::to_string(column + 1) + " " + (choice().isHidden[column] ? "  " : "* ") +
                     std::string(cells.columns[column].title)});
  }
  return lines;
}

void TopView::addHealth(std::vector<TopLine>& lines, std::size_t rows) const {
  if (health_.devices.empty()) {
    lines.push_back({"no device tells its processing times; tw-pipewire publishes them", Style::kFaint});
    return;
  }
  const std::size_t most = std::min(kMaxDeviceLines, std::max<std::size_t>(1, rows / 4));
  for (std::size_t at = 0; at < health_.devices.size(); ++at) {
    if (at + 1 == most && health_.devices.size() > most) {
      lines.push_back(
          {"... and " + std::to_string(health_.devices.size() - at) + " more devices", Style::kFaint});
      return;
    }
    const DeviceHealth& device = health_.devices[at];
    const bool isLate = device.worst.value_or(0) > 1.0;
    lines.push_back({deviceLine(device), isLate ? Style::kWarning : Style::kPlain});
  }
}

std::string TopView::footText() const {
  if (editsFilter_) return "only rows with: " + choice().filter + "_";
  std::string text = pane_ == Pane::kSessions ? "sessions" : "nodes";
  if (!choice().filter.empty()) text += " with \"" + choice().filter + "\"";
  if (isPaused_) text += ", paused";
  return text + "   h help  / filter  n " + (pane_ == Pane::kSessions ? "nodes" : "sessions") + "  q quit";
}

std::vector<TopLine> TopView::page(const TerminalSize& size) const {
  std::vector<TopLine> lines;
  if (showsHelp_) {
    lines = helpPage();
    if (lines.size() > size.rows) lines.resize(size.rows);
    return lines;
  }
  lines.push_back({topSummary(sessions_), Style::kTitle});
  addHealth(lines, size.rows);

  TopCells cells = cellsOf(pane_, sessions_, health_);
  std::erase_if(cells.rows, [&](const auto& row) { return !fits(row, choice().filter); });
  sort(cells, choice().sortedBy, choice().isReversed);
  std::vector<std::string> titles;
  std::vector<bool> isHidden;
  for (std::size_t column = 0; column < cells.columns.size(); ++column) {
    std::string title(cells.columns[column].title);
    const bool isFalling = cells.columns[column].isNumber != choice().isReversed;
    if (column == choice().sortedBy) title += isFalling ? kDown : kUp;
    titles.push_back(std::move(title));
    isHidden.push_back(choice().isHidden[column]);
  }
  FittedTable table(cells, std::move(titles), std::move(isHidden));
  table.fit(size.columns);
  lines.push_back({table.titles(), Style::kTitle});

  const std::size_t room = size.rows > lines.size() + 1 ? size.rows - lines.size() - 1 : 0;
  const std::size_t count = cells.rows.size();
  const std::size_t first = std::min(choice().first, count == 0 ? 0 : count - 1);
  const bool areMore = count - first > room;
  const std::size_t shown = areMore ? (room > 0 ? room - 1 : 0) : count - first;
  for (std::size_t at = first; at < first + shown; ++at) lines.push_back({table.row(at)});
  if (areMore && room > 0)
    lines.push_back({"... and " + std::to_string(count - first - shown) + " more", Style::kFaint});
  if (count == 0 && room > 0 && pane_ == Pane::kNodes) {
    lines.push_back({health_.nodes.empty() ? "no bridge tells what the graph's nodes do" : "no such node",
                     Style::kFaint});
  }
  if (lines.size() < size.rows) lines.push_back({footText(), Style::kFaint});
  if (lines.size() > size.rows) lines.resize(size.rows);
  return lines;
}

}  // namespace tonewerk
