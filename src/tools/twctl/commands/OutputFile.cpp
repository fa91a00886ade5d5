// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/OutputFile.h"

#include <filesystem>
#include <ostream>
#include <streambuf>
#include <sys/stat.h>
#include <utility>

#include "platform/linux/files/LinuxFileSystem.h"

namespace tonewerk {
namespace {

// Until the end of the scope, other users get no rights to new files.
class OwnerOnly {
 public:
  OwnerOnly() : before_(umask(S_IRWXG | S_IRWXO)) {}
  OwnerOnly(const OwnerOnly&) = delete;
  OwnerOnly& operator=(const OwnerOnly&) = delete;
  ~OwnerOnly() { umask(before_); }

 private:
  const mode_t before_;
};

// Writes what a stream gets into a new file, which keeps its first failure.
class NewFileBuffer final : public std::streambuf {
 public:
  explicit NewFileBuffer(NewFile& file) : file_(file) {}
  const std::error_code& failure() const { return failure_; }

 protected:
  std::streamsize xsputn(const char* text, std::streamsize count) override {
    const std::error_code error = file_.write({text, static_cast<std::size_t>(count)});
    if (error && !failure_) failure_ = error;
    return error ? 0 : count;
  }
  int_type overflow(int_type character) override {
    const char text = traits_type::to_char_type(character);
    return xsputn(&text, 1) == 1 ? character : traits_type::eof();
  }

 private:
  NewFile& file_;
  std::error_code failure_;
};

}  // namespace

struct OutputFile::Writing {
  Writing(std::string fileName, std::unique_ptr<NewFile> newFile)
      : name(std::move(fileName)), file(std::move(newFile)), buffer(*file), stream(&buffer) {}

  const std::string name;
  const std::unique_ptr<NewFile> file;
  NewFileBuffer buffer;
  std::ostream stream;
};

OutputFile::OutputFile() = default;
OutputFile::~OutputFile() = default;

std::error_code OutputFile::begin(const std::string& file) {
  std::error_code error;
  const std::filesystem::path path = std::filesystem::absolute(file, error);
  if (error) return error;
  if (std::filesystem::exists(std::filesystem::symlink_status(path, error)))
    return std::make_error_code(std::errc::file_exists);
  const std::string name = path.filename();
  const OwnerOnly scope;
  LinuxFileSystem files;
  std::unique_ptr<NewFile> made = files.createFile(path.parent_path(), name, error);
  if (!error) writing_ = std::make_unique<Writing>(name, std::move(made));
  return error;
}

std::ostream& OutputFile::stream() { return writing_->stream; }

std::error_code OutputFile::end() {
  const std::error_code& failure = writing_->buffer.failure();
  return failure ? failure : writing_->file->place(writing_->name);
}

}  // namespace tonewerk
