// SPDX-License-Identifier: Apache-2.0
#include "tools/memory-usage/ProcReader.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <string_view>
#include <system_error>

namespace tonewerk {
namespace {

constexpr std::size_t kMostFileBytes = std::size_t{1} << 20;

// The file's text, and errno's value of why there is none. None of these files is empty.
int readFile(const std::string& path, std::string& text) {
  text.clear();
  errno = 0;
  const std::unique_ptr<std::FILE, int (*)(std::FILE*)> file(std::fopen(path.c_str(), "re"), &std::fclose);
  if (file == nullptr) return errno;
  std::array<char, 4096> buffer;
  while (text.size() < kMostFileBytes) {
    const std::size_t count = std::fread(buffer.data(), 1, buffer.size(), file.get());
    text.append(buffer.data(), count);
    if (count < buffer.size()) break;
  }
  if (std::ferror(file.get()) != 0) return errno;
  return text.empty() ? EIO : 0;
}

// The words of a text.
std::vector<std::string_view> wordsOf(std::string_view text) {
  std::vector<std::string_view> words;
  for (;;) {
    const std::size_t start = text.find_first_not_of(" \t\n");
    if (start == std::string_view::npos) return words;
    text.remove_prefix(start);
    words.push_back(text.substr(0, text.find_first_of(" \t\n")));
    text.remove_prefix(words.back().size());
  }
}

template <typename Number>
std::optional<Number> numberOf(std::string_view word) {
  Number number{};
  const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), number);
  if (error != std::errc() || end != word.data() + word.size()) return std::nullopt;
  return number;
}

// Lines of the form "Name:   value ...", as status and meminfo are.
class NamedLines {
 public:
  explicit NamedLines(std::string text) : text_("\n" + std::move(text)) {}

  std::optional<std::string_view> find(std::string_view name) const {
    const std::string start = "\n" + std::string(name) + ":";
    const std::size_t line = text_.find(start);
    if (line == std::string::npos) return std::nullopt;
    std::string_view value = std::string_view(text_).substr(line + start.size());
    value = value.substr(0, value.find('\n'));
    value.remove_prefix(std::min(value.find_first_not_of(" \t"), value.size()));
    return value;
  }
  // The first number of the line; 0 without one: not every kernel has every line.
  std::uint64_t number(std::string_view name) const {
    const auto words = wordsOf(find(name).value_or(std::string_view()));
    return words.empty() ? 0 : numberOf<std::uint64_t>(words.front()).value_or(0);
  }

 private:
  const std::string text_;
};

// Names are anybody's choice.
std::string printable(std::string_view name) {
  std::string text(name);
  std::replace_if(
      text.begin(), text.end(), [](char c) { return c < ' ' || c > '~'; }, '?');
  return text;
}

bool isGone(int error) { return error == ENOENT || error == ESRCH; }

double secondsOf(std::string_view ticks, double ticksPerSecond) {
  return static_cast<double>(numberOf<std::uint64_t>(ticks).value_or(0)) / ticksPerSecond;
}

// Of "PID (name) S ...", where the name may hold anything.
std::vector<std::string_view> wordsAfterName(std::string_view stat) {
  const std::size_t nameEnd = stat.rfind(')');
  return nameEnd == std::string_view::npos ? std::vector<std::string_view>()
                                           : wordsOf(stat.substr(nameEnd + 1));
}

}  // namespace

std::optional<UsageSnapshot> ProcReader::read(std::string& problem) const {
  std::error_code error;
  std::vector<std::string> numbers;
  for (std::filesystem::directory_iterator entry(root_, error), end; !error && entry != end;
       entry.increment(error)) {
    std::string name = entry->path().filename().string();
    if (numberOf<std::int32_t>(name).value_or(0) > 0) numbers.push_back(std::move(name));
  }
  if (error) {
    problem = root_ + ": " + error.message();
    return std::nullopt;
  }
  UsageSnapshot snapshot;
  for (const std::string& number : numbers) {
    ProcessUsage process;
    const Outcome outcome = readProcess(number, process);
    if (outcome == Outcome::kRead) snapshot.processes.push_back(std::move(process));
    if (outcome == Outcome::kUnreadable) ++snapshot.unreadable;
  }
  if (!readSystem(snapshot.system)) {
    problem = root_ + "/meminfo does not say how much memory there is";
    return std::nullopt;
  }
  std::sort(snapshot.processes.begin(), snapshot.processes.end(),
            [](const ProcessUsage& a, const ProcessUsage& b) { return a.process < b.process; });
  return snapshot;
}

ProcReader::Outcome ProcReader::readProcess(const std::string& number, ProcessUsage& process) const {
  const std::string directory = root_ + "/" + number;
  std::string text;
  if (const int error = readFile(directory + "/status", text)) {
    return isGone(error) ? Outcome::kGone : Outcome::kUnreadable;
  }
  const NamedLines status(std::move(text));
  // Neither a thread of the kernel nor a process that has ended has any.
  if (!status.find("RssAnon")) return Outcome::kWithoutMemory;
  process.process = numberOf<std::int32_t>(number).value_or(0);
  process.user = static_cast<std::uint32_t>(status.number("Uid"));
  process.name = printable(status.find("Name").value_or("?"));
  process.usage.anonymous = status.number("RssAnon");
  process.usage.shared = status.number("RssFile") + status.number("RssShmem");
  process.usage.locked = status.number("VmLck");
  process.usage.pinned = status.number("VmPin");
  process.usage.swapped = status.number("VmSwap");

  if (const int error = readFile(directory + "/stat", text)) {
    return isGone(error) ? Outcome::kGone : Outcome::kUnreadable;
  }
  constexpr std::size_t kUserTicks = 11;
  constexpr std::size_t kSystemTicks = 12;
  const auto words = wordsAfterName(text);
  if (words.size() <= kSystemTicks) return Outcome::kUnreadable;
  process.usage.userSeconds = secondsOf(words[kUserTicks], ticksPerSecond_);
  process.usage.systemSeconds = secondsOf(words[kSystemTicks], ticksPerSecond_);
  return Outcome::kRead;
}

bool ProcReader::readSystem(MemoryUsage& system) const {
  std::string text;
  if (readFile(root_ + "/meminfo", text) != 0) return false;
  const NamedLines memory(std::move(text));
  if (memory.number("MemTotal") == 0) return false;
  const auto difference = [&](std::string_view whole, std::uint64_t part) {
    const std::uint64_t total = memory.number(whole);
    return total - std::min(total, part);
  };
  system.anonymous = memory.number("AnonPages");
  system.shared = difference("MemTotal", memory.number("MemFree") + system.anonymous);
  system.locked = memory.number("Mlocked");
  system.pinned = memory.number("SUnreclaim") + memory.number("KernelStack") + memory.number("PageTables");
  system.swapped = difference("SwapTotal", memory.number("SwapFree"));
  readProcessorTime(system);
  return true;
}

// "cpu  user nice system idle iowait irq softirq ..."
void ProcReader::readProcessorTime(MemoryUsage& system) const {
  constexpr std::size_t kWords = 8;
  std::string text;
  if (readFile(root_ + "/stat", text) != 0) return;
  const auto words = wordsOf(std::string_view(text).substr(0, text.find('\n')));
  if (words.size() < kWords || words[0] != "cpu") return;
  const auto seconds = [&](std::size_t word) { return secondsOf(words[word], ticksPerSecond_); };
  system.userSeconds = seconds(1) + seconds(2);
  system.systemSeconds = seconds(3) + seconds(6) + seconds(7);
}

}  // namespace tonewerk
