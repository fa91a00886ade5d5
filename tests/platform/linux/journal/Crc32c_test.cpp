// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/Crc32c.h"

#include <cstddef>
#include <gtest/gtest.h>
#include <random>
#include <string>

namespace tonewerk {
namespace {

// The values of RFC 3720, B.4, and the usual check value.
TEST(Crc32cTest, HasThePublishedValues) {
  for (const auto function : {crc32c, crc32cByTable}) {
    EXPECT_EQ(function("", 0), 0U);
    EXPECT_EQ(function("123456789", 0), 0xE306'9283U);
    EXPECT_EQ(function(std::string(32, '\0'), 0), 0x8A91'36AAU);
    EXPECT_EQ(function(std::string(32, '\xFF'), 0), 0x62A8'AB43U);
  }
}

TEST(Crc32cTest, IsTheSameByInstructionAndByTable) {
  std::mt19937 random(1);
  std::string bytes(300, '\0');
  for (char& byte : bytes) byte = static_cast<char>(random());
  for (std::size_t begin = 0; begin < 9; ++begin) {
    for (std::size_t size = 0; begin + size <= bytes.size(); ++size) {
      const std::string_view part = std::string_view(bytes).substr(begin, size);
      ASSERT_EQ(crc32c(part), crc32cByTable(part)) << begin << " " << size;
    }
  }
}

TEST(Crc32cTest, MayBeMadeInParts) {
  const std::string_view whole = "the bytes of a record, some more than a word";
  for (std::size_t at = 0; at <= whole.size(); ++at) {
    EXPECT_EQ(crc32c(whole.substr(at), crc32c(whole.substr(0, at))), crc32c(whole));
    EXPECT_EQ(crc32cByTable(whole.substr(at), crc32cByTable(whole.substr(0, at))), crc32c(whole));
  }
}

}  // namespace
}  // namespace tonewerk
