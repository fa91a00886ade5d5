// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreViews.h"

#include <cstdlib>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <string>
#include <vector>

#include "platform/linux/store/RowsOf.h"
#include "platform/linux/store/StoreDatabase.h"
#include "protocol/AudioEvent.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

using Result = StoreDatabase::Result;

class StoreViewsTest : public testing::Test {
 protected:
  template <typename... Rows>
  void write(const Rows&... rows) {
    StoreBatch batch;
    (batch.add(rows, StoreRowText(rows)), ...);
    ASSERT_EQ(store_.write(batch), Result::kDone) << store_.problem();
  }
  AnalyticsRow messageOf(AudioEventCategory category, AudioEventType type, ValueMap payload,
                         EventSource source = EventSource::kDerived) const {
    return {10.0,
            "com.orvane.test",
            std::move(payload),
            {.category = category, .type = type, .source = source, .life = life_}};
  }
  AnalyticsRow channels(AudioEventType type, ValueMap payload) const {
    return messageOf(kCategoryChanmetering, type, std::move(payload));
  }
  // The columns of each row of `sql`, joined by spaces.
  std::vector<std::string> rows(const std::string& sql, int columns) {
    SqliteDatabase database;
    EXPECT_TRUE(database.open(path(), SqliteDatabase::Mode::kReadOnly, std::chrono::seconds(30)));
    return rowsOf(database, sql, columns);
  }
  void change(const std::string& sql) {
    SqliteDatabase database;
    ASSERT_TRUE(database.open(path(), SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(30)));
    ASSERT_TRUE(database.run(sql)) << database.problem();
  }
  std::string path() const { return directory_.path("reports.db"); }

  TemporaryDirectory directory_;
  MemoryJsonService json_;
  ManualClock clock_;
  StoreDatabase store_{directory_.path(), json_, clock_};
  const std::shared_ptr<SessionLife> life_ =
      std::make_shared<SessionLife>(SessionBeginning{.reporterID = 7, .at = 1.0, .service = "unknown"});
};

constexpr const char* kChannel =
    " coalesce(driver, '-') || '/' || coalesce(group_name, '-') || '/' || coalesce(subgroup, '-') || '/' ||"
    " coalesce(name, '-') ";

TEST_F(StoreViewsTest, EveryViewHasItsColumns) {
  write(PowerRow{1.0, 28, "power", {}});
  for (const StoreView& view : storeViews()) {
    std::vector<std::string> expected;
    for (const StoreViewColumn& column : view.columns) expected.emplace_back(column.name);
    const std::string name(view.name);
    EXPECT_EQ(rows("SELECT name FROM pragma_table_info('" + name + "') ORDER BY cid", 1), expected) << name;
    (void)rows("SELECT * FROM " + name, 1);  // fails when it cannot be prepared
  }
}

TEST_F(StoreViewsTest, AMessageUnderTwoNamesIsOneEvent) {
  AnalyticsRow row = messageOf(kCategoryVolume, kTypeSummary, {{"n", 1}});
  row.names = {"com.orvane.first", "com.orvane.second"};
  AnalyticsRow fromClient = messageOf(kCategoryVolume, kTypeSummary, {{"n", 2}}, EventSource::kClient);
  fromClient.names = row.names;
  write(row, fromClient);
  EXPECT_THAT(
      rows("SELECT id, at, session, category, type, source, payload FROM event", 7),
      ElementsAre(R"(1 10.0 1 Volume Summary derived {"n":1})", R"(2 10.0 1 Volume Summary client {"n":2})"));
}

TEST_F(StoreViewsTest, WhatIsNoMessageIsNoEvent) {
  write(AnalyticsRow{1.0, "com.orvane.tonewerk.uptime", {{"n", 1}}});
  EXPECT_THAT(rows("SELECT id FROM event", 1), IsEmpty());
}

TEST_F(StoreViewsTest, ASummaryIsAStretchAndWhatAClientCallsOneIsNot) {
  AnalyticsRow summary = messageOf(kCategoryVolume, kTypeSummary,
                                   {{"play_seconds", 2.5}, {"QMSessionVolume", 0.3}, {"ringerstate", true}});
  summary.subject.stretch = {4.0, 6.5};
  AnalyticsRow forged = summary;
  forged.subject.source = EventSource::kClient;
  write(summary, forged);
  EXPECT_THAT(
      rows("SELECT id, session, started_at, ended_at, seconds, volume, ringer FROM volume_stretch", 7),
      ElementsAre("1 1 4.0 6.5 2.5 0.3 1"));
}

