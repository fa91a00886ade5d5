// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PipeWireParams.h"

#include <algorithm>
#include <array>
#include <spa/debug/types.h>
#include <spa/param/audio/format-utils.h>
#include <spa/param/audio/type-info.h>
#include <spa/param/props.h>
#include <spa/pod/iter.h>
#include <string>
#include <string_view>

#include "bridges/pipewire/graph/PodCheck.h"

namespace tonewerk {

namespace {

constexpr std::uint32_t kMaxChannels = 64;

std::string_view shortNameIn(const spa_type_info* table, std::uint32_t type) {
  const spa_type_info* info = spa_debug_type_find(table, type);
  return info == nullptr ? std::string_view() : std::string_view(spa_debug_type_short_name(info->name));
}

// Returns the value of a pod, also when it is wrapped in a choice of one value, as in formats.
const spa_pod& chosenValue(const spa_pod& pod) {
  std::uint32_t count = 0;
  std::uint32_t choice = 0;
  return *spa_pod_get_values(&pod, &count, &choice);
}

std::string codingOf(std::uint32_t mediaSubtype) {
  if (mediaSubtype == SPA_MEDIA_SUBTYPE_raw || mediaSubtype == SPA_MEDIA_SUBTYPE_dsp) return "lpcm";
  return std::string(shortNameIn(spa_type_media_subtype, mediaSubtype));
}

// Empty when the format has none, as for encoded audio.
std::string sampleFormatOf(const spa_pod& format) {
  const spa_pod_prop* property = spa_pod_find_prop(&format, nullptr, SPA_FORMAT_AUDIO_format);
  std::uint32_t sample = SPA_AUDIO_FORMAT_UNKNOWN;
  if (property == nullptr || spa_pod_get_id(&chosenValue(property->value), &sample) < 0) return {};
  return std::string(shortNameIn(spa_type_audio_format, sample));
}

// 0 when the property is missing, not a number, or negative.
std::uint32_t countOf(const spa_pod& format, std::uint32_t key) {
  const spa_pod_prop* property = spa_pod_find_prop(&format, nullptr, key);
  std::int32_t count = 0;
  if (property == nullptr || spa_pod_get_int(&chosenValue(property->value), &count) < 0) return 0;
  return static_cast<std::uint32_t>(std::max(count, 0));
}

std::optional<bool> booleanOf(const spa_pod& pod) {
  bool value = false;
  if (spa_pod_get_bool(&pod, &value) < 0) return std::nullopt;
  return value;
}

std::optional<double> floatOf(const spa_pod& pod) {
  float value = 0;
  if (spa_pod_get_float(&pod, &value) < 0) return std::nullopt;
  return value;
}

std::vector<double> floatsOf(const spa_pod& pod) {
  std::array<float, kMaxChannels> values{};
  const std::uint32_t count = spa_pod_copy_array(&pod, SPA_TYPE_Float, values.data(), kMaxChannels);
  return {values.begin(), values.begin() + std::min(count, kMaxChannels)};
}

}  // namespace

StreamVolume volumeOf(const spa_pod& properties) {
  StreamVolume volume;
  if (!isWellFormed(properties)) return volume;
  if (const spa_pod_prop* mute = spa_pod_find_prop(&properties, nullptr, SPA_PROP_mute)) {
    volume.mute = booleanOf(mute->value);
  }
  if (const spa_pod_prop* single = spa_pod_find_prop(&properties, nullptr, SPA_PROP_volume)) {
    volume.single = floatOf(single->value);
  }
  if (const spa_pod_prop* channels = spa_pod_find_prop(&properties, nullptr, SPA_PROP_channelVolumes)) {
    volume.channels = floatsOf(channels->value);
  }
  return volume;
}

std::optional<AudioFormat> formatOf(const spa_pod& format) {
  std::uint32_t mediaType = 0;
  std::uint32_t mediaSubtype = 0;
  if (!isWellFormed(format)) return std::nullopt;
  if (spa_format_parse(&format, &mediaType, &mediaSubtype) < 0) return std::nullopt;
  if (mediaType != SPA_MEDIA_TYPE_audio) return std::nullopt;

  AudioFormat result;
  result.coding = codingOf(mediaSubtype);
  result.sampleFormat = sampleFormatOf(format);
  result.rateHertz = countOf(format, SPA_FORMAT_AUDIO_rate);
  result.channels = countOf(format, SPA_FORMAT_AUDIO_channels);
  if (result.coding.empty() || result.rateHertz == 0) return std::nullopt;
  return result;
}

}  // namespace tonewerk
