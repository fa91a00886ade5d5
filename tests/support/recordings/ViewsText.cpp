// SPDX-License-Identifier: Apache-2.0
#include "support/recordings/ViewsText.h"

#include <chrono>
#include <filesystem>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreFile.h"
#include "platform/linux/store/StoreViews.h"
#include "values/Date.h"

namespace tonewerk {
namespace {

bool isTime(std::string_view column) { return column == "at" || column.ends_with("_at"); }

// False when it cannot be read.
bool appendRows(SqliteDatabase& database, const StoreView& view, std::string& text) {
  SqliteStatement select = database.prepare("SELECT * FROM " + std::string(view.name));
  SqliteStatement::Step step = SqliteStatement::Step::kFailed;
  while (select && (step = select.step()) == SqliteStatement::Step::kRow) {
    text.append("view ").append(view.name);
    for (std::size_t at = 0; at < view.columns.size(); ++at) {
      const std::string_view column = view.columns[at].name;
      const int place = static_cast<int>(at);
      if (select.isNull(place) || column == "payload") continue;
      text.append(" ").append(column).append("=");
      text += isTime(column) ? textOf(Date{select.number(place)}) : select.text(place);
    }
    text += '\n';
  }
  return step == SqliteStatement::Step::kDone;
}

}  // namespace

std::string viewsText(const std::string& directory) {
  const std::string path = storeFileIn(directory).path;
  if (!std::filesystem::exists(path)) return {};
  SqliteDatabase database;
  std::string text;
  bool isRead = database.open(path, SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(10));
  for (const StoreView& view : storeViews()) isRead = isRead && appendRows(database, view, text);
  return isRead ? text : text + "cannot be read: " + database.problem() + "\n";
}

}  // namespace tonewerk
