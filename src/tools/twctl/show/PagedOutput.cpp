// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/PagedOutput.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <optional>
#include <ostream>
#include <spawn.h>
#include <sstream>
#include <streambuf>
#include <string>
#include <string_view>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "tools/twctl/Tool.h"
#include "tools/twctl/show/Terminal.h"

namespace tonewerk {
namespace {

using Words = std::vector<std::string>;

std::optional<std::string> variable(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? std::nullopt : std::optional<std::string>(value);
}

// Divides at spaces. What is in quotes stays together.
Words wordsOf(std::string_view text) {
  Words words;
  char quote = 0;
  bool isWithin = false;
  for (const char c : text) {
    if (quote == 0 && (c == ' ' || c == '\t')) {
      isWithin = false;
      continue;
    }
    if (!std::exchange(isWithin, true)) words.emplace_back();
    if (c == quote) {
      quote = 0;
    } else if (quote == 0 && (c == '\'' || c == '"')) {
      quote = c;
    } else {
      words.back() += c;
    }
  }
  return words;
}

// Empty for none. For a user who may run this program as another one, the pager must not start others.
Words pagerCommand() {
  if (variable("SUDO_UID")) return {"less"};
  std::optional<std::string> pager = variable("TONEWERK_PAGER");
  if (!pager) pager = variable("PAGER");
  const Words words = wordsOf(pager.value_or("less"));
  return words == Words{"cat"} ? Words() : words;
}

// Quits at the end of what fits the screen, shows colours, cuts nothing but shows long lines by scrolling
// sideways, and leaves its last screen on the terminal.
Words pagerEnvironment() {
  Words all;
  for (char** entry = environ; *entry != nullptr; ++entry) all.emplace_back(*entry);
  if (!variable("LESS")) all.emplace_back("LESS=FRSX");
  if (!variable("LESSCHARSET")) all.emplace_back("LESSCHARSET=utf-8");
  if (variable("SUDO_UID")) all.emplace_back("LESSSECURE=1");
  return all;
}

std::vector<char*> pointersTo(Words& words) {
  std::vector<char*> pointers;
  for (std::string& word : words) pointers.push_back(word.data());
  pointers.push_back(nullptr);
  return pointers;
}

// A running pager.
class Pager {
 public:
  // None when it cannot be started.
  static std::unique_ptr<Pager> start(Words command, int terminal) {
    std::array<int, 2> ends{-1, -1};
    if (::pipe2(ends.data(), O_CLOEXEC) != 0) return nullptr;
    const FileDescriptor itsEnd(ends[0]);
    FileDescriptor ourEnd(ends[1]);
    posix_spawn_file_actions_t actions;
    posix_spawnattr_t attributes;
    posix_spawn_file_actions_init(&actions);
    posix_spawnattr_init(&attributes);
    posix_spawn_file_actions_adddup2(&actions, itsEnd.get(), STDIN_FILENO);
    posix_spawn_file_actions_adddup2(&actions, terminal, STDOUT_FILENO);
    sigset_t asUsual;
    sigemptyset(&asUsual);
    for (const int number : kSignals) sigaddset(&asUsual, number);
    posix_spawnattr_setsigdefault(&attributes, &asUsual);
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF);
    Words environment = pagerEnvironment();
    pid_t process = -1;
    const int problem = ::posix_spawnp(&process, command.front().c_str(), &actions, &attributes,
                                       pointersTo(command).data(), pointersTo(environment).data());
    posix_spawn_file_actions_destroy(&actions);
    posix_spawnattr_destroy(&attributes);
    return problem != 0 ? nullptr : std::unique_ptr<Pager>(new Pager(process, std::move(ourEnd)));
  }
  Pager(const Pager&) = delete;
  Pager& operator=(const Pager&) = delete;
  // Waits for its end.
  ~Pager() {
    input_ = FileDescriptor();
    // The command may have changed them meanwhile.
    for (const int number : kSignals) std::signal(number, SIG_IGN);
    while (::waitpid(process_, nullptr, 0) < 0 && errno == EINTR) {
    }
    for (std::size_t at = 0; at < kSignals.size(); ++at) ::sigaction(kSignals[at], &before_[at], nullptr);
  }

