// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/SoundCardFiles.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "platform/linux/channels/PcmStatus.h"

namespace tonewerk {

SoundCardFiles::SoundCardFiles(std::string proc) : directory_(std::move(proc) + "/asound") {}

void SoundCardFiles::look() {
  for (Substream& substream : substreams_) substream.isListed = false;
  visitDirectory(KernelPath(directory_), [&](const char* name) {
    const std::int32_t card = numberAfter(name, "card");
    if (card >= 0) lookAtCard(card);
  });
  std::erase_if(substreams_, [](const Substream& substream) { return !substream.isListed; });
}

void SoundCardFiles::lookAtCard(std::int32_t card) {
  const KernelPath path = (KernelPath(directory_) / "card").add(card);
  visitDirectory(path, [&](const char* name) {
    std::string_view device = name;
    if (device.empty()) return;
    Substream substream;
    substream.card = card;
    substream.isPlayback = device.back() == 'p';
    if (!substream.isPlayback && device.back() != 'c') return;
    device.remove_suffix(1);
    substream.device = numberAfter(device, "pcm");
    if (substream.device >= 0) lookAtDevice(std::move(substream), path / name);
  });
}

void SoundCardFiles::lookAtDevice(Substream substream, const KernelPath& path) {
  visitDirectory(path, [&](const char* name) {
    substream.number = numberAfter(name, "sub");
    if (substream.number < 0) return;
    Substream found;
    found.card = substream.card;
    found.device = substream.device;
    found.number = substream.number;
    found.isPlayback = substream.isPlayback;
    add(std::move(found), path / name / "status");
  });
}

void SoundCardFiles::add(Substream substream, const KernelPath& path) {
  const auto known = std::find_if(substreams_.begin(), substreams_.end(), [&](const Substream& other) {
    return other.card == substream.card && other.device == substream.device &&
           other.number == substream.number && other.isPlayback == substream.isPlayback;
  });
  if (known != substreams_.end()) {
    known->isListed = true;
    return;
  }
  if (substreams_.size() >= kMaxFiles) return;
  substream.isListed = true;
  substream.status = KernelFile(path);
  if (substream.status) substreams_.push_back(std::move(substream));
}

void SoundCardFiles::sample(MachineMoment& moment) {
  for (const Substream& substream : substreams_) {
    if (moment.pcmCount >= moment.pcmBuffer.size()) return;
    const auto status = PcmStatus::parse(substream.status.read(buffer_).value_or(std::string_view()), "");
    if (!status || status->state == "closed") continue;
    moment.pcmBuffer[moment.pcmCount++] = {substream.card, substream.device, substream.isPlayback,
                                           status->state == "XRUN", status->delay};
  }
}

}  // namespace tonewerk
