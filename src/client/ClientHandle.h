// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <utility>

#include "client/ClientEngine.h"
#include "client/ClientSettings.h"

// What callers hold of a client.
struct twr_client {  // NOLINT(readability-identifier-naming)
  explicit twr_client(tonewerk::ClientSettings settings) : engine(std::move(settings)) {}

  tonewerk::ClientEngine engine;
};

namespace tonewerk {

// It holds itself until it is destroyed. Null without memory.
twr_client* makeClient(ClientSettings settings);

}  // namespace tonewerk
