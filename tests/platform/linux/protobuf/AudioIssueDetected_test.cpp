// SPDX-License-Identifier: Apache-2.0
//
// Writes and reads the metric record with the real encoding.
#include "platform/pb/AudioIssueDetected.h"

#include <array>
#include <cstdio>
#include <fstream>
#include <gmock/gmock.h>
#include <memory>
#include <rapidcheck/gtest.h>
#include <string>

#include "platform/linux/json/ValueMapFormatter.h"
#include "platform/linux/protobuf/ProtozeroReader.h"
#include "platform/linux/protobuf/ProtozeroWriter.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using diagwiremetrics::AudioIssueDetected;

std::string bytes(std::initializer_list<int> values) {
  std::string text;
  for (const int value : values) text += static_cast<char>(value);
  return text;
}

std::string written(const AudioIssueDetected& record) {
  ProtozeroWriter writer;
  record.writeTo(writer);
  return writer.bytes();
}

bool read(AudioIssueDetected& record, const std::string& from) {
  ProtozeroReader reader(from);
  return record.readFrom(reader);
}

AudioIssueDetected sample() {
  AudioIssueDetected record;
  record.timestamp = 5;
  record.duration = 300;
  record.issuetype = "silence";
  record.node = "mixer";
  record.rtaidclient = "caller";
  return record;
}

TEST(AudioIssueDetectedTest, AnEmptyRecordIsAZeroDurationAndThreeEmptyStrings) {
  EXPECT_EQ(written(AudioIssueDetected()), bytes({0x10, 0x00, 0x1A, 0x00, 0x22, 0x00, 0x2A, 0x00}));
}

TEST(AudioIssueDetectedTest, WritesItsFieldsInTheOrderOfTheirTagsTheTimestampOnlyWhenSet) {
  EXPECT_EQ(written(sample()), bytes({0x08, 0x05, 0x10, 0xAC, 0x02, 0x1A, 0x07}) + "silence" +
                                   bytes({0x22, 0x05}) + "mixer" + bytes({0x2A, 0x06}) + "caller");
  AudioIssueDetected untimed = sample();
  untimed.timestamp.reset();
  EXPECT_EQ(written(untimed).front(), 0x10);
}

TEST(AudioIssueDetectedTest, ReadsWhatItWrites) {
  AudioIssueDetected record;
  EXPECT_TRUE(read(record, written(sample())));
  EXPECT_EQ(record, sample());
}

TEST(AudioIssueDetectedTest, KeepsFieldsThatAreNotInTheInput) {
  AudioIssueDetected record = sample();
  EXPECT_TRUE(read(record, bytes({0x10, 0x07})));
  EXPECT_EQ(record.duration, 7U);
  EXPECT_EQ(record.node, "mixer");
}

TEST(AudioIssueDetectedTest, SkipsUnknownTagsOfEveryWireType) {
  AudioIssueDetected record;
  EXPECT_TRUE(read(record, bytes({0x30, 0x01,                                   // tag 6, varint
                                  0x31, 1,    2,    3,    4,    5,    6, 7, 8,  // tag 6, 64 bits
                                  0x32, 0x02, 'x',  'y',                        // tag 6, bytes
                                  0x33, 0x08, 0x01, 0x3B, 0x3C, 0x34,           // tag 6, a group in a group
                                  0x35, 1,    2,    3,    4,                    // tag 6, 32 bits
                                  0x10, 0x09})));
  EXPECT_EQ(record.duration, 9U);
}

TEST(AudioIssueDetectedTest, AKnownTagOfAnotherWireTypeIsSkippedLikeAnUnknownOne) {
  AudioIssueDetected record;
  EXPECT_TRUE(read(record, bytes({0x12, 0x01, 'x', 0x18, 0x05, 0x10, 0x09})));
  EXPECT_EQ(record.duration, 9U);
  EXPECT_EQ(record.issuetype, "");
}

TEST(AudioIssueDetectedTest, StopsAtAnEndGroupKey) {
  AudioIssueDetected record;
  EXPECT_TRUE(read(record, bytes({0x10, 0x01, 0x0C, 0x10, 0x02})));
  EXPECT_EQ(record.duration, 1U);
}

TEST(AudioIssueDetectedTest, TruncatesADurationTo32Bits) {
  AudioIssueDetected record;
  EXPECT_TRUE(read(record, bytes({0x10, 0x81, 0x80, 0x80, 0x80, 0x10})));  // two to the power of 32, and 1
  EXPECT_EQ(record.duration, 1U);
}

