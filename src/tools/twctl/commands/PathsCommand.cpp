// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "platform/linux/store/StoreFile.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/Suggestion.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

using NamedPath = std::pair<std::string, std::string>;

// There may be several sockets. Clients try them in this order.
std::vector<NamedPath> pathsOf(const Tool& tool) {
  const Directories directories = tool.directories();
  std::vector<NamedPath> paths{{"store", storeFileIn(directories.state).path},
                               {"runtime", directories.runtime},
                               {"state", directories.state},
                               {"logs", directories.logs},
                               {"configuration", directories.configuration}};
  for (const std::string& socket : tool.socketPaths()) paths.emplace_back("socket", socket);
  return paths;
}

void showPaths(Tool& tool, const std::string& name) {
  std::vector<std::string> names;
  std::vector<NamedPath> shown;
  for (const NamedPath& path : pathsOf(tool)) {
    if (names.empty() || names.back() != path.first) names.push_back(path.first);
    if (name.empty() || path.first == name) shown.push_back(path);
  }
  if (shown.empty()) {
    tool.status = tool.fail(kWrongUsage, "there is no path '" + name + "'; " + hintFor(name, names));
  } else if (name.empty() || tool.asJson) {
    Table table(tool.out, tool.asJson, {"name", "path"});
    for (const NamedPath& path : shown) table.add({Value(path.first), Value(path.second)});
  } else {
    for (const NamedPath& path : shown) tool.out << path.second << '\n';
  }
}

}  // namespace

void addPathsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "paths", "Where the store and the daemon's directories are");
  command.footer(
      "Only one, by itself, for other programs:\n"
      "  sqlite3 -readonly \"$(twctl paths store)\" .tables");
  const auto name = std::make_shared<std::string>();
  command.add_option("NAME", *name, "Only this path")
      ->type_name("store|runtime|state|logs|configuration|socket");
  command.callback([&tool, name] { showPaths(tool, *name); });
}

}  // namespace tonewerk
