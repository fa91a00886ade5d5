// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PipeWireParams.h"

#include <array>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <spa/param/audio/format-utils.h>
#include <spa/param/props.h>
#include <spa/pod/builder.h>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

// Builds one pod in a buffer of its own.
class PodMaker {
 public:
  PodMaker() { spa_pod_builder_init(&builder_, bytes_.data(), kRoom); }

  void open(std::uint32_t type, std::uint32_t parameter) {
    spa_pod_builder_push_object(&builder_, &frame_, type, parameter);
  }
  spa_pod_builder* property(std::uint32_t key) {
    spa_pod_builder_prop(&builder_, key, 0);
    return &builder_;
  }
  const spa_pod& close() { return *static_cast<const spa_pod*>(spa_pod_builder_pop(&builder_, &frame_)); }

 private:
  static constexpr std::uint32_t kRoom = 4096;
  alignas(8) std::array<std::uint8_t, kRoom> bytes_{};
  spa_pod_builder builder_{};
  spa_pod_frame frame_{};
};

class FormatMaker : public PodMaker {
 public:
  FormatMaker(std::uint32_t mediaType, std::uint32_t mediaSubtype) {
    open(SPA_TYPE_OBJECT_Format, SPA_PARAM_Format);
    spa_pod_builder_id(property(SPA_FORMAT_mediaType), mediaType);
    spa_pod_builder_id(property(SPA_FORMAT_mediaSubtype), mediaSubtype);
  }
  FormatMaker& sample(std::uint32_t format) {
    spa_pod_builder_id(property(SPA_FORMAT_AUDIO_format), format);
    return *this;
  }
  FormatMaker& rate(std::int32_t hertz) {
    spa_pod_builder_int(property(SPA_FORMAT_AUDIO_rate), hertz);
    return *this;
  }
  FormatMaker& channels(std::int32_t count) {
    spa_pod_builder_int(property(SPA_FORMAT_AUDIO_channels), count);
    return *this;
  }
};

