// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/KernelFile.h"

#include <cerrno>
#include <charconv>
#include <cstddef>
#include <cstring>
#include <fcntl.h>
#include <sys/syscall.h>
#include <system_error>
#include <unistd.h>

namespace tonewerk {
namespace {

// An entry as the system call gives it; the C library has no name for it.
struct EntryHead {
  std::uint64_t inode;
  std::int64_t offset;
  unsigned short size;
  unsigned char type;
};
constexpr std::size_t kNameOffset = offsetof(EntryHead, type) + 1;

}  // namespace

KernelPath& KernelPath::add(std::string_view text) {
  isTooLong_ = isTooLong_ || text.size() >= bytes_.size() - size_;
  if (isTooLong_) {
    bytes_.fill(0);
    return *this;
  }
  size_ += text.copy(bytes_.data() + size_, text.size());
  return *this;
}

KernelPath& KernelPath::add(std::int32_t number) {
  std::array<char, 12> digits{};
  const auto [end, error] = std::to_chars(digits.data(), digits.data() + digits.size(), number);
  return add(std::string_view(digits.data(), static_cast<std::size_t>(end - digits.data())));
}

KernelFile::KernelFile(const KernelPath& path)
    : descriptor_(::open(path.text(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK)) {}

std::optional<std::string_view> KernelFile::read(Buffer& buffer) const {
  if (!descriptor_) return std::nullopt;
  ssize_t size = 0;
  do {
    size = ::pread(descriptor_.get(), buffer.data(), buffer.size(), 0);
  } while (size < 0 && errno == EINTR);
  if (size <= 0) return std::nullopt;
  return std::string_view(buffer.data(), static_cast<std::size_t>(size));
}

// The C library's readdir() allocates 32 kB for each directory that is opened; this is done many times in a
// second.
void visitEntries(const KernelPath& path, const EntryVisitor& visitor) {
  const FileDescriptor opened(::open(path.text(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!opened) return;
  alignas(EntryHead) std::array<char, 4096> buffer{};
  for (;;) {
    const long size = ::syscall(SYS_getdents64, opened.get(), buffer.data(), buffer.size());
    if (size <= 0) return;
    for (long at = 0; at < size;) {
      EntryHead head{};
      std::memcpy(&head, buffer.data() + at, sizeof head);
      const char* name = buffer.data() + at + kNameOffset;
      if (name[0] != '.') visitor.visit(visitor.context, name);
      at += head.size;
    }
  }
}

std::int32_t numberAfter(std::string_view text, std::string_view prefix) {
  if (!text.starts_with(prefix)) return -1;
  text.remove_prefix(prefix.size());
  std::int32_t number = -1;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  return error == std::errc() && end == text.data() + text.size() && number >= 0 ? number : -1;
}

}  // namespace tonewerk