  // False when it reads no more.
  bool write(std::string_view text) {
    while (!text.empty()) {
      const ssize_t count = ::write(input_.get(), text.data(), text.size());
      if (count < 0 && errno == EINTR) continue;
      if (count < 0) return false;
      text.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
  }

 private:
  // The keys for the first two are meant for the pager.
  static constexpr std::array kSignals{SIGINT, SIGQUIT, SIGPIPE};

  Pager(pid_t process, FileDescriptor input) : process_(process), input_(std::move(input)) {
    for (std::size_t at = 0; at < kSignals.size(); ++at) {
      struct sigaction ignore {};
      ignore.sa_handler = SIG_IGN;
      ::sigaction(kSignals[at], &ignore, &before_[at]);
    }
  }

  const pid_t process_;
  FileDescriptor input_;
  std::array<struct sigaction, kSignals.size()> before_{};
};

}  // namespace

class PagedOutput::Pages final : public std::streambuf {
 public:
  Pages(const Tool& tool, Words command, TerminalSize size)
      : tool_(tool),
        command_(std::move(command)),
        size_(size),
        out_(tool.out.rdbuf(this)),
        err_(tool.err.rdbuf(&errors_)) {}
  Pages(const Pages&) = delete;
  Pages& operator=(const Pages&) = delete;
  ~Pages() override {
    if (pager_ != nullptr) {
      (void)passOn();
      pager_.reset();
    }
    tool_.out.rdbuf(out_);  // which also clears the failure of a reader that has left early
    tool_.err.rdbuf(err_);
    tool_.out << waiting_ << std::flush;
    tool_.err << errors_.str() << std::flush;
  }

 protected:
  int_type overflow(int_type character) override {
    if (traits_type::eq_int_type(character, traits_type::eof())) return traits_type::not_eof(character);
    const char c = traits_type::to_char_type(character);
    return xsputn(&c, 1) == 1 ? character : traits_type::eof();
  }
  std::streamsize xsputn(const char* text, std::streamsize length) override {
    if (isPlain_) return out_->sputn(text, length);
    waiting_.append(text, static_cast<std::size_t>(length));
    const bool isTaken = pager_ != nullptr ? waiting_.size() < kPortion || passOn() : !isLong() || begin();
    return isTaken ? length : 0;
  }

 private:
  static constexpr std::size_t kPortion = 8192;

  // Whether it does not fit the screen above the shell's prompt. Counts bytes: what is too much, less finds
  // out itself.
  bool isLong() {
    for (; counted_ < waiting_.size(); ++counted_) {
      const bool isEnd = waiting_[counted_] == '\n';
      if (isEnd || ++column_ > size_.columns) {
        ++lines_;
        column_ = isEnd ? 0 : 1;
      }
    }
    return lines_ >= size_.rows;
  }
  bool begin() {
    pager_ = Pager::start(command_, tool_.outDescriptor);
    if (pager_ != nullptr) return passOn();
    isPlain_ = true;
    const std::string text = std::exchange(waiting_, {});
    const auto length = static_cast<std::streamsize>(text.size());
    return out_->sputn(text.data(), length) == length;
  }
  bool passOn() {
    const std::string text = std::exchange(waiting_, {});
    return pager_->write(text);
  }

  const Tool& tool_;
  const Words command_;
  const TerminalSize size_;
  std::stringbuf errors_;
  std::streambuf* const out_;
  std::streambuf* const err_;
  std::string waiting_;      // to be written
  std::size_t counted_ = 0;  // bytes of `waiting_` that are in `lines_` and `column_`
  std::size_t lines_ = 0;
  std::size_t column_ = 0;
  bool isPlain_ = false;  // there is no pager
  std::unique_ptr<Pager> pager_;
};

PagedOutput::PagedOutput(const Tool& tool) {
  if (!tool.outIsTerminal || tool.asJson || tool.withoutPager || tool.outDescriptor < 0 || !tool.out) return;
  if (variable("TERM") == "dumb") return;
  const std::optional<TerminalSize> size = terminalSizeOf(tool.outDescriptor);
  Words command = pagerCommand();
  if (size && !command.empty()) pages_ = std::make_unique<Pages>(tool, std::move(command), *size);
}

PagedOutput::~PagedOutput() = default;

}  // namespace tonewerk
