// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionMemoryLogWorker.h"

#include <array>
#include <cassert>
#include <future>
#include <optional>
#include <string>
#include <system_error>
#include <utility>

#include "platform/DetachedThreads.h"
#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "platform/LogLines.h"
#include "platform/accounts/WorkingFor.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingDefaults.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "workers/diagnostics/MemoryLogLimiter.h"
#include "workers/diagnostics/MemoryLogTool.h"

namespace tonewerk {
namespace {

constexpr std::string_view kMemoryTools = "memory_tools";
constexpr std::size_t kBlockBytes = 512;

using Commands = std::array<std::string, 2>;

// The preference if it is an array of two texts, else the default tools.
Commands toolCommands() {
  TWReportingContext& context = TWReportingContext::current();
  const auto& defaults = context.singletons().get<TWReportingDefaults>(context.platform().preferences);
  Commands commands{"tw-memory-usage", "slabtop --once"};
  const std::optional<Value> preference = defaults.read(kMemoryTools);
  if (!preference) return commands;
  const ValueArray* texts = preference->asArray();
  if (texts == nullptr || texts->size() != 2 || (*texts)[0].asString() == nullptr ||
      (*texts)[1].asString() == nullptr) {
    errorLog(TWReportingSessionCategory(), "%@ is not an array of two texts: %@", kMemoryTools, *preference);
    return commands;
  }
  return {(*texts)[0].asString()->string(), (*texts)[1].asString()->string()};
}

// Runs a tool on a thread of its own. The destructor waits for the tool, because the tool uses objects of the
// daemon that must not end before it.
class RunningTool {
 public:
  // Throws std::system_error when the thread cannot be started.
  RunningTool(std::string_view threadName, MemoryLogTool tool) {
    std::promise<std::string> promise;
    result_ = promise.get_future();
    const Platform& platform = TWReportingContext::current().platform();
    const std::error_code error = platform.threads.start(
        threadName, [tool = std::move(tool), &commands = platform.commands,
                     promise = std::move(promise)]() mutable { promise.set_value(tool.capture(commands)); });
    if (error) throw std::system_error(error, "thread constructor failed");
  }
  RunningTool(const RunningTool&) = delete;
  RunningTool& operator=(const RunningTool&) = delete;
  ~RunningTool() {
    if (result_.valid()) result_.wait();
  }

  [[nodiscard]] std::string result() { return result_.get(); }

 private:
  std::future<std::string> result_;
};

// The second tool is started first, and its output is logged first.
void logMemory() {
  Commands commands = toolCommands();
  const Heartbeat::LongWork waiting(MemoryLogTool::kLimits.time);
  RunningTool second("twr-memory-1", {std::move(commands[1]), MemoryLogTool::Filter::kNone});
  RunningTool first("twr-memory-0", {std::move(commands[0]), MemoryLogTool::Filter::kMemoryLines});
  TWReportingSessionMemoryLogWorker::writeBlocks(second.result());
  TWReportingSessionMemoryLogWorker::writeBlocks(first.result());
}

// Removes the next block from `text` and returns it. `hasLineEnds` becomes false when no line end follows the
// block, so that megabytes without a line end are not searched again for each block.
std::string_view takeBlock(std::string_view& text, bool& hasLineEnds) {
  std::size_t size = text.size();
  if (size >= kBlockBytes) {
    const std::size_t lineEnd = hasLineEnds ? text.find('\n', kBlockBytes) : std::string_view::npos;
    hasLineEnds = lineEnd != std::string_view::npos;
    size = hasLineEnds ? lineEnd + 1 : kBlockBytes;
  }
  const std::string_view block = text.substr(0, size);
  text.remove_prefix(size);
  return block;
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionMemoryLogWorker::kWorkerClass =
    workerClassOf<TWReportingSessionMemoryLogWorker>("TWReportingSessionMemoryLogWorker");

std::shared_ptr<TWReportingSessionMemoryLogWorker> TWReportingSessionMemoryLogWorker::initWithSession(
    const std::shared_ptr<TWReportingSession>& session) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (session->serviceType() != kServiceTest && !TWReportingUtilityIsInternalBuild()) return nullptr;
  auto worker = std::make_shared<TWReportingSessionMemoryLogWorker>();
  worker->session = session;
  return worker;
}

bool TWReportingSessionMemoryLogWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (message.type != kTypeMemoryLog) return false;
  // Everybody waits for the tools, so they are not for everybody.
  if (const Account* user = WorkingFor::accountIfAny(); user != nullptr && !user->isTrusted()) {
    errorLog(TWReportingSessionCategory(), "no memory log for user %u, who is not trusted", user->user());
    return false;
  }
  TWReportingContext& context = TWReportingContext::current();
  if (!context.singletons().get<MemoryLogLimiter>().claim(context.platform().clock)) return false;
  try {
    logMemory();
  } catch (const std::system_error& error) {
    errorLog(TWReportingSessionCategory(), "no memory log: %s", error.what());
  }
  return false;
}

void TWReportingSessionMemoryLogWorker::writeBlocks(std::string_view text) {
  const LogCategory& category = *TWReportingSessionCategory();
  const LogLines lines;
  std::size_t number = 1;
  bool hasLineEnds = true;
  while (!text.empty()) {
    const std::string_view block = takeBlock(text, hasLineEnds);
    if (!category.isEnabled(LogLevel::kError)) continue;
    errorLog(category, "WIRED LOG BLOCK %zu\n%s", number, block);
    ++number;
  }
}

}  // namespace tonewerk