TEST_F(StoreViewsTest, WhatIsNotKnownIsNull) {
  write(messageOf(kCategoryVolume, kTypeSummary,
                  {{"play_seconds", 2.5},
                   {"active_devices", "unknown"},
                   {"mFormatID", "unknown"},
                   {"session_selected_format", "unknown"},
                   {"mChannelsPerFrame", -1},
                   {"QMSessionVolumeBucketed", ""},
                   {"HostApplicationDisplayID", "Unknown"}}));
  EXPECT_THAT(rows("SELECT count(*) FROM volume_stretch WHERE service IS NULL AND application IS NULL AND"
                   " device IS NULL AND volume IS NULL AND volume_bucket IS NULL AND sample_rate IS NULL AND"
                   " channels IS NULL AND format IS NULL AND started_at IS NULL",
                   1),
              ElementsAre("1"));
}

TEST_F(StoreViewsTest, TheSampleRateIsThatOfTheSelectedFormat) {
  write(messageOf(kCategoryVolume, kTypeSummary, {{"session_selected_format", "44100 Hz, 2 ch, Float32"}}),
        messageOf(kCategoryVolume, kTypeSummary, {{"session_selected_format", "2 ch, 44100 Hz"}}));
  EXPECT_THAT(rows("SELECT sample_rate FROM volume_stretch ORDER BY id", 1), ElementsAre("44100", ""));
}

TEST_F(StoreViewsTest, AnIssueIsAMessageOfAnyTypeThatNamesOne) {
  write(messageOf(kCategoryIo, kTypeError,
                  {{"issue_type", "overload"},
                   {"node", "mixer"},
                   {"any_channel_silence_seconds", 2},
                   {"smallest_buffer_frame_size", 256},
                   {"io_cycle", 12}},
                  EventSource::kClient),
        messageOf(kCategoryIo, kTypeGeneric, {{"issue_type", 5}}, EventSource::kClient),
        messageOf(kCategoryIo, kTypeError, {{"text", "\"issue_type\":"}}, EventSource::kClient));
  EXPECT_THAT(rows("SELECT kind, node, duration_seconds, buffer_frames, io_cycle FROM issue ORDER BY id", 5),
              ElementsAre("overload mixer 2.0 256 12", "5    "));
}

TEST_F(StoreViewsTest, AGlitchIsAnOverloadWithItsVerdict) {
  // As long as cycles may be.
  std::string cycles = R"([{"begin":0,"period":5333.3,"nodes":[{"name":")";
  constexpr std::size_t kMostCycles = 6 * 1024;
  cycles.append(kMostCycles - cycles.size() - 6, 'x').append(R"("}]}])");
  ASSERT_GE(cycles.size(), kMostCycles - 1);
  write(messageOf(kCategoryIo, kTypeError,
                  {{"issue_type", "overload"},
                   {"HostApplicationDisplayID", "org.example.Player"},
                   {"twreporting_timestamp", 9.5},
                   {"xrun_count", 3},
                   {"glitch_id", "9500-47"},
                   {"glitch_cause", "waiting for another"},
                   {"glitch_first_cause", "late"},
                   {"glitch_confidence", 0.75},
                   {"glitch_culprit_application", "org.example.Studio"},
                   {"glitch_culprit_process", "studio"},
                   {"glitch_culprit_pid", 4711},
                   {"glitch_culprit_node", "filter"},
                   {"glitch_node", "player"},
                   {"glitch_device", "speaker"},
                   {"glitch_chain", "filter > player > speaker"},
                   {"glitch_over_ms", 3.125},
                   {"glitch_period_ms", 5},
                   {"glitch_quantum", 256},
                   {"glitch_rate", 48000},
                   {"glitch_lost_ms", 5.5},
                   {"glitch_reason", "filter took 8.1 ms of 5 ms."},
                   {"glitch_cycles", cycles}},
                  EventSource::kClient));
  EXPECT_THAT(
      rows("SELECT id, at, began_at, glitch_id, session, application, cause, first_cause, confidence, "
           "culprit_application, culprit_process, culprit_pid, culprit_node, node, device, chain, "
           "over_ms, period_ms, quantum, rate, lost_ms, overloads, reason, length(cycles) FROM glitch",
           24),
      ElementsAre("1 10.0 9.5 9500-47 1 org.example.Player waiting for another late 0.75 "
                  "org.example.Studio studio 4711 filter player speaker filter > player > speaker "
                  "3.125 5.0 256 48000 5.5 3 filter took 8.1 ms of 5 ms. " +
                  std::to_string(cycles.size())));
  EXPECT_THAT(rows("SELECT cycles FROM glitch", 1), ElementsAre(cycles));
}

