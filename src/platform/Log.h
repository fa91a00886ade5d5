// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

#include "values/Value.h"

namespace tonewerk {

// Ordered from the least to the most important.
enum class LogLevel { kDebug, kInfo, kDefault, kError };

// Returns "debug", "info", "default" or "error".
std::string_view textOf(LogLevel level);

// Writes log lines. Any thread; each line is written as a whole.
class Log {
 public:
  virtual ~Log() = default;

  // Returns whether a line of this category code (such as "twrr") and level would be written. It is cheap,
  // because it runs for every line before the line is formatted.
  virtual bool isEnabled(std::string_view category, LogLevel level) const = 0;

  // Returns the lowest level that is written of this category, when it stays the same as long as the log
  // lives. None when isEnabled() is to be asked for each line.
  virtual std::optional<LogLevel> fixedThreshold(std::string_view /*category*/) const { return std::nullopt; }

  // Writes `message`, which includes the prefix. `subsystem` is for example "com.orvane.tonewerk". It reports
  // no failure: a line that cannot be written is lost.
  virtual void write(std::string_view subsystem, std::string_view category, LogLevel level,
                     std::string_view message) = 0;
};

// Writes the log lines of one area of the daemon. Any thread.
class LogCategory {
 public:
  // `log` outlives the category.
  LogCategory(Log& log, std::string_view subsystem, std::string_view code)
      : log_(log), subsystem_(subsystem), code_(code), threshold_(log.fixedThreshold(code)) {}
  LogCategory(const LogCategory&) = delete;
  LogCategory& operator=(const LogCategory&) = delete;

  bool isEnabled(LogLevel level) const {
    return threshold_ ? level >= *threshold_ : log_.isEnabled(code_, level);
  }
  void write(LogLevel level, std::string_view message) const {
    log_.write(subsystem_, code_, level, message);
  }

  std::string_view subsystem() const { return subsystem_; }
  std::string_view code() const { return code_; }

  // Free for the platform to use. It starts at zero.
  std::uint64_t word = 0;

