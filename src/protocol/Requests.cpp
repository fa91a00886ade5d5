// SPDX-License-Identifier: Apache-2.0
#include "protocol/Requests.h"

namespace tonewerk::requests {

const RequestSet& all() {
  static const RequestSet set{{kAll.begin(), kAll.end()}};
  return set;
}

}  // namespace tonewerk::requests