TEST_F(StoreViewsTest, AnOverloadThatNobodyHasJudgedIsAGlitchWithoutAVerdict) {
  write(messageOf(kCategoryIo, kTypeError, {{"issue_type", "overload"}}, EventSource::kClient),
        messageOf(kCategoryIo, kTypeError, {{"issue_type", "silence"}}, EventSource::kClient),
        messageOf(kCategoryIo, kTypeGeneric, {{"issue_type", "overload"}}, EventSource::kClient),
        messageOf(kCategoryIo, kTypeError,
                  {{"issue_type", "overload"}, {"glitch_cause", "unknown"}, {"glitch_culprit_process", ""}},
                  EventSource::kClient));
  EXPECT_THAT(rows("SELECT id, overloads, coalesce(glitch_id, cause, first_cause, confidence, "
                   "culprit_application, culprit_process, culprit_pid, node, over_ms, cycles) FROM glitch",
                   3),
              ElementsAre("1 1 ", "4 1 "));
}

// Any client may send such a message.
TEST_F(StoreViewsTest, WhatAGlitchCannotSayIsNull) {
  const ValueMap forged{{"issue_type", "overload"},
                        {"twreporting_timestamp", 1e12},
                        {"xrun_count", -5},
                        {"glitch_id", ValueArray{1}},
                        {"glitch_cause", true},
                        {"glitch_confidence", 7},
                        {"glitch_culprit_application", ValueMap{{"a", 1}}},
                        {"glitch_culprit_pid", -1},
                        {"glitch_over_ms", "long"},
                        {"glitch_period_ms", -1},
                        {"glitch_quantum", 1e300},
                        {"glitch_rate", true},
                        {"glitch_lost_ms", 1e300}};
  for (const char* cycles : {"[{\"begin\":", "", "{\"begin\":0}", "7", "\xef\xbf\xbd"}) {
    ValueMap message = forged;
    message.set("glitch_cycles", cycles);
    write(messageOf(kCategoryIo, kTypeError, std::move(message), EventSource::kClient));
  }
  ValueMap nested = forged;
  constexpr std::size_t kDepth = 10'000;
  nested.set("glitch_cycles", std::string(kDepth, '[') + std::string(kDepth, ']'));
  ValueMap array = forged;
  array.set("glitch_cycles", ValueArray{1});
  write(messageOf(kCategoryIo, kTypeError, std::move(nested), EventSource::kClient),
        messageOf(kCategoryIo, kTypeError, std::move(array), EventSource::kClient));
  EXPECT_THAT(
      rows("SELECT count(*), max(overloads) FROM glitch WHERE coalesce(began_at, glitch_id, cause, "
           "confidence, culprit_application, culprit_pid, over_ms, period_ms, quantum, rate, lost_ms, "
           "cycles) IS NULL",
           2),
      ElementsAre("7 1"));
  EXPECT_THAT(rows("SELECT count(*) FROM glitch, json_each(cycles)", 1), ElementsAre("0"));
}

TEST_F(StoreViewsTest, HapticsAreThePowerEventsOfTheirGroup) {
  write(PowerRow{1.0, 28, "on", {{"EngineOnDuration", 3}, {"ApplicationName", "app"}}},
        PowerRow{2.0, 28, "status", {{"Status", true}, {"ApplicationName", "Unknown"}}},
        PowerRow{3.0, 28, "leak", {{"Haptic_Active_Hardware_Time_Seconds", 3600}}},
        PowerRow{4.0, 29, "other", {{"Status", true}}});
  EXPECT_THAT(rows("SELECT at, application, name, seconds, status FROM haptics ORDER BY id", 5),
              ElementsAre("1.0 app on 3.0 ", "2.0  status  1", "3.0  leak 3600.0 "));
}