 private:
  Log& log_;
  const std::string subsystem_;
  const std::string code_;
  const std::optional<LogLevel> threshold_;
};

// The functions below write log lines in the daemon's own form: "%25s:%-5d " of source file and line, then a
// message:
//
//   debugLog(TWReportingSessionCategory(), "stop called. reporterID=%lli", reporterID_);
//
// Below its category's threshold a line costs one comparison; its arguments are not converted to text. A
// conversion says how its argument is shown, and the argument's type says what it is: %@ shows anything, %i,
// %d, %u, %li, %lli, %lu, %ld and %zu an integer, %f a number with six decimals, %s a text. A format whose
// number of conversions differs from its number of arguments does not compile.

// Convert an argument to text. Add an overload for another type, or give the type a description().
inline void appendLogText(std::string& out, const Value& value) { out += value.text(); }
inline void appendLogText(std::string& out, const Value* value) { out += textOf(value); }
inline void appendLogText(std::string& out, const ValueMap& map) { out += map.text(); }
void appendLogNumber(std::string& out, double number, char conversion);

template <typename T>
concept Describable = requires(const T& object) {
  { object.description() } -> std::convertible_to<std::string>;
};

template <typename T>
void appendLogArgument(std::string& out, const T& argument, char conversion) {
  if constexpr (std::convertible_to<const T&, std::string_view>) {
    out += std::string_view(argument);
  } else if constexpr (std::floating_point<T>) {
    appendLogNumber(out, argument, conversion);
  } else if constexpr (std::integral<T>) {
    out += Value(argument).text();
  } else if constexpr (Describable<T>) {
    out += argument.description();
  } else if constexpr (std::is_invocable_v<const T&>) {
    appendLogArgument(out, argument(), conversion);  // the text is only made when it is needed
  } else if constexpr (requires { appendLogText(out, argument); }) {
    appendLogText(out, argument);
  } else if constexpr (
      requires { argument.has_value(); } || requires { argument.get(); }) {
    if (argument) {
      appendLogArgument(out, *argument, conversion);
    } else {
      out += "(null)";
    }
  } else {
    out += '(';
    for (bool first = true; const auto& element : argument) {
      if (!first) out += ", ";
      first = false;
      appendLogArgument(out, element, conversion);
    }
    out += ')';
  }
}

// Holds where a line was written. It is made from the category, so that the default arguments take the file
// and line of the call. Without a category nothing is written, so that a caller can ask once for many lines
// whether they are enabled.
struct LogSite {
  LogSite(const LogCategory* logCategory, const char* logFile = __builtin_FILE(),
          int logLine = __builtin_LINE())
      : category(logCategory), file(logFile), line(logLine) {}
  LogSite(const LogCategory& logCategory, const char* logFile = __builtin_FILE(),
          int logLine = __builtin_LINE())
      : LogSite(&logCategory, logFile, logLine) {}
  const LogCategory* category;
  const char* file;
  int line;
};

namespace log_detail {

struct Argument {
  const void* object;
  void (*append)(std::string& out, const void* object, char conversion);
};

template <typename T>
Argument argumentOf(const T& object) {
  return {&object, [](std::string& out, const void* held, char conversion) {
            appendLogArgument(out, *static_cast<const T*>(held), conversion);
          }};
}

constexpr bool isLengthModifier(char c) { return c == 'l' || c == 'z' || c == 'h'; }

constexpr std::size_t conversionsIn(std::string_view format) {
  std::size_t count = 0;
  for (std::size_t at = 0; at + 1 < format.size(); ++at) {
    if (format[at] != '%') continue;
    if (format[at + 1] == '%') {
      ++at;
    } else {
      ++count;
    }
  }
  return count;
}

void write(LogLevel level, const LogSite& site, std::string_view format, std::span<const Argument> arguments);

template <typename... Arguments>
struct CheckedFormat {
  consteval CheckedFormat(const char* format) : text(format) {
    if (conversionsIn(text) != sizeof...(Arguments)) throw "as many conversions as arguments";
  }
  std::string_view text;
};

template <typename... Arguments>
using Format = CheckedFormat<std::type_identity_t<Arguments>...>;

}  // namespace log_detail

// Returns "%25s:%-5d " of the file's base name without its ending, and the line.
std::string logPrefix(std::string_view file, int line);

// A line without arguments that is written very often. Its text is made once.
class FixedLogLine {
 public:
  explicit FixedLogLine(std::string_view message, const char* file = __builtin_FILE(),
                        int line = __builtin_LINE())
      : text_(logPrefix(file, line).append(message)) {}

  void write(LogLevel level, const LogCategory& category) const {
    if (category.isEnabled(level)) category.write(level, text_);
  }

 private:
  const std::string text_;
};

template <typename... Arguments>
void logLine(LogLevel level, const LogSite& site, std::string_view format, const Arguments&... arguments) {
  if (site.category == nullptr || !site.category->isEnabled(level)) return;
  const std::array<log_detail::Argument, sizeof...(Arguments)> held{log_detail::argumentOf(arguments)...};
  log_detail::write(level, site, format, held);
}

template <typename... Arguments>
void debugLog(LogSite site, log_detail::Format<Arguments...> format, const Arguments&... arguments) {
  logLine(LogLevel::kDebug, site, format.text, arguments...);
}
template <typename... Arguments>
void infoLog(LogSite site, log_detail::Format<Arguments...> format, const Arguments&... arguments) {
  logLine(LogLevel::kInfo, site, format.text, arguments...);
}
template <typename... Arguments>
void defaultLog(LogSite site, log_detail::Format<Arguments...> format, const Arguments&... arguments) {
  logLine(LogLevel::kDefault, site, format.text, arguments...);
}
template <typename... Arguments>
void errorLog(LogSite site, log_detail::Format<Arguments...> format, const Arguments&... arguments) {
  logLine(LogLevel::kError, site, format.text, arguments...);
}

}  // namespace tonewerk
