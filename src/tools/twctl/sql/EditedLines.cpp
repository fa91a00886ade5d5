// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/EditedLines.h"

#include <clocale>
#include <cstdio>
#include <histedit.h>
#include <utility>

#include "tools/twctl/sql/SqlCompletion.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr int kKeptLines = 1000;
// How many words are listed for a choice.
constexpr std::size_t kMaxShown = 60;

}  // namespace

struct EditedLines::Editor {
  Editor(std::string historyFile, Complete completeLine)
      : file(std::move(historyFile)), complete(std::move(completeLine)) {}

  EditLine* line = nullptr;
  History* history = nullptr;
  std::string file;
  Complete complete;
  std::string prompt;
  bool isCancelled = false;

  static Editor& of(EditLine* line) {
    void* editor = nullptr;
    el_get(line, EL_CLIENTDATA, &editor);
    return *static_cast<Editor*>(editor);
  }
  static char* promptOf(EditLine* line) { return of(line).prompt.data(); }
  static unsigned char cancel(EditLine* line, int key);
  static unsigned char completeWord(EditLine* line, int key);
};

unsigned char EditedLines::Editor::cancel(EditLine* line, int /*key*/) {
  of(line).isCancelled = true;
  return CC_NEWLINE;
}

// Completes what is certain. When there is a choice, it is listed, and the line shown again below.
unsigned char EditedLines::Editor::completeWord(EditLine* line, int /*key*/) {
  const LineInfo* const info = el_line(line);
  const std::string_view before(info->buffer, static_cast<std::size_t>(info->cursor - info->buffer));
  const std::string_view word = SqlCompletion::wordAtEnd(before);
  const std::vector<std::string> words = of(line).complete(before);
  if (words.empty()) return CC_REFRESH_BEEP;
  const std::string begin = commonBegin(words);
  if (words.size() == 1 || begin.size() > word.size()) {
    el_deletestr(line, static_cast<int>(word.size()));
    el_insertstr(line, (begin + (words.size() == 1 ? " " : "")).c_str());
    return CC_REFRESH;
  }
  std::string list = "\n";
  for (std::size_t at = 0; at < words.size() && at < kMaxShown; ++at) list += words[at] + "  ";
  if (words.size() > kMaxShown) list += "...";
  std::fputs((printableLines(list) + "\n").c_str(), stdout);
  return CC_REDISPLAY;
}

EditedLines::EditedLines(std::string history, Complete complete)
    : editor_(std::make_unique<Editor>(std::move(history), std::move(complete))) {
  std::setlocale(LC_CTYPE, "");  // the library asks it how wide characters are
  editor_->line = el_init("twctl", stdin, stdout, stderr);
  editor_->history = history_init();
  if (editor_->line == nullptr || editor_->history == nullptr) return;
  HistEvent event{};
  ::history(editor_->history, &event, H_SETSIZE, kKeptLines);
  ::history(editor_->history, &event, H_SETUNIQUE, 1);
  ::history(editor_->history, &event, H_LOAD, editor_->file.c_str());

  EditLine* const line = editor_->line;
  el_set(line, EL_CLIENTDATA, editor_.get());
  el_set(line, EL_PROMPT, Editor::promptOf);
  el_set(line, EL_EDITOR, "emacs");
  el_set(line, EL_HIST, ::history, editor_->history);
  el_set(line, EL_SIGNAL, 1);  // a signal that ends the process leaves the terminal as it was
  // el_set() would copy the names and never free them.
  el_wset(line, EL_ADDFN, L"tw-cancel", L"Drop the line", Editor::cancel);
  el_wset(line, EL_ADDFN, L"tw-complete", L"Complete the word", Editor::completeWord);
  el_source(line, nullptr);
  // While a line is edited, Ctrl-C is a key. While a query runs, it is a signal.
  el_set(line, EL_SETTY, "-d", "-isig", nullptr);
  el_set(line, EL_BIND, "^C", "tw-cancel", nullptr);
  el_set(line, EL_BIND, "\t", "tw-complete", nullptr);
}

EditedLines::~EditedLines() {
  if (editor_->history != nullptr) {
    HistEvent event{};
    ::history(editor_->history, &event, H_SAVE, editor_->file.c_str());
  }
  if (editor_->line != nullptr) el_end(editor_->line);
  if (editor_->history != nullptr) history_end(editor_->history);
}

LineReader::Line EditedLines::read(const std::string& prompt) {
  if (editor_->line == nullptr || editor_->history == nullptr) return {};
  editor_->prompt = prompt;
  editor_->isCancelled = false;
  int length = 0;
  const char* const typed = el_gets(editor_->line, &length);
  if (typed == nullptr || length <= 0)
    return editor_->isCancelled ? Line{Line::Kind::kCancelled, ""} : Line{};
  std::string text(typed, static_cast<std::size_t>(length));
  while (!text.empty() && (text.back() == '\n' || text.back() == '\r')) text.pop_back();
  if (editor_->isCancelled) {
    std::fputs("^C\n", stdout);
    return {Line::Kind::kCancelled, ""};
  }
  HistEvent event{};
  if (!text.empty()) ::history(editor_->history, &event, H_ENTER, text.c_str());
  return {Line::Kind::kText, text};
}

}  // namespace tonewerk