TEST_F(StoreViewsTest, AChannelsKeyTellsDriverGroupSubgroupAndName) {
  write(channels(kTypeSimple, {{"Drv_Rx_MCA_Simple_Frames", 1},
                               {"Drv_Other_Simple_Frames", 2},
                               {"Drv_Stats_Simple_Frames", 3},
                               {"Speaker_Simple_Frames", 4},
                               {"Haptics_Stats_Simple_Frames", 5},
                               {"Pellan2_Simple_Frames", 6},
                               {"Drv_Simple_Frames", 7},
                               {"Simple_Frames", 8},
                               {"Simple_", 9},
                               {"audiotag", "ChanmeteringSimple"},
                               {"twreporting_timestamp", 10.0}}));
  EXPECT_THAT(rows(std::string("SELECT value, ") + kChannel + "FROM channel_value ORDER BY value", 2),
              ElementsAre("1 Drv/Rx/MCA/Frames", "2 Drv/Other/-/Frames", "3 Drv/-/Stats/Frames",
                          "4 -/Speaker/-/Frames", "5 -/Haptics/Stats/Frames", "6 -/-/Pellan2/Frames",
                          "7 Drv/-/-/Frames", "8 -/-/-/Frames", "9 -/-/-/-"));
}

TEST_F(StoreViewsTest, AHistogramBecomesARowForEachBucketAlsoBelowZero) {
  write(channels(kTypeHistogram,
                 {{"Drv_Tx_Histogram_Delay",
                   "count=4,lower=-10,upper=30,min=-7,max=25,unit=us::-10--5:2;-5-5:1;20-30:7"},
                  {"Drv_Tx_Histogram_None", "count=4,lower=0,upper=30,min=3,max=25,unit=(null)::0-10:5"}}));
  EXPECT_THAT(
      rows("SELECT name, coalesce(unit, '-'), lower, upper, hits FROM channel_bucket ORDER BY name, lower",
           5),
      ElementsAre("Delay us -10 -5 2", "Delay us -5 5 1", "Delay us 20 30 7", "None - 0 10 5"));
}

TEST_F(StoreViewsTest, AStateChannelBecomesARowForEachStateWhateverItsName) {
  write(channels(kTypeState,
                 {{"Drv_pdm_State_Mic",
                   "name:on \"1\",transition:3,residency:200,duty_cycle:0.250000;name:a,b;c,transition:1,"
                   "residency:600,duty_cycle:0.750000;"},
                  {"Drv_pdm_State_Idle", ""}}));
  EXPECT_THAT(
      rows("SELECT state, transitions, residency, duty_cycle FROM channel_state ORDER BY transitions DESC",
           4),
      ElementsAre("on \"1\" 3 200 0.25", "a,b;c 1 600 0.75"));
}

