// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/linux/store/StoreViews.h"

namespace tonewerk {

// The SQL that turns a file of this version into one of version 2, as the first daemons of that version made
// it: without the marks of age.
inline std::string intoVersion2WithoutAges() {
  std::string sql;
  for (const StoreView& view : storeViews()) sql.append("DROP VIEW ").append(view.name).append(";");
  return sql +
         "DROP TABLE age_mark; DROP TABLE age_clock; DROP TABLE session_row; DROP TABLE sending_row;"
         "DROP INDEX analytics_row_by_stretch;"
         "ALTER TABLE analytics_row DROP COLUMN session;"
         "ALTER TABLE analytics_row DROP COLUMN began_at;"
         "ALTER TABLE analytics_row DROP COLUMN ended_at;"
         "ALTER TABLE analytics_name DROP COLUMN category;"
         "ALTER TABLE analytics_name DROP COLUMN type;"
         "ALTER TABLE analytics_name DROP COLUMN source;"
         "PRAGMA user_version = 2;";
}

}  // namespace tonewerk
