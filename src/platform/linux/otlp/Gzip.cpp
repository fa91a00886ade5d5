// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/Gzip.h"

#include <zlib.h>

namespace tonewerk {
namespace {

constexpr int kGzipWindowBits = 15 + 16;  // the largest window; 16 selects gzip's header
constexpr int kMemoryLevel = 8;

}  // namespace

std::optional<std::string> gzip(std::string_view text) {
  z_stream stream{};
  if (deflateInit2(&stream, Z_DEFAULT_COMPRESSION, Z_DEFLATED, kGzipWindowBits, kMemoryLevel,
                   Z_DEFAULT_STRATEGY) != Z_OK) {
    return std::nullopt;
  }
  std::string packed(deflateBound(&stream, static_cast<uLong>(text.size())), '\0');
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(text.data()));
  stream.avail_in = static_cast<uInt>(text.size());
  stream.next_out = reinterpret_cast<Bytef*>(packed.data());
  stream.avail_out = static_cast<uInt>(packed.size());
  const int result = deflate(&stream, Z_FINISH);
  packed.resize(stream.total_out);
  deflateEnd(&stream);
  if (result != Z_STREAM_END) return std::nullopt;
  return packed;
}

}  // namespace tonewerk