// Clients may send anything under these keys, and some of it reaches summaries.
TEST_F(StoreViewsTest, AValueOfAnotherTypeIsNull) {
  write(messageOf(kCategoryVolume, kTypeSummary,
                  {{"play_seconds", "long"},
                   {"QMSessionVolume", "loud"},
                   {"QMSessionVolumeBucketed", "louder"},
                   {"mChannelsPerFrame", "two"},
                   {"mFormatID", ValueArray{1}},
                   {"active_devices", ValueArray{"Speaker"}},
                   {"ringerstate", "on"},
                   {"spatializationEnabled", "yes"}}),
        messageOf(kCategoryInput, kTypeSummary, {{"inputrunning_seconds", true}, {"vocoders", ValueArray{}}}),
        messageOf(kCategoryGather, kTypeSummary, {{"play_seconds", "long"}, {"mChannelsPerFrame", "two"}}),
        messageOf(kCategoryIo, kTypeError,
                  {{"issue_type", "overload"},
                   {"node", ValueArray{}},
                   {"any_channel_silence_seconds", "long"},
                   {"smallest_buffer_frame_size", "many"},
                   {"io_cycle", "first"}},
                  EventSource::kClient),
        channels(kTypeSimple, {{"Drv_Simple_Frames", "many"}}),
        channels(kTypeHistogram, {{"Drv_Histogram_Delay", 5}}), channels(kTypeState, {{"Drv_State_Mic", 5}}),
        PowerRow{1.0, 28, "on", {{"EngineOnDuration", "long"}, {"Status", "on"}}});
  EXPECT_THAT(rows("SELECT seconds, device, volume, volume_bucket, channels, format, ringer, spatial"
                   " FROM volume_stretch",
                   8),
              ElementsAre("       "));
  EXPECT_THAT(rows("SELECT seconds, vocoders FROM input_stretch", 2), ElementsAre(" "));
  EXPECT_THAT(rows("SELECT seconds, channels FROM gather_stretch", 2), ElementsAre(" "));
  EXPECT_THAT(rows("SELECT kind, node, duration_seconds, buffer_frames, io_cycle FROM issue", 5),
              ElementsAre("overload    "));
  EXPECT_THAT(rows("SELECT value FROM channel_value", 1), ElementsAre(""));
  EXPECT_THAT(rows("SELECT * FROM channel_bucket", 1), IsEmpty());
  EXPECT_THAT(rows("SELECT * FROM channel_state", 1), IsEmpty());
  EXPECT_THAT(rows("SELECT seconds, status FROM haptics", 2), ElementsAre(" "));
}

TEST_F(StoreViewsTest, EveryColumnHasValuesOfItsType) {
  const ValueMap summary{{"play_seconds", 2},
                         {"inputrunning_seconds", 2},
                         {"HostApplicationDisplayID", "app"},
                         {"active_devices", "Speaker"},
                         {"QMSessionVolume", 1},
                         {"QMSessionVolumeBucketed", "1"},
                         {"session_selected_format", "48000 Hz, 2 ch"},
                         {"mChannelsPerFrame", "2"},
                         {"mFormatID", "lpcm"},
                         {"ringerstate", true},
                         {"spatializationEnabled", 1},
                         {"vp_config_operation_mode", "voice"},
                         {"vp_config_input_port", 3},
                         {"vocoders", "A:16000"}};
  write(messageOf(kCategoryVolume, kTypeSummary, summary), messageOf(kCategoryInput, kTypeSummary, summary),
        messageOf(kCategoryGather, kTypeSummary, summary),
        messageOf(kCategoryIo, kTypeError,
                  {{"issue_type", 1},
                   {"node", 12},
                   {"any_channel_silence_seconds", 1},
                   {"smallest_buffer_frame_size", 256.0},
                   {"io_cycle", 3.0},
                   {"HostApplicationDisplayID", 4}}),
        messageOf(kCategoryIo, kTypeError,
                  {{"issue_type", "overload"},
                   {"xrun_count", 2.0},
                   {"twreporting_timestamp", 10},
                   {"glitch_id", 4},
                   {"glitch_cause", 5},
                   {"glitch_confidence", 1},
                   {"glitch_culprit_pid", 3.0},
                   {"glitch_quantum", 256.0},
                   {"glitch_over_ms", 3},
                   {"glitch_cycles", "[]"}}),
        channels(kTypeSimple, {{"Drv_Rx_MCA_Simple_Frames", 1.0}}),
        channels(kTypeHistogram,
                 {{"Drv_Rx_MCA_Histogram_Delay", "count=4,lower=0,upper=30,min=3,max=25,unit=us::0-10:5"}}),
        channels(kTypeState, {{"Drv_Rx_MCA_State_Mic", "name:on,transition:3,residency:200,duty_cycle:1;"}}),
        PowerRow{1.0, 28, "on", {{"EngineOnDuration", 3}, {"Status", true}, {"ApplicationName", 1}}},
        SendingRow{{.sentAt = 1.0, .signal = "logs", .status = 200, .rejected = 0}, "http://fleet", "slow"});
  for (const StoreView& view : storeViews()) {
    const std::string name(view.name);
    EXPECT_NE(rows("SELECT count(*) FROM " + name, 1), std::vector<std::string>{"0"}) << name;
    for (const StoreViewColumn& column : view.columns) {
      EXPECT_THAT(rows("SELECT DISTINCT typeof(" + std::string(column.name) + ") FROM " + name, 1),
                  testing::Each(testing::AnyOf("null", column.type)))
          << name << "." << column.name;
    }
  }
  // What is of the right type, or means the same, is there.
  EXPECT_THAT(rows("SELECT seconds, device, volume, volume_bucket, sample_rate, channels, format, ringer,"
                   " spatial FROM volume_stretch",
                   9),
              ElementsAre("2.0 Speaker 1.0 1.0 48000 2 lpcm 1 1"));
  EXPECT_THAT(rows("SELECT mode, input_port, vocoders FROM input_stretch", 3),
              ElementsAre("voice 3 A:16000"));
  EXPECT_THAT(rows("SELECT kind, node, duration_seconds, buffer_frames, io_cycle FROM issue", 5),
              ElementsAre("1 12 1.0 256 3", "overload    "));
  EXPECT_THAT(rows("SELECT began_at, glitch_id, cause, confidence, culprit_pid, quantum, over_ms, overloads, "
                   "cycles FROM glitch",
                   9),
              ElementsAre("10.0 4 5 1.0 3 256 3.0 2 []"));
}

