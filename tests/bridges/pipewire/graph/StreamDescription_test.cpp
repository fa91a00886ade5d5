// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/StreamDescription.h"

#include <gtest/gtest.h>

#include "bridges/pipewire/graph/AudioFormat.h"
#include "bridges/pipewire/graph/CleanText.h"

namespace tonewerk {
namespace {

TEST(StreamDescription, GivesEachRoleItsServiceType) {
  struct Case {
    const char* role;
    int serviceType;
  };
  for (const Case& c : std::vector<Case>{{"Communication", 2},
                                         {"Alarm", 4},
                                         {"Music", 7},
                                         {"Movie", 7},
                                         {"Notification", 10},
                                         {"Test", 11},
                                         {"Event", 13},
                                         {"Game", 8},
                                         {"Production", 8},
                                         {"music", 8},
                                         {"", 8}}) {
    EXPECT_EQ(serviceTypeOf(c.role), c.serviceType) << c.role;
  }
}

TEST(StreamDescription, TakesTheApplicationFromTheNodeOrItsClientInOrderOfPreference) {
  struct Case {
    Properties node;
    Properties client;
    const char* application;
  };
  const std::string identifier(kApplicationIDKey);
  const std::string binary(kApplicationBinaryKey);
  const std::string name(kApplicationNameKey);
  const std::string nodeName(kNodeNameKey);
  for (const Case& c : std::vector<Case>{
           {{{identifier, "node.id"}, {binary, "b"}}, {{identifier, "client.id"}}, "node.id"},
           {{{binary, "node-binary"}, {name, "Node"}}, {{identifier, "client.id"}}, "client.id"},
           {{{binary, "node-binary"}}, {{binary, "client-binary"}}, "node-binary"},
           {{{name, "Node"}}, {{binary, "client-binary"}, {name, "Client"}}, "client-binary"},
           {{{name, "Node"}}, {{name, "Client"}}, "Node"},
           {{{nodeName, "node"}}, {{name, "Client"}}, "Client"},
           {{{identifier, ""}, {nodeName, "node"}}, {{binary, ""}}, "node"},
           {{}, {}, ""},
       }) {
    EXPECT_EQ(applicationOf(c.node, c.client), c.application);
  }
}

TEST(StreamDescription, NamesASinkByDescriptionThenNicknameThenName) {
  const std::string name(kNodeNameKey);
  const std::string nick(kNodeNickKey);
  const std::string description(kNodeDescriptionKey);
  EXPECT_EQ(deviceNameOf({{name, "alsa_output.0"}, {nick, "Card"}, {description, "Speaker"}}), "Speaker");
  EXPECT_EQ(deviceNameOf({{name, "alsa_output.0"}, {nick, "Card"}}), "Card");
  EXPECT_EQ(deviceNameOf({{name, "alsa_output.0"}}), "alsa_output.0");
}

TEST(StreamDescription, RecognisesStreamsAndSinksByMediaClass) {
  const auto of = [](const char* mediaClass) {
    return Properties{{std::string(kMediaClassKey), mediaClass}};
  };
  EXPECT_TRUE(isOutputStream(of("Stream/Output/Audio")));
  EXPECT_FALSE(isOutputStream(of("Stream/Input/Audio")));
  EXPECT_FALSE(isOutputStream(of("Stream/Output/Video")));
  EXPECT_FALSE(isOutputStream({}));
  EXPECT_TRUE(isSink(of("Audio/Sink")));
  EXPECT_TRUE(isSink(of("Audio/Sink/Virtual")));
  EXPECT_TRUE(isSink(of("Audio/Duplex")));
  EXPECT_FALSE(isSink(of("Audio/Source")));
  EXPECT_FALSE(isSink({}));
  EXPECT_TRUE(isStream(of("Stream/Output/Audio")));
  EXPECT_TRUE(isStream(of("Stream/Input/Audio")));
  EXPECT_FALSE(isStream(of("Stream/Input/Video")));
  EXPECT_FALSE(isStream(of("Audio/Sink")));
  EXPECT_TRUE(isSource(of("Audio/Source")));
  EXPECT_TRUE(isSource(of("Audio/Source/Virtual")));
  EXPECT_FALSE(isSource(of("Audio/Duplex")));
  EXPECT_FALSE(isSource({}));
}

TEST(StreamDescription, RecognisesADriverByItsProperty) {
  const std::string driver(kNodeDriverKey);
  EXPECT_TRUE(isDriver({{driver, "true"}}));
  EXPECT_TRUE(isDriver({{driver, "1"}}));
  EXPECT_FALSE(isDriver({{driver, "false"}}));
  EXPECT_FALSE(isDriver({}));
}

TEST(AudioFormat, PrintsSampleFormatRateAndChannels) {
  EXPECT_EQ((AudioFormat{"lpcm", "F32LE", 48'000, 2}.text()), "F32LE 48000 Hz 2 ch");
  EXPECT_EQ((AudioFormat{"iec958", "", 44'100, 2}.text()), "iec958 44100 Hz 2 ch");
}

TEST(CleanText, KeepsUtf8AndReplacesInvalidBytesAndControlCharacters) {
  struct Case {
    std::string text;
    std::string clean;
  };
  for (const Case& c : std::vector<Case>{
           {"", ""},
           {"Player", "Player"},
           {"Caf\xC3\xA9 \xF0\x9F\x8E\xB5", "Caf\xC3\xA9 \xF0\x9F\x8E\xB5"},
           {"a\nb\x7F", "a?b?"},
           {"\xFF\xC3", "\uFFFD\uFFFD"},
           {"\xC0\xAF", "\uFFFD\uFFFD"},    // an overlong form
           {"a\xE2\x82", "a\uFFFD"},        // cut short
           {"a\xEF\xBF\xBFz", "a\uFFFDz"},  // a noncharacter
           {"\xF0\x9F\xBF\xBE", "\uFFFD"},  // another
       }) {
    EXPECT_EQ(cleanText(c.text), c.clean);
  }
}

TEST(CleanText, CutsBeforeTheCharacterThatWouldNotFit) {
  EXPECT_EQ(cleanText(std::string(kMaxTextBytes, 'x')), std::string(kMaxTextBytes, 'x'));
  EXPECT_EQ(cleanText(std::string(kMaxTextBytes + 1, 'x')), std::string(kMaxTextBytes, 'x'));
  EXPECT_EQ(cleanText(std::string(kMaxTextBytes - 1, 'x') + "\xC3\xA9"), std::string(kMaxTextBytes - 1, 'x'));
  EXPECT_EQ(cleanText(std::string(kMaxTextBytes - 1, 'x') + "\xFF"), std::string(kMaxTextBytes - 1, 'x'));
}

}  // namespace
}  // namespace tonewerk
