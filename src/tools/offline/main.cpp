// SPDX-License-Identifier: Apache-2.0
//
// tw-replay plays a recording to the daemon's own core, without a daemon, and keeps the reports in a new
// store. `twctl replay --offline` runs it as a separate process, because twctl is a client and has no part of
// the daemon. It speaks with the voice of twctl.

#include <atomic>
#include <csignal>
#include <cstddef>
#include <iostream>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Log.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "protocol/Requests.h"
#include "tools/offline/OfflineReplay.h"
#include "tools/offline/ReasonRecorder.h"
#include "tools/recording/RecordingFile.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/Tool.h"
#include "tools/twctl/ToolLog.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

std::atomic<bool> isInterrupted = false;
static_assert(std::atomic<bool>::is_always_lock_free, "the handler of signals writes it");

void interrupt(int /*signal*/) { isInterrupted = true; }

int replay(Tool& tool, JsonService& json, bool tellsReasons, const std::string& file,
           const std::string& store) {
  std::string problem;
  const std::optional<Recording> recording = readRecordingFile(file, requests::all(), tool.json, problem);
  if (recording) problem = OfflineReplay::problemWith(*recording, tool.json);
  if (!problem.empty()) return tool.fail(kWrongUsage, file + ": " + problem);

  ToolLog toolLog(tool);
  const LogCategory log(toolLog, "com.orvane.tonewerk", "twrs");
  std::size_t refused = 0;
  OfflineReplay offline(json, log, [&](const RecordedStep& call, const ReplyError& error) {
    ++refused;
    tool.status = tool.fail(kRefused, file + ": line " + std::to_string(call.line) + ": " +
                                          DaemonCalls::describe(call.method, error));
  });
  ReasonRecorder recorder(tool.out);
  std::optional<ReasonTrace::Scope> scope;
  if (tellsReasons) scope.emplace(recorder);
  problem = offline.play(*recording, store, isInterrupted);
  // Another status than that of a refused request: the reasons are not whole.
  if (!problem.empty()) return tool.fail(tellsReasons ? kWrongUsage : kRefused, problem);
  if (tellsReasons) return tool.out.flush() ? tool.status : tool.fail(kWrongUsage, "cannot write the output");
  Table(tool.out, tool.asJson, {"requests", "refused"}).add({Value(recording->requests()), Value(refused)});
  if (!tool.out.flush()) return tool.fail(kRefused, "cannot write the output");
  return tool.status;
}

int run(int argc, char** argv) {
  NlohmannJsonService json;
  Tool tool{std::cout, std::cerr, json};
  tool.asJson = argc == 4 && std::string_view(argv[1]) == "--json";
  const bool tellsReasons = argc == 4 && std::string_view(argv[1]) == "--reasons";
  if (argc != 3 && !tool.asJson && !tellsReasons) {
    std::cerr << "usage: tw-replay [--json | --reasons] FILE STORE\n";
    return kWrongUsage;
  }
  std::signal(SIGINT, interrupt);
  std::signal(SIGTERM, interrupt);
  std::signal(SIGHUP, interrupt);
  std::signal(SIGXFSZ, SIG_IGN);  // writing past the file size limit then fails instead of ending the process
  return replay(tool, json, tellsReasons, argv[argc - 2], argv[argc - 1]);
}

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) { return tonewerk::run(argc, argv); }