TEST_F(StoreViewsTest, AnEmptiedPayloadIsReadAsNothing) {
  write(messageOf(kCategoryVolume, kTypeSummary, {{"play_seconds", 2.5}}),
        channels(kTypeHistogram, {{"a", 1}}), PowerRow{1.0, 28, "power", {{"Status", true}}});
  change("UPDATE analytics_row SET payload = '{}'; UPDATE power_event SET payload = '{}'");
  for (const StoreView& view : storeViews()) (void)rows("SELECT * FROM " + std::string(view.name), 1);
  EXPECT_THAT(rows("SELECT seconds FROM volume_stretch", 1), ElementsAre(""));
}

TEST_F(StoreViewsTest, AViewOfAnotherFormIsMadeAnewWhenTheFileIsOpened) {
  write(PowerRow{1.0, 28, "power", {}});
  change("DROP VIEW session; CREATE VIEW session (id) AS SELECT 1; DROP VIEW haptics");
  StoreDatabase next(directory_.path(), json_, clock_);
  ASSERT_EQ(next.write({}), Result::kDone);
  EXPECT_THAT(rows("SELECT count(*) FROM session", 1), ElementsAre("0"));
  EXPECT_THAT(rows("SELECT count(*) FROM haptics", 1), ElementsAre("1"));
}

// Stretches of a time are found by key, however many rows there are.
TEST_F(StoreViewsTest, StretchesOfATimeAreFoundByKey) {
  write(PowerRow{1.0, 28, "power", {}});
  EXPECT_THAT(rows("EXPLAIN QUERY PLAN SELECT * FROM volume_stretch WHERE started_at > 5", 4),
              testing::Contains(testing::HasSubstr("USING INDEX analytics_row_by_stretch (began_at>?)")));
}

// docs/views.md is made of the views. To accept a new text, see CONTRIBUTING.md.
TEST(ViewsDocumentTest, SaysWhatTheViewsAre) {
  std::string text =
      "# The views of the report store\n\n"
      "For people who ask the [report store](store.md) with SQL: `twctl sql`, or any SQLite tool. Each row "
      "is one thing. Columns\n"
      "are typed, and null where nothing is known. Times are seconds since 1970, UTC. Views read the whole "
      "store where\n"
      "nothing else is said; stretches of a time are found by key. A program made this page from the views' "
      "own descriptions.\n";
  for (const StoreView& view : storeViews()) {
    text.append("\n## ").append(view.name).append("\n\nA row is ").append(view.row).append(".\n\n");
    text.append("| column | type | |\n|---|---|---|\n");
    for (const StoreViewColumn& column : view.columns) {
      text.append("| `").append(column.name).append("` | ").append(column.type).append(" | ");
      text.append(column.about).append(" |\n");
    }
  }
  const std::string path = TONEWERK_SOURCE_DIR "/docs/views.md";
  if (std::getenv("TONEWERK_ACCEPT_VIEWS") != nullptr) std::ofstream(path) << text;
  std::ifstream file(path);
  const std::string found{std::istreambuf_iterator<char>(file), {}};
  EXPECT_TRUE(found == text) << "docs/views.md says something else than the views";
}

}  // namespace
}  // namespace tonewerk
