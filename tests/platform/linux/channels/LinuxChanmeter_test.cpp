// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/LinuxChanmeter.h"

#include <atomic>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/channels/SoundTree.h"
#include "support/TemporaryDirectory.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class LinuxChanmeterTest : public testing::Test {
 protected:
  LinuxChanmeterTest() { std::filesystem::create_directory(directory_.path("channels")); }

  // Replaces the file with this name.
  void publish(const std::string& name, const std::string& text) const {
    const std::string other = directory_.path(name + ".new");
    std::ofstream(other) << text;
    std::filesystem::rename(other, directory_.path("channels/" + name));
  }
  void publishValue(const std::string& driver, const std::string& group, int value) const {
    publish(driver + ".json", R"({"driver": ")" + driver + R"(", "channels": [{"group": ")" + group +
                                  R"(", "name": "n", "format": "simple", "value": )" + std::to_string(value) +
                                  "}]}");
  }

  // The channels of a group, or all channels.
  Chanmeter::Channels channelsIn(const std::optional<std::string>& group) {
    error_.reset();
    return chanmeter_.copyChannelsInGroup(group, std::nullopt, error_);
  }
  Chanmeter::Samples samplesOf(const Chanmeter::Channels& channels) {
    error_.reset();
    Chanmeter::Channels subscribed;
    const auto subscription = chanmeter_.createSubscription(channels, subscribed, error_);
    EXPECT_TRUE(subscription);
    return chanmeter_.createSamples(subscription, subscribed, error_);
  }
  // For example "Amp n=12".
  std::vector<std::string> textsOf(const Chanmeter::Samples& samples) {
    std::vector<std::string> texts;
    chanmeter_.iterate(*samples, [&](const ChanmeterSample& sample) {
      texts.push_back(std::string(*sample.driverName()) + " " + std::string(*sample.channelName()) + "=" +
                      std::to_string(sample.simpleIntegerValue()));
      return 0;
    });
    return texts;
  }
  std::int64_t code() const { return error_.value_or(ChanmeterError{}).code; }

  SoundTree tree_;
  TemporaryDirectory directory_;
  MemoryLog log_;
  const LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  TestAccounts accounts_;
  LinuxChanmeter chanmeter_{directory_.path("channels"), category_, tree_.root(),
                            &static_cast<Accounts&>(accounts_)};
  std::optional<ChanmeterError> error_;
};

TEST_F(LinuxChanmeterTest, GivesTheKernelsChannelsAndThenThePublishedOnes) {
  publishValue("Amp", "Rx", 5);
  EXPECT_THAT(textsOf(samplesOf(channelsIn("Rx"))),
              ElementsAre("PCH Hardware Position=0", "PCH Delay=0", "PCH State=0", "Amp n=5"));
}

TEST_F(LinuxChanmeterTest, GivesAnEmptySetForAGroupThatNoChannelMatches) {
  const auto channels = channelsIn("Haptics");
  ASSERT_TRUE(channels);
  EXPECT_EQ(chanmeter_.channelCount(*channels), 0);
  EXPECT_EQ(code(), 0);
}

TEST_F(LinuxChanmeterTest, TellsWhatChangedBetweenTwoTimes) {
  publishValue("Amp", "Tx", 5);
  const auto channels = channelsIn("Tx");
  const auto earlier = samplesOf(channels);
  publishValue("Amp", "Tx", 12);
  tree_.setStatus("state: RUNNING\ndelay : 3600\nhw_ptr : 1384652\n");
  const auto change = chanmeter_.createSamplesDelta(earlier, samplesOf(channels), error_);
  ASSERT_TRUE(change);
  EXPECT_THAT(textsOf(change),
              testing::IsSupersetOf({"PCH Hardware Position=48000", "PCH Delay=60", "Amp n=7"}));
}

TEST_F(LinuxChanmeterTest, DoesNotReadADriverThatIsNewerThanTheSubscription) {
  publishValue("Amp", "pdm", 5);
  const auto channels = channelsIn("pdm");
  publishValue("Other", "pdm", 5);
  EXPECT_THAT(textsOf(samplesOf(channels)), ElementsAre("Amp n=5"));
}

