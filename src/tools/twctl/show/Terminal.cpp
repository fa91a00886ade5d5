// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/Terminal.h"

#include <ostream>
#include <sys/ioctl.h>
#include <termios.h>

namespace tonewerk {
namespace {

constexpr char kEnter[] = "\x1b[?1049h\x1b[?25l";  // the alternate screen, without a cursor
constexpr char kLeave[] = "\x1b[?25h\x1b[?1049l";
constexpr char kHome[] = "\x1b[H";
constexpr char kClearRestOfLine[] = "\x1b[K";
constexpr char kClearBelow[] = "\x1b[J";

}  // namespace

std::optional<TerminalSize> terminalSizeOf(int descriptor) {
  winsize size{};
  if (::ioctl(descriptor, TIOCGWINSZ, &size) != 0 || size.ws_col == 0 || size.ws_row == 0)
    return std::nullopt;
  return TerminalSize{size.ws_col, size.ws_row};
}

struct Terminal::InputModes {
  termios modes{};
};

Terminal::Terminal(std::ostream& out, int inDescriptor, int outDescriptor)
    : out_(out),
      inDescriptor_(inDescriptor),
      outDescriptor_(outDescriptor),
      before_([inDescriptor]() -> std::unique_ptr<InputModes> {
        auto modes = std::make_unique<InputModes>();
        return ::tcgetattr(inDescriptor, &modes->modes) == 0 ? std::move(modes) : nullptr;
      }()) {
  if (before_ != nullptr) {
    termios modes = before_->modes;
    modes.c_lflag &= ~static_cast<tcflag_t>(ICANON | ECHO | ISIG);
    modes.c_cc[VMIN] = 1;
    modes.c_cc[VTIME] = 0;
    ::tcsetattr(inDescriptor_, TCSANOW, &modes);
  }
  out_ << kEnter << std::flush;
}

Terminal::~Terminal() {
  out_ << kLeave << std::flush;
  if (before_ != nullptr) ::tcsetattr(inDescriptor_, TCSAFLUSH, &before_->modes);
}

TerminalSize Terminal::size() const { return terminalSizeOf(outDescriptor_).value_or(TerminalSize()); }

// Writes over the previous page, so that the screen does not flicker. There is no line end after the last
// line: if the page fills the screen, it would scroll the first line away.
void Terminal::show(const std::vector<std::string>& lines) {
  out_ << kHome;
  for (std::size_t at = 0; at < lines.size(); ++at) {
    out_ << (at == 0 ? "" : "\n") << lines[at] << kClearRestOfLine;
  }
  out_ << kClearBelow << std::flush;
}

}  // namespace tonewerk