TEST(PipeWireParams, ReadsAPlainFormat) {
  FormatMaker maker(SPA_MEDIA_TYPE_audio, SPA_MEDIA_SUBTYPE_raw);
  maker.sample(SPA_AUDIO_FORMAT_S16_LE).rate(44'100).channels(6);
  EXPECT_EQ(formatOf(maker.close()), (AudioFormat{"lpcm", "S16LE", 44'100, 6}));
}

// PipeWire gives the formats of some streams in this form. They were once read as formats without a rate.
TEST(PipeWireParams, ReadsAFormatWhoseValuesAreChoicesOfOneValue) {
  FormatMaker maker(SPA_MEDIA_TYPE_audio, SPA_MEDIA_SUBTYPE_raw);
  const auto asChoice = [&](std::uint32_t key, auto add) {
    spa_pod_builder* builder = maker.property(key);
    spa_pod_frame choice{};
    spa_pod_builder_push_choice(builder, &choice, SPA_CHOICE_None, 0);
    add(builder);
    spa_pod_builder_pop(builder, &choice);
  };
  asChoice(SPA_FORMAT_AUDIO_format,
           [](spa_pod_builder* b) { spa_pod_builder_id(b, SPA_AUDIO_FORMAT_S16_LE); });
  asChoice(SPA_FORMAT_AUDIO_rate, [](spa_pod_builder* b) { spa_pod_builder_int(b, 48'000); });
  asChoice(SPA_FORMAT_AUDIO_channels, [](spa_pod_builder* b) { spa_pod_builder_int(b, 2); });
  EXPECT_EQ(formatOf(maker.close()), (AudioFormat{"lpcm", "S16LE", 48'000, 2}));
}

TEST(PipeWireParams, ReadsAnEncodedFormat) {
  FormatMaker maker(SPA_MEDIA_TYPE_audio, SPA_MEDIA_SUBTYPE_iec958);
  maker.rate(48'000);
  EXPECT_EQ(formatOf(maker.close()), (AudioFormat{"iec958", "", 48'000, 0}));
}

TEST(PipeWireParams, RefusesAFormatThatIsNotAudioOrLacksRateOrEncoding) {
  FormatMaker video(SPA_MEDIA_TYPE_video, SPA_MEDIA_SUBTYPE_raw);
  EXPECT_EQ(formatOf(video.rate(1).close()), std::nullopt);
  FormatMaker rateless(SPA_MEDIA_TYPE_audio, SPA_MEDIA_SUBTYPE_raw);
  EXPECT_EQ(formatOf(rateless.sample(SPA_AUDIO_FORMAT_S16_LE).channels(2).close()), std::nullopt);
  FormatMaker negative(SPA_MEDIA_TYPE_audio, SPA_MEDIA_SUBTYPE_raw);
  EXPECT_EQ(formatOf(negative.rate(-1).close()), std::nullopt);
  FormatMaker unknownCoding(SPA_MEDIA_TYPE_audio, 0x7FFFFFFF);
  EXPECT_EQ(formatOf(unknownCoding.rate(48'000).close()), std::nullopt);
}

TEST(PipeWireParams, ReadsVolumesAndMute) {
  PodMaker maker;
  maker.open(SPA_TYPE_OBJECT_Props, SPA_PARAM_Props);
  spa_pod_builder_float(maker.property(SPA_PROP_volume), 0.5F);
  spa_pod_builder_bool(maker.property(SPA_PROP_mute), true);
  const std::array<float, 2> channels{0.25F, 0.125F};
  spa_pod_builder_array(maker.property(SPA_PROP_channelVolumes), sizeof(float), SPA_TYPE_Float,
                        channels.size(), channels.data());
  const StreamVolume volume = volumeOf(maker.close());
  EXPECT_EQ(volume.single, 0.5);
  EXPECT_EQ(volume.mute, true);
  EXPECT_THAT(volume.channels, ElementsAre(0.25, 0.125));
}

TEST(PipeWireParams, LeavesOutMissingOrWrongProperties) {
  PodMaker maker;
  maker.open(SPA_TYPE_OBJECT_Props, SPA_PARAM_Props);
  spa_pod_builder_string(maker.property(SPA_PROP_mute), "neither");
  const StreamVolume volume = volumeOf(maker.close());
  EXPECT_EQ(volume.mute, std::nullopt);
  EXPECT_EQ(volume.single, std::nullopt);
  EXPECT_THAT(volume.channels, IsEmpty());
}

TEST(PipeWireParams, ReadsAtMostTheMaximumOfChannels) {
  PodMaker maker;
  maker.open(SPA_TYPE_OBJECT_Props, SPA_PARAM_Props);
  const std::array<float, 200> channels{};
  spa_pod_builder_array(maker.property(SPA_PROP_channelVolumes), sizeof(float), SPA_TYPE_Float,
                        channels.size(), channels.data());
  EXPECT_LE(volumeOf(maker.close()).channels.size(), 64U);
}

// PipeWire's function for reading arrays copies as many bytes as the array claims for an element. Any client
// could write behind the array on the bridge's stack.
TEST(PipeWireParams, LeavesOutVolumesThatClaimToBeLargerThanANumber) {
  PodMaker maker;
  maker.open(SPA_TYPE_OBJECT_Props, SPA_PARAM_Props);
  const std::array<std::uint8_t, 3000> channels{};
  spa_pod_builder_array(maker.property(SPA_PROP_channelVolumes), 1000, SPA_TYPE_Float, 3, channels.data());
  EXPECT_THAT(volumeOf(maker.close()).channels, IsEmpty());
}

// The value would be read from what follows the choice.
TEST(PipeWireParams, RefusesAFormatWhoseRateIsAChoiceWithoutAValue) {
  FormatMaker maker(SPA_MEDIA_TYPE_audio, SPA_MEDIA_SUBTYPE_raw);
  const spa_pod_choice choice{{sizeof(spa_pod_choice_body), SPA_TYPE_Choice},
                              {SPA_CHOICE_None, 0, {sizeof(std::int32_t), SPA_TYPE_Int}}};
  spa_pod_builder_primitive(maker.property(SPA_FORMAT_AUDIO_rate), &choice.pod);
  maker.channels(2);
  EXPECT_EQ(formatOf(maker.close()), std::nullopt);
}

}  // namespace
}  // namespace tonewerk
