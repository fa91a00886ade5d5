// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "tools/twctl/show/AudioHealth.h"
#include "tools/twctl/show/SessionRates.h"
#include "tools/twctl/show/Terminal.h"

namespace tonewerk {

// A key that was pressed: a character, or one of these.
enum TopKey : char32_t {
  kKeyControlC = 0x03,
  kKeyTab = 0x09,
  kKeyEnter = 0x0D,
  kKeyEscape = 0x1B,
  kKeyUp = 0x110000,  // beyond all characters
  kKeyDown,
  kKeyLeft,
  kKeyRight,
  kKeyPageUp,
  kKeyPageDown,
  kKeyBackspace,
};

// A line of a page. Its text is printable UTF-8; the terminal cuts what is too long.
struct TopLine {
  enum class Style { kPlain, kTitle, kWarning, kFaint };

  std::string text;
  Style style = Style::kPlain;
};

// What `twctl top` shows on a terminal, and how its keys change that. Nothing here reads or writes.
//
//   3 sessions, 12.3 messages a second, 2 overloads
//   speaker: 34 % of the period, less than 50 % at worst, 2 xruns     one line a device, or how to get them
//   application        client     msg/s↓  overloads            the columns that fit, the sorted one marked
//   org.example.Player player 11  12.3    2
//   sessions   h help  q quit
class TopView {
 public:
  enum class Pane { kSessions, kNodes };

  // Replaces what is shown.
  void update(std::vector<SessionRow> sessions, AudioHealth health);

  // Changes what page() returns. False when the user wants to leave.
  [[nodiscard]] bool press(char32_t key);
  // While paused, whoever calls update() should not.
  bool isPaused() const { return isPaused_; }

  // Exactly as many lines as the terminal has rows, or fewer.
  std::vector<TopLine> page(const TerminalSize& size) const;

 private:
  static constexpr std::size_t kMaxColumns = 9;  // each is switched with a digit

  // How a pane is shown.
  struct Choice {
    std::size_t sortedBy = 0;
    bool isReversed = false;
    std::array<bool, kMaxColumns> isHidden{};
    std::string filter = {};
    std::size_t first = 0;  // row shown
  };

  Choice& choice() { return choices_[static_cast<std::size_t>(pane_)]; }
  const Choice& choice() const { return choices_[static_cast<std::size_t>(pane_)]; }
  void editFilter(char32_t key);
  void moveSorting(bool toTheRight);
  void scroll(char32_t key);
  std::vector<TopLine> helpPage() const;
  void addHealth(std::vector<TopLine>& lines, std::size_t rows) const;
  std::string footText() const;

  std::vector<SessionRow> sessions_;
  AudioHealth health_;
  Pane pane_ = Pane::kSessions;
  // Busiest first.
  std::array<Choice, 2> choices_{Choice{.sortedBy = 4}, Choice{.sortedBy = 1}};
  bool isPaused_ = false;
  bool showsHelp_ = false;
  bool editsFilter_ = false;
};

}  // namespace tonewerk
