// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/ChannelPublisher.h"

#include <filesystem>
#include <system_error>
#include <utility>

#include "platform/linux/files/DurableFile.h"
#include "platform/linux/json/NlohmannJsonService.h"

namespace tonewerk {

ChannelPublisher::ChannelPublisher(EventLoop& loop, const Clock& clock, const Console& console,
                                   std::string fileName, Content content)
    : clock_(clock),
      console_(console),
      fileName_(std::move(fileName)),
      content_(std::move(content)),
      timer_(loop.makeTimer([this] { publish(); })) {}

void ChannelPublisher::open(const std::string& runtimeDirectory) {
  const std::string directory = runtimeDirectory + "/channels";
  if (directory != directory_) withdraw();
  directory_ = directory;
  written_.clear();
  publish();
}

void ChannelPublisher::changed() {
  if (directory_.empty() || isDue_) return;
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (!writtenAt_ || now - *writtenAt_ >= kInterval) return publish();
  timer_->arm(*writtenAt_ + kInterval - now);
  isDue_ = true;
}

void ChannelPublisher::publish() {
  timer_->disarm();
  isDue_ = false;
  if (!directory_.empty()) write();
}

void ChannelPublisher::withdraw() {
  timer_->disarm();
  isDue_ = false;
  if (directory_.empty()) return;
  std::error_code ignored;
  std::filesystem::remove(directory_ + "/" + fileName_, ignored);
  directory_.clear();
}

void ChannelPublisher::write() {
  writtenAt_ = clock_.monotonic();
  std::string text = NlohmannJsonService().compact(content_()) + "\n";
  if (text == written_) return;
  std::error_code error;
  std::filesystem::create_directory(directory_, error);  // if this fails, so does replaceFile()
  error = replaceFile(directory_, fileName_, text);
  if (!error) {
    hasReportedFailure_ = false;
    written_ = std::move(text);
  } else if (!std::exchange(hasReportedFailure_, true)) {
    console_.say("cannot publish driver channels in " + directory_ + " (" + error.message() + ")");
  }
}

}  // namespace tonewerk
