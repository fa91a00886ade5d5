// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// A path that is built without allocating. One that gets too long becomes empty, so that nothing is opened.
class KernelPath {
 public:
  explicit KernelPath(std::string_view root) { add(root); }

  friend KernelPath operator/(KernelPath path, std::string_view name) { return path.add("/").add(name); }
  friend KernelPath operator/(KernelPath path, std::int32_t number) { return path.add("/").add(number); }
  KernelPath& add(std::string_view text);
  KernelPath& add(std::int32_t number);

  const char* text() const { return bytes_.data(); }

 private:
  std::array<char, 256> bytes_{};  // zeros after the text
  std::size_t size_ = 0;
  bool isTooLong_ = false;
};

// A small file of the kernel that is read again and again through one descriptor.
class KernelFile {
 public:
  static constexpr std::size_t kMaxBytes = 1024;  // more than any of these files has; the rest is not read
  using Buffer = std::array<char, kMaxBytes>;

  KernelFile() = default;
  explicit KernelFile(const KernelPath& path);

  explicit operator bool() const { return static_cast<bool>(descriptor_); }
  void close() { descriptor_.reset(); }

  // What the file holds now, in `buffer`. None if it is not open or cannot be read, such as that of a thread
  // that has ended.
  [[nodiscard]] std::optional<std::string_view> read(Buffer& buffer) const;

 private:
  FileDescriptor descriptor_;
};

// Used by visitDirectory().
struct EntryVisitor {
  void* context;
  void (*visit)(void* context, const char* name);
};
void visitEntries(const KernelPath& path, const EntryVisitor& visitor);

// Calls `visit` with the name of each entry of a directory, except those that begin with a point. Without the
// directory there are none. Allocates nothing.
template <typename Visit>
void visitDirectory(const KernelPath& path, Visit visit) {
  EntryVisitor visitor{&visit,
                       [](void* context, const char* name) { (*static_cast<Visit*>(context))(name); }};
  visitEntries(path, visitor);
}

// The number that makes up the whole text from `prefix` on, such as 3 for "card3"; -1 otherwise.
std::int32_t numberAfter(std::string_view text, std::string_view prefix);

}  // namespace tonewerk
