// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/JsonBenchfile.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <utility>

#include "platform/Clock.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/TextFile.h"
#include "values/CompactJson.h"
#include "values/Utf8.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr const char* kNewSuffix = ".new";
constexpr std::size_t kBufferBytes = std::size_t{64} << 10;

class JsonBenchfileWriter final : public BenchfileWriter {
 public:
  // `file` is what is at the path with kNewSuffix.
  JsonBenchfileWriter(std::string path, FileDescriptor file)
      : path_(std::move(path)), newPath_(path_ + kNewSuffix), file_(std::move(file)) {}
  JsonBenchfileWriter(const JsonBenchfileWriter&) = delete;
  JsonBenchfileWriter& operator=(const JsonBenchfileWriter&) = delete;
  ~JsonBenchfileWriter() override {
    if (file_) ::unlink(newPath_.c_str());
  }

  void begin(const ValueMap& context) {
    buffer_ += "{\"context\":";
    appendCompactJson(buffer_, context);
    buffer_ += ",\n\"benchmarks\":[";
  }

  void newValue(std::string_view name, double milliseconds, std::optional<double> beginTime) override {
    buffer_ += isFirst_ ? "\n" : ",\n";
    isFirst_ = false;
    buffer_ += "{\"name\":";
    appendCompactJson(buffer_, Value(name));
    buffer_ += ",\"run_type\":\"iteration\",\"iterations\":1,\"real_time\":";
    const std::size_t number = buffer_.size();
    appendCompactJson(buffer_, Value(milliseconds));
    const std::string text = buffer_.substr(number);
    buffer_ += ",\"cpu_time\":";
    buffer_ += text;
    buffer_ += ",\"time_unit\":\"ms\"";
    if (beginTime) {
      buffer_ += ",\"begin\":";
      appendCompactJson(buffer_, Value(*beginTime));
    }
    buffer_ += '}';
    if (buffer_.size() > kBufferBytes) flush();
  }

  std::error_code close() override {
    buffer_ += "\n]}\n";
    flush();
    if (!error_ && (fsync(file_.get()) != 0 || ::rename(newPath_.c_str(), path_.c_str()) != 0)) {
      error_ = lastSystemError();
    }
    if (error_) return error_;  // the destructor removes the file
    const FileDescriptor file = std::move(file_);
    return {};
  }

 private:
  void flush() {
    if (!error_) error_ = writeAll(file_.get(), buffer_);
    buffer_.clear();
  }

  const std::string path_;
  const std::string newPath_;
  FileDescriptor file_;  // none after close() succeeded
  std::string buffer_;
  std::error_code error_;  // the first one
  bool isFirst_ = true;
};

std::string hostName() {
  char name[256] = {};
  return gethostname(name, sizeof(name) - 1) == 0 ? validUtf8(name) : "";
}

}  // namespace

std::unique_ptr<BenchfileWriter> JsonBenchfile::open(const std::string& path, const BenchfileFacts& facts,
                                                     int& systemError) {
  systemError = 0;
  const std::string newPath = path + kNewSuffix;
  static_cast<void>(::unlink(path.c_str()));
  static_cast<void>(::unlink(newPath.c_str()));  // if this fails, open() fails too and reports the error
  struct stat status {};
  if (::lstat(path.c_str(), &status) == 0) {
    systemError = EEXIST;
    return nullptr;
  }
  FileDescriptor file(::open(newPath.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
  if (!file) {
    systemError = errno;
    return nullptr;
  }
  auto writer = std::make_unique<JsonBenchfileWriter>(path, std::move(file));
  writer->begin(ValueMap{{"date", Date{clock_.now()}},
                         {"host_name", hostName()},
                         {"num_cpus", static_cast<std::int64_t>(std::thread::hardware_concurrency())},
                         {"data_name", facts.dataName},
                         {"results_version", facts.resultsVersion},
                         {"reporter_id", facts.reporterID}});
  return writer;
}

}  // namespace tonewerk
