// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/linux/messagepack/RpcFrameReader.h"

namespace tonewerk {

// Reads `bytes`, which must be exactly one frame; none otherwise.
inline std::optional<RpcFrame> frameOf(std::string_view bytes) {
  const std::size_t size = bytes.size();
  RpcStrings texts;
  RpcFrameReader reader(texts);
  if (reader.next(bytes) != RpcFrameReader::Result::kFrame) return std::nullopt;
  if (reader.frame().wireBytes != size) return std::nullopt;
  return std::move(reader.frame());
}

}  // namespace tonewerk