TEST(AudioIssueDetectedTest, AVarintOfTenBytesIsReadAndOneOfElevenIsAnError) {
  AudioIssueDetected record;
  std::string ten = bytes({0x08}) + std::string(9, '\xFF') + bytes({0x01});
  EXPECT_TRUE(read(record, ten));
  EXPECT_EQ(record.timestamp, 0xFFFFFFFFFFFFFFFFU);
  std::string eleven = bytes({0x08}) + std::string(10, '\xFF') + bytes({0x01});
  EXPECT_FALSE(read(record, eleven));
}

TEST(AudioIssueDetectedTest, DamagedInputIsAnErrorAndKeepsWhatCameBefore) {
  for (const std::string& damage : {bytes({0x1A, 0x05, 'x'}),  // bytes that end early
                                    bytes({0x08, 0x80}),       // a varint that ends early
                                    bytes({0x31, 1, 2}),       // a 64-bit value that ends early
                                    bytes({0x1A, 0xFF, 0xFF, 0xFF, 0xFF, 0x0F}),  // a length beyond the input
                                    bytes({0x33, 0x08}),                          // a group without an end
                                    bytes({0x33, 0x3C}),           // a group with the end of another
                                    bytes({0x36}), bytes({0x37}),  // wire types that do not exist
                                    bytes({0x00, 0x01}),           // tag 0
                                    std::string(100, '\x33')}) {   // groups without end
    AudioIssueDetected record;
    EXPECT_FALSE(read(record, bytes({0x10, 0x07}) + damage)) << testing::PrintToString(damage);
    EXPECT_EQ(record.duration, 7U);
  }
}

TEST(AudioIssueDetectedTest, FormatsItsFieldsTheTimestampLastAndOnlyWhenSet) {
  ValueMapFormatter formatter;
  sample().formatText(formatter, "issue");
  EXPECT_EQ(
      formatter.map().text(),
      R"({"issue":{"duration":300,"issuetype":"silence","node":"mixer","rtaidclient":"caller","timestamp":5}})");
  ValueMapFormatter untimed;
  AudioIssueDetected record;
  record.node = "\xFF";
  record.formatText(untimed, "issue");
  EXPECT_EQ(untimed.map().text(),
            R"({"issue":{"duration":0,"issuetype":"","node":"\\xff","rtaidclient":""}})");
}

TEST(AudioIssueDetectedTest, EqualsByAllItsFieldsAndWhetherTheTimestampIsSet) {
  EXPECT_EQ(sample(), sample());
  EXPECT_EQ(sample().hash(), sample().hash());
  AudioIssueDetected other = sample();
  other.timestamp.reset();
  EXPECT_NE(other, sample());
  EXPECT_NE(other.hash(), sample().hash());
  for (std::string AudioIssueDetected::*field :
       {&AudioIssueDetected::issuetype, &AudioIssueDetected::node, &AudioIssueDetected::rtaidclient}) {
    other = sample();
    other.*field = "other";
    EXPECT_NE(other, sample());
  }
  other = sample();
  other.duration = 1;
  EXPECT_NE(other, sample());
}

TEST(AudioIssueDetectedTest, CopiesMovesAndSwaps) {
  AudioIssueDetected first = sample();
  AudioIssueDetected second;
  swap(first, second);
  EXPECT_EQ(second, sample());
  EXPECT_EQ(first, AudioIssueDetected());
  const AudioIssueDetected copy = second;
  const AudioIssueDetected moved = std::move(second);
  EXPECT_EQ(copy, moved);
  first = copy;
  EXPECT_EQ(first, sample());
}

RC_GTEST_PROP(AudioIssueDetectedProperty, SurvivesAnyBytes, (const std::string& input)) {
  AudioIssueDetected record;
  read(record, input);
  AudioIssueDetected again;
  RC_ASSERT(read(again, written(record)));
  RC_ASSERT(again == record);
}

// Decodes a record with protoc and the description in docs/.
TEST(AudioIssueDetectedTest, DecodesWithTheDescriptionThatDocsShip) {
  TemporaryDirectory temporary;
  const std::string file = temporary.path("record");
  std::ofstream(file, std::ios::binary) << written(sample());
  const std::string command =
      std::string("protoc --proto_path='") + TONEWERK_SOURCE_DIR +
      "/docs' --decode=diagwiremetrics.AudioIssueDetected audio_issue_detected.proto < '" + file + "' 2>&1";
  const std::unique_ptr<FILE, int (*)(FILE*)> output(popen(command.c_str(), "r"), pclose);
  ASSERT_NE(output, nullptr);
  std::string text;
  std::array<char, 256> buffer{};
  while (fgets(buffer.data(), buffer.size(), output.get()) != nullptr) text += buffer.data();
  EXPECT_EQ(
      text,
      "timestamp: 5\nduration: 300\nissuetype: \"silence\"\nnode: \"mixer\"\nrtaidclient: \"caller\"\n");
}

}  // namespace
}  // namespace tonewerk
