// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/TextFile.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <string>
#include <thread>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {
namespace {

// One write to a pipe accepts only as many bytes as fit into it.
TEST(WriteAllTest, WritesAllTextInSeveralCalls) {
  int ends[2] = {-1, -1};
  ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
  const FileDescriptor reading(ends[0]);
  FileDescriptor writing(ends[1]);
  const std::string text(std::size_t{1} << 20, 'x');
  std::string got;
  std::thread reader([&] {
    char piece[4096];
    for (ssize_t size = 0; (size = read(reading.get(), piece, sizeof(piece))) > 0;) {
      got.append(piece, static_cast<std::size_t>(size));
    }
  });
  EXPECT_FALSE(writeAll(writing.get(), text));
  writing.reset();
  reader.join();
  EXPECT_EQ(got, text);
}

TEST(WriteAllTest, SaysWhyItCannotWrite) {
  EXPECT_EQ(writeAll(-1, "x"), std::errc::bad_file_descriptor);
  EXPECT_FALSE(writeAll(-1, ""));
}

}  // namespace
}  // namespace tonewerk
