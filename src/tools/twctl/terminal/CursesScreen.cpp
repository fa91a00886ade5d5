// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/terminal/CursesScreen.h"

#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <langinfo.h>
#include <string>
#include <string_view>
#include <unistd.h>
#include <utility>

#include "tools/twctl/terminal/TerminalKind.h"

// The library's macros have names such as "clear" and "timeout".
#define NCURSES_NOMACROS
#define NCURSES_WIDECHAR 1
#include <curses.h>

namespace tonewerk {
namespace {

constexpr int kEscapeMilliseconds = 50;  // between Esc and the rest of a key's bytes

struct CloseFile {
  void operator()(std::FILE* file) const { static_cast<void>(std::fclose(file)); }
};
using File = std::unique_ptr<std::FILE, CloseFile>;

File fileOf(int descriptor, const char* mode) {
  if (descriptor < 0) return File(std::fopen("/dev/null", mode));
  const int own = ::dup(descriptor);
  return own < 0 ? nullptr : File(::fdopen(own, mode));
}

void useUtf8() {
  std::setlocale(LC_CTYPE, "");
  if (std::string_view(::nl_langinfo(CODESET)) != "UTF-8") std::setlocale(LC_CTYPE, "C.UTF-8");
}

// What fits the columns, by the width of each character. Characters that the terminal does not know become
// '?'.
std::wstring fitting(const std::string& text, std::size_t columns) {
  std::wstring fitted;
  std::mbstate_t state{};
  std::size_t used = 0;
  for (std::size_t at = 0; at < text.size();) {
    wchar_t character = L'?';
    const std::size_t length = std::mbrtowc(&character, text.data() + at, text.size() - at, &state);
    if (length == 0 || length > text.size()) {  // a zero, or not a character
      character = L'?';
      state = {};
      ++at;
    } else {
      at += length;
    }
    int width = ::wcwidth(character);
    if (width < 0) {
      character = L'?';
      width = 1;
    }
    if (used + static_cast<std::size_t>(width) > columns) break;
    used += static_cast<std::size_t>(width);
    fitted += character;
  }
  return fitted;
}

attr_t attributeOf(TopLine::Style style) {
  switch (style) {
    case TopLine::Style::kTitle:
      return A_BOLD;
    case TopLine::Style::kWarning:
      return A_REVERSE;
    case TopLine::Style::kFaint:
      return A_DIM;
    case TopLine::Style::kPlain:
      break;
  }
  return A_NORMAL;
}

std::optional<char32_t> specialKey(wint_t key) {
  switch (key) {
    case KEY_UP:
      return kKeyUp;
    case KEY_DOWN:
      return kKeyDown;
    case KEY_LEFT:
      return kKeyLeft;
    case KEY_RIGHT:
      return kKeyRight;
    case KEY_PPAGE:
      return kKeyPageUp;
    case KEY_NPAGE:
      return kKeyPageDown;
    case KEY_BACKSPACE:
      return kKeyBackspace;
    case KEY_ENTER:
      return kKeyEnter;
    default:
      return std::nullopt;
  }
}

}  // namespace

struct CursesScreen::State {
  File in;
  File out;
  int outDescriptor = -1;
  SCREEN* screen = nullptr;
};

std::unique_ptr<CursesScreen> CursesScreen::open(int inDescriptor, int outDescriptor) {
  const char* name = std::getenv("TERM");
  if (name == nullptr || !canShowPages(name, outDescriptor)) return nullptr;
  useUtf8();
  auto state = std::make_unique<State>();
  state->in = fileOf(inDescriptor, "r");
  state->out = fileOf(outDescriptor, "w");
  state->outDescriptor = outDescriptor;
  if (state->in == nullptr || state->out == nullptr) return nullptr;
  state->screen = ::newterm(name, state->out.get(), state->in.get());
  if (state->screen == nullptr) return nullptr;
  return std::unique_ptr<CursesScreen>(new CursesScreen(std::move(state)));
}

CursesScreen::CursesScreen(std::unique_ptr<State> state) : state_(std::move(state)) {
  ::set_escdelay(kEscapeMilliseconds);
  ::raw();
  ::noecho();
  ::nonl();
  ::keypad(::stdscr, true);
  ::nodelay(::stdscr, true);
  ::curs_set(0);
}

CursesScreen::~CursesScreen() {
  ::endwin();
  ::delscreen(state_->screen);
}

TerminalSize CursesScreen::size() const {
  return terminalSizeOf(state_->outDescriptor).value_or(TerminalSize());
}

void CursesScreen::resize() {
  const TerminalSize now = size();
  ::resizeterm(static_cast<int>(now.rows), static_cast<int>(now.columns));
}

void CursesScreen::show(const std::vector<TopLine>& lines) {
  const TerminalSize now = size();
  ::werase(::stdscr);
  for (std::size_t row = 0; row < lines.size() && row < now.rows; ++row) {
    ::wattrset(::stdscr, static_cast<int>(attributeOf(lines[row].style)));
    const std::wstring text = fitting(lines[row].text, now.columns);
    ::mvwaddnwstr(::stdscr, static_cast<int>(row), 0, text.c_str(), static_cast<int>(text.size()));
  }
  ::wattrset(::stdscr, A_NORMAL);
  ::wrefresh(::stdscr);
}

std::optional<char32_t> CursesScreen::takeKey() {
  for (;;) {
    wint_t key = 0;
    const int kind = ::wget_wch(::stdscr, &key);
    if (kind == OK) return static_cast<char32_t>(key);
    if (kind != KEY_CODE_YES) return std::nullopt;
    if (const auto special = specialKey(key)) return special;
  }
}

}  // namespace tonewerk
