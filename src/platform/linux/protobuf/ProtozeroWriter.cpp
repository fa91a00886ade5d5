// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/protobuf/ProtozeroWriter.h"

#include <protozero/pbf_writer.hpp>

namespace tonewerk {

void ProtozeroWriter::writeVarint(std::uint32_t tag, std::uint64_t value) {
  protozero::pbf_writer(bytes_).add_uint64(tag, value);
}

void ProtozeroWriter::writeBytes(std::uint32_t tag, std::string_view value) {
  protozero::pbf_writer(bytes_).add_bytes(tag, value.data(), value.size());
}

}  // namespace tonewerk