TEST_F(LinuxChanmeterTest, SamplesOfAReadingShowAFileAsItWasWhenItWasFirstNeeded) {
  publishValue("Amp", "pdm", 5);
  publishValue("Mic", "Tx", 6);
  const auto amp = channelsIn("pdm");
  const auto mic = channelsIn("Tx");
  const auto reading = chanmeter_.beginReading();
  const auto sample = [&](const Chanmeter::Channels& channels, const Chanmeter::Reading& within) {
    error_.reset();
    Chanmeter::Channels subscribed;
    const auto subscription = chanmeter_.createSubscription(channels, subscribed, error_);
    return textsOf(chanmeter_.createSamplesIn(within, subscription, subscribed, error_));
  };
  EXPECT_THAT(sample(amp, reading), testing::Contains("Amp n=5"));
  publishValue("Amp", "pdm", 7);
  publishValue("Mic", "Tx", 8);
  EXPECT_THAT(sample(amp, reading), testing::Contains("Amp n=5"));
  EXPECT_THAT(sample(mic, reading), testing::Contains("Mic n=8"));
  EXPECT_THAT(sample(amp, chanmeter_.beginReading()), testing::Contains("Amp n=7"));
  // The first reading does not know what the second one read.
  EXPECT_THAT(sample(amp, reading), testing::Contains("Amp n=7"));
}

TEST_F(LinuxChanmeterTest, EachSampleOfAReadingGetsTheErrorOfItsDriver) {
  publishValue("Amp", "pdm", 5);
  publishValue("Mic", "Tx", 6);
  const auto amp = channelsIn("pdm");
  const auto mic = channelsIn("Tx");
  publish("Amp.json", "{");
  const auto reading = chanmeter_.beginReading();
  const auto codeOf = [&](const Chanmeter::Channels& channels) {
    error_.reset();
    Chanmeter::Channels subscribed;
    const auto subscription = chanmeter_.createSubscription(channels, subscribed, error_);
    static_cast<void>(chanmeter_.createSamplesIn(reading, subscription, subscribed, error_));
    return code();
  };
  EXPECT_EQ(codeOf(amp), kChannelsNotJson);
  EXPECT_EQ(codeOf(amp), kChannelsNotJson);
  EXPECT_EQ(codeOf(mic), 0);
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kError), testing::SizeIs(1));
}

// A subscription remembers the places of its channels in a file.
TEST_F(LinuxChanmeterTest, ASubscriptionFindsItsChannelsInAFileWhoseChannelsChanged) {
  const auto textOf = [](const std::string& names, int value) {
    std::string text = R"({"driver": "Amp", "channels": [)";
    for (const char name : names) {
      text += (name == names.front() ? "" : ",") + std::string(R"({"group": "pdm", "name": ")") + name +
              R"(", "format": "simple", "value": )" + std::to_string(value++) + "}";
    }
    return text + "]}";
  };
  publish("amp.json", textOf("ab", 1));
  Chanmeter::Channels subscribed;
  const auto subscription = chanmeter_.createSubscription(channelsIn("pdm"), subscribed, error_);
  const auto sample = [&] { return textsOf(chanmeter_.createSamples(subscription, subscribed, error_)); };
  EXPECT_THAT(sample(), ElementsAre("Amp a=1", "Amp b=2"));
  publish("amp.json", textOf("ab", 5));
  EXPECT_THAT(sample(), ElementsAre("Amp a=5", "Amp b=6"));
  publish("amp.json", textOf("xbya", 1));
  EXPECT_THAT(sample(), ElementsAre("Amp b=2", "Amp a=4"));
  publish("amp.json", textOf("xbya", 11));
  EXPECT_THAT(sample(), ElementsAre("Amp b=12", "Amp a=14"));
  publish("amp.json", "{");
  EXPECT_FALSE(chanmeter_.createSamples(subscription, subscribed, error_));
  publish("amp.json", textOf("ab", 3));
  EXPECT_THAT(sample(), ElementsAre("Amp a=3", "Amp b=4"));
  std::filesystem::remove(directory_.path("channels/amp.json"));
  EXPECT_THAT(sample(), IsEmpty());
  publish("amp.json", textOf("b", 9));
  EXPECT_THAT(sample(), ElementsAre("Amp b=9"));
}

