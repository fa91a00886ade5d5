// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <chrono>
#include <memory>
#include <string>
#include <thread>

#include "platform/Log.h"
#include "platform/linux/channels/LinuxChanmeter.h"
#include "tools/twctl/ToolLog.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/ChannelPrinter.h"
#include "tools/twctl/show/PagedOutput.h"

namespace tonewerk {
namespace {

struct ChannelsOptions {
  ChannelFilter filter;
  bool watches = false;
  double seconds = 1;
};

void watch(const Tool& tool, ChannelPrinter& printer, double seconds) {
  using Clock = std::chrono::steady_clock;
  const auto interval = std::chrono::duration_cast<Clock::duration>(std::chrono::duration<double>(seconds));
  for (Clock::time_point next = Clock::now(); tool.out; next += interval) {
    std::this_thread::sleep_until(next);
    printer.printChanges(
        std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count());
  }
}

void showChannels(Tool& tool, const ChannelsOptions& options) {
  ToolLog log(tool);
  const LogCategory category(log, "com.orvane.tonewerk", "twctl");
  LinuxChanmeter chanmeter(tool.directories().runtime + "/channels", category);
  ChannelPrinter printer(tool, chanmeter, options.filter);
  if (options.watches) {
    watch(tool, printer, options.seconds);
    return;
  }
  const PagedOutput pages(tool);
  if (!printer.printValues()) tool.status = kRefused;  // the log has said why
}

// Reads the interval. Returns the problem, or an empty text.
std::string takeInterval(const std::string& text, ChannelsOptions& options) {
  std::string problem = problemWithSeconds(text);
  if (problem.empty()) options.seconds = valueOfArgument(text).number();
  return problem;
}

}  // namespace

void addChannelsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "channels", "The driver channels there are, published and the kernel's");
  command.footer(
      "A pattern has *, ? and [...]. The sources are read whether a daemon runs or not; one that cannot be "
      "is\n"
      "named, and the exit status is then 1.");
  const auto options = std::make_shared<ChannelsOptions>();
  // The parser calls no other function for an option whose value is left out.
  command.parse_complete_callback([&command, options] { options->watches = command.count("--watch") > 0; });
  command.add_option("--driver", options->filter.driver, "Only of drivers that this pattern fits")
      ->type_name("GLOB");
  command.add_option("--group", options->filter.group, "Only of groups that this pattern fits")
      ->type_name("GLOB");
  const auto interval = std::make_shared<std::string>();
  command
      .add_option("--watch", *interval,
                  "What changes in each interval of so many seconds (1), until interrupted")
      ->expected(0, 1)
      ->type_name("SECONDS")
      ->check([options](const std::string& text) { return takeInterval(text, *options); });
  const std::string counts = "drivers count for all programs together; ";
  EventFilterOptions::refuse(
      command, {"--app", "--service", "--session"},
      counts + "the view channel_value has what they counted while a session ran, see `twctl sql`");
  EventFilterOptions::refuse(command, {"--device"}, "channels are of drivers; use --driver");
  EventFilterOptions::refuse(command, {"--since", "--until", "-n,--limit"},
                             "channels have only their values of now; --watch shows how they change");
  command.callback([&tool, options, interval] { showChannels(tool, *options); });
}

}  // namespace tonewerk