TEST_F(LinuxChanmeterTest, SamplesTheOthersWhenOneDriverFails) {
  publishValue("Amp", "pdm", 5);
  publishValue("Mic", "pdm", 6);
  const auto channels = channelsIn("pdm");
  publish("Amp.json", "{");
  const auto samples = samplesOf(channels);
  ASSERT_TRUE(samples);
  EXPECT_THAT(textsOf(samples), ElementsAre("Mic n=6"));
  EXPECT_EQ(code(), kChannelsNotJson);
}

TEST_F(LinuxChanmeterTest, GivesNoSamplesWhenNothingCouldBeRead) {
  publishValue("Amp", "pdm", 5);
  const auto channels = channelsIn("pdm");
  publish("Amp.json", "{");
  EXPECT_FALSE(samplesOf(channels));
  EXPECT_EQ(code(), kChannelsNotJson);
  // A removed file is not a failure.
  std::filesystem::remove(directory_.path("channels/Amp.json"));
  const auto samples = samplesOf(channels);
  ASSERT_TRUE(samples);
  EXPECT_THAT(textsOf(samples), IsEmpty());
  EXPECT_EQ(code(), 0);
}

TEST_F(LinuxChanmeterTest, GivesASetTogetherWithAnError) {
  publishValue("Amp", "pdm", 5);
  publish("Bad.json", "[]");
  const auto channels = channelsIn("pdm");
  ASSERT_TRUE(channels);
  EXPECT_EQ(chanmeter_.channelCount(*channels), 1);
  EXPECT_EQ(code(), kChannelsWrongType);
}

// A publisher replaces its file repeatedly while several threads take samples. Each sample must be one
// complete published state, and no call may fail. What they held is given back on those threads.
TEST_F(LinuxChanmeterTest, SamplesWholeFilesWhileTheyAreReplaced) {
  constexpr int kChannels = 200;
  const auto fileAt = [](int value) {
    std::string text = R"({"driver": "Amp", "channels": [)";
    for (int number = 0; number < kChannels; ++number) {
      text += (number == 0 ? "" : ",") + std::string(R"({"group": "pdm", "name": ")") +
              std::to_string(number) + R"(", "format": "simple", "value": )" + std::to_string(value) + "}";
    }
    return text + "]}";
  };
  publish("amp.json", fileAt(0));
  const auto channels = channelsIn("pdm");
  ASSERT_EQ(chanmeter_.channelCount(*channels), kChannels);

  std::atomic<bool> stop{false};
  std::thread publisher([&] {
    for (int value = 1; !stop; ++value) publish("amp.json", fileAt(value));
  });
  const auto sample = [&] {
    for (int time = 0; time < 50; ++time) {
      std::optional<ChanmeterError> error;
      Chanmeter::Channels subscribed;
      const auto subscription = chanmeter_.createSubscription(channels, subscribed, error);
      const auto samples = chanmeter_.createSamples(subscription, subscribed, error);
      ASSERT_TRUE(samples);
      EXPECT_FALSE(error);
      std::vector<std::int64_t> values;
      chanmeter_.iterate(*samples, [&values](const ChanmeterSample& one) {
        values.push_back(one.simpleIntegerValue());
        return 0;
      });
      EXPECT_EQ(values, std::vector<std::int64_t>(kChannels, values.at(0)));
    }
  };
  std::vector<std::thread> samplers;
  samplers.reserve(3);
  for (int number = 0; number < 3; ++number) samplers.emplace_back(sample);
  for (std::thread& sampler : samplers) sampler.join();
  stop = true;
  publisher.join();
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kError), IsEmpty());
  const std::shared_ptr<Account> owner = accounts_->of(::geteuid());
  EXPECT_GT(owner->held(Resource::kSnapshotBytes), 0U);
  std::filesystem::remove(directory_.path("channels/amp.json"));
  EXPECT_TRUE(samplesOf(channels));
  EXPECT_EQ(owner->held(Resource::kSnapshotBytes), 0U);
}

}  // namespace
}  // namespace tonewerk
