// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreViews.h"

#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {
namespace {

// A message of the daemon, or one of a file of an earlier version, which does not know who made it.
std::string derived(std::string_view category, std::string_view type) {
  std::string sql = "r.name_set IN (SELECT name_set FROM analytics_name WHERE category = '";
  sql.append(category).append("' AND type = '").append(type);
  return sql.append("' AND source IS NOT 'client')");
}

// The entry of a payload when it has one of these types of JSON, else null.
std::string entryOf(std::string_view payload, std::string_view key, std::string_view types,
                    std::string_view sqlType) {
  std::string sql = "CASE WHEN json_type(";
  sql.append(payload).append(", '$.").append(key).append("') IN (").append(types);
  sql.append(") THEN CAST(").append(payload).append(" ->> '").append(key).append("' AS ").append(sqlType);
  return sql.append(") END");
}

// The bucketed volume, and numbers of some clients, are texts like "0.5".
std::string numericEntryOf(std::string_view payload, std::string_view key, std::string_view types,
                           std::string_view sqlType) {
  const std::string text = std::string(payload) + " ->> '" + std::string(key) + "'";
  std::string sql = "coalesce(" + entryOf(payload, key, types, sqlType) + ", CASE WHEN json_type(";
  sql.append(payload).append(", '$.").append(key).append("') = 'text' AND ");
  sql.append(text).append(" GLOB '[0-9]*' AND ");
  sql.append(text).append(" NOT GLOB '*[^0-9.]*' AND ").append(text).append(" NOT GLOB '*.*.*' THEN CAST(");
  return sql.append(text).append(" AS ").append(sqlType).append(") END)");
}

std::string numberIn(std::string_view payload, std::string_view key) {
  return numericEntryOf(payload, key, "'integer', 'real'", "REAL");
}

std::string integerIn(std::string_view payload, std::string_view key) {
  return numericEntryOf(payload, key, "'integer', 'real'", "INTEGER");
}

// Whether something is so: 1 or 0.
std::string flagIn(std::string_view payload, std::string_view key) {
  return numericEntryOf(payload, key, "'true', 'false', 'integer', 'real'", "INTEGER");
}

// Some clients name things by numbers.
std::string textIn(std::string_view payload, std::string_view key) {
  return entryOf(payload, key, "'text', 'integer', 'real'", "TEXT");
}

// A text that is null when it is `unknown`.
std::string knownTextIn(std::string_view payload, std::string_view key, std::string_view unknown) {
  std::string sql = "nullif(" + textIn(payload, key) + ", '";
  return sql.append(unknown).append("')");
}

constexpr std::string_view kOfRow = "r.payload";

// The rate at the beginning of a text like "48000 Hz, 2 ch, Float32".
constexpr std::string_view kSampleRate =
    "CASE WHEN r.payload ->> 'session_selected_format' GLOB '[0-9]* Hz*'"
    " AND r.payload ->> 'session_selected_format' NOT GLOB '* * Hz*'"
    " THEN CAST(r.payload ->> 'session_selected_format' AS INTEGER) END";

std::string stretchesOf(std::string_view category, const std::string& columns) {
  std::string sql = "SELECT r.id, r.session, nullif(s.service, 'unknown'), ";
  sql += category == "Gather" ? "s.application" : knownTextIn(kOfRow, "HostApplicationDisplayID", "Unknown");
  sql.append(", r.began_at, r.ended_at, ").append(columns);
  sql.append(" FROM analytics_row AS r LEFT JOIN session_row AS s ON s.id = r.session WHERE ");
  return sql.append(derived(category, "Summary"));
}

std::string secondsAndDevice(std::string_view seconds) {
  return "round(" + numberIn(kOfRow, seconds) + ", 3), " + knownTextIn(kOfRow, "active_devices", "unknown");
}

std::string formatColumns() {
  return std::string(kSampleRate) + ", nullif(" + integerIn(kOfRow, "mChannelsPerFrame") + ", -1), " +
         knownTextIn(kOfRow, "mFormatID", "unknown");
}

std::string volumeStretches() {
  return stretchesOf("Volume", secondsAndDevice("play_seconds") + ", " + numberIn(kOfRow, "QMSessionVolume") +
                                   ", " + numberIn(kOfRow, "QMSessionVolumeBucketed") + ", " +
                                   formatColumns() + ", " + flagIn(kOfRow, "ringerstate") + ", " +
                                   flagIn(kOfRow, "spatializationEnabled"));
}

std::string inputStretches() {
  return stretchesOf("Input", secondsAndDevice("inputrunning_seconds") + ", " +
                                  knownTextIn(kOfRow, "vp_config_operation_mode", "unknown") + ", " +
                                  knownTextIn(kOfRow, "vp_config_input_port", "unknown") + ", " +
                                  textIn(kOfRow, "vocoders"));
}

std::string gatherStretches() {
  return stretchesOf("Gather", secondsAndDevice("play_seconds") + ", " + formatColumns());
}

std::string issues() {
  return "SELECT r.id, r.recorded_at, r.session, nullif(s.service, 'unknown'), " +
         knownTextIn(kOfRow, "HostApplicationDisplayID", "Unknown") +
         ", CAST(r.payload ->> 'issue_type' AS TEXT), " + textIn(kOfRow, "node") + ", " +
         numberIn(kOfRow, "any_channel_silence_seconds") + ", " +
         integerIn(kOfRow, "smallest_buffer_frame_size") + ", " + integerIn(kOfRow, "io_cycle") +
         " FROM analytics_row AS r LEFT JOIN session_row AS s ON s.id = r.session"
         " WHERE instr(r.payload, '\"issue_type\":') > 0 AND r.payload ->> 'issue_type' IS NOT NULL";
}

// A number of a payload; null when it is none, or out of the range.
std::string numberBetween(std::string_view key, std::string_view sqlType, std::string_view least,
                          std::string_view most) {
  const std::string number = entryOf(kOfRow, key, "'integer', 'real'", sqlType);
  std::string sql = "CASE WHEN (" + number + ") BETWEEN ";
  sql.append(least).append(" AND ").append(most).append(" THEN ").append(number);
  return sql.append(" END");
}

// A cause or a name; null when it is not known.
std::string glitchText(std::string_view key) {
  return "nullif(" + knownTextIn(kOfRow, key, "unknown") + ", '')";
}

// Programs choose the time of a message. A glitch is reported within seconds.
std::string glitchBegin() {
  const std::string begin = entryOf(kOfRow, "twreporting_timestamp", "'integer', 'real'", "REAL");
  return "CASE WHEN (" + begin + ") BETWEEN r.recorded_at - 3600 AND r.recorded_at + 60 THEN " + begin +
         " END";
}

// Whoever asks for the parts of the cycles must not fail on a text that is no JSON.
std::string glitchCycles() {
  const std::string text = "r.payload ->> 'glitch_cycles'";
  return "CASE WHEN json_type(r.payload, '$.glitch_cycles') = 'text' THEN CASE WHEN json_valid(" + text +
         ") THEN CASE WHEN json_type(" + text + ") = 'array' THEN " + text + " END END END";
}

// Overloads with a verdict, and those without. An overload is looked for by its names, which are few.
std::string glitches() {
  constexpr std::string_view kMostMilliseconds = "1e9";
  constexpr std::string_view kMostNumber = "2147483647";
  return "SELECT r.id, r.recorded_at, " + glitchBegin() + ", " + glitchText("glitch_id") +
         ", r.session, nullif(s.service, 'unknown'), " +
         knownTextIn(kOfRow, "HostApplicationDisplayID", "Unknown") + ", " + glitchText("glitch_cause") +
         ", " + glitchText("glitch_first_cause") + ", " +
         numberBetween("glitch_confidence", "REAL", "0", "1") + ", " +
         glitchText("glitch_culprit_application") + ", " + glitchText("glitch_culprit_process") + ", " +
         numberBetween("glitch_culprit_pid", "INTEGER", "1", kMostNumber) + ", " +
         glitchText("glitch_culprit_node") + ", " + glitchText("glitch_node") + ", " +
         glitchText("glitch_device") + ", " + glitchText("glitch_chain") + ", " +
         numberBetween("glitch_over_ms", "REAL", "0", kMostMilliseconds) + ", " +
         numberBetween("glitch_period_ms", "REAL", "0", kMostMilliseconds) + ", " +
         numberBetween("glitch_quantum", "INTEGER", "1", kMostNumber) + ", " +
         numberBetween("glitch_rate", "INTEGER", "1", kMostNumber) + ", " +
         numberBetween("glitch_lost_ms", "REAL", "0", kMostMilliseconds) + ", coalesce(" +
         numberBetween("xrun_count", "INTEGER", "1", "1000000") + ", 1), " + glitchText("glitch_reason") +
         ", " + glitchCycles() +
         " FROM analytics_row AS r LEFT JOIN session_row AS s ON s.id = r.session WHERE r.name_set IN "
         "(SELECT "
         "name_set FROM analytics_name WHERE category = 'IO' AND type = 'Error') AND r.payload ->> "
         "'issue_type' = 'overload'";
}

std::string haptics() {
  return "SELECT id, recorded_at, " + knownTextIn("payload", "ApplicationName", "Unknown") +
         ", name, coalesce(" + numberIn("payload", "EngineOnDuration") + ", " +
         numberIn("payload", "Haptic_Active_Hardware_Time_Seconds") + "), " + flagIn("payload", "Status") +
         " FROM power_event WHERE event_group = 28";
}

// The entries of what the driver statistics of one form sent, with the parts of their keys:
// "AmpDrv_Speaker_Simple_RailVolts". Driver, group and subgroup may each be missing. Where a part is alone,
// or two are there, those groups and subgroups are recognised that the daemon subscribes to.
std::string channels(std::string_view form) {
  constexpr std::string_view kGroups =
      "('OrvaneAE2MCA', 'Speaker', 'Haptics', 'StateTransitionTimesms', 'Rx', 'Tx', 'pdm')";
  constexpr std::string_view kSubgroups = "('MCA', 'Stats', 'Pellan2')";
  std::string mark = "_";
  mark.append(form).append("_");
  std::string sql = "(SELECT session, at, value, name,";
  // Three parts are all of them.
  sql.append(" CASE WHEN third <> '' THEN first WHEN first IN ").append(kGroups);
  sql.append(" THEN NULL WHEN second <> '' THEN first WHEN first IN ").append(kSubgroups);
  sql.append(" THEN NULL ELSE nullif(first, '') END AS driver,");
  sql.append(" CASE WHEN third <> '' THEN second WHEN first IN ").append(kGroups);
  sql.append(" THEN first WHEN second IN ").append(kSubgroups);
  sql.append(" THEN NULL ELSE nullif(second, '') END AS group_name,");
  sql.append(" CASE WHEN third <> '' THEN third WHEN first IN ").append(kGroups);
  sql.append(" THEN nullif(second, '') WHEN second IN ").append(kSubgroups);
  sql.append(" THEN second WHEN second = '' AND first IN ").append(kSubgroups);
  sql.append(" THEN first END AS subgroup FROM (SELECT session, at, value, name, first,");
  sql.append(" substr(rest, 1, instr(rest || '_', '_') - 1) AS second,");
  sql.append(" substr(rest, instr(rest || '_', '_') + 1) AS third FROM (SELECT session, at, value, name,");
  sql.append(" substr(head, 1, instr(head || '_', '_') - 1) AS first,");
  sql.append(" substr(head, instr(head || '_', '_') + 1) AS rest FROM (");
  sql.append("SELECT r.session AS session, r.recorded_at AS at, j.value AS value,");
  sql.append(" substr('_' || j.key, 2, instr('_' || j.key, '").append(mark).append("') - 2) AS head,");
  sql.append(" nullif(substr('_' || j.key, instr('_' || j.key, '").append(mark).append("') + ");
  sql.append(std::to_string(mark.size())).append("), '') AS name");
  sql.append(" FROM analytics_row AS r CROSS JOIN json_each(r.payload) AS j WHERE ");
  sql.append(derived("Chanmetering", form));
  sql.append(" AND instr('_' || j.key, '").append(mark).append("') > 0))))");
  return sql;
}

// "count=4,lower=0,upper=30,min=3,max=25,unit=us::0-10:5;20-30:7" becomes a row for each bucket. A bound may
// be below 0. A histogram without a unit says "(null)".
std::string channelBuckets() {
  return "SELECT session, at, driver, group_name, subgroup, name, unit,"
         " CAST(substr(bounds, 1, dash - 1) AS INTEGER), CAST(substr(bounds, dash + 1) AS INTEGER), hits "
         "FROM ("
         "SELECT session, at, driver, group_name, subgroup, name, unit, bounds, hits,"
         " instr(substr(bounds, 2), '-') + 1 AS dash FROM ("
         "SELECT c.session AS session, c.at AS at, c.driver AS driver, c.group_name AS group_name,"
         " c.subgroup AS subgroup, c.name AS name,"
         " nullif(nullif(substr(c.value, instr(c.value, 'unit=') + 5,"
         " instr(c.value, '::') - instr(c.value, 'unit=') - 5), ''), '(null)') AS unit,"
         " substr(b.value, 1, instr(b.value, ':') - 1) AS bounds,"
         " CAST(substr(b.value, instr(b.value, ':') + 1) AS INTEGER) AS hits FROM " +
         channels("Histogram") +
         " AS c CROSS JOIN json_each('[' || replace(json_quote(substr(c.value, instr(c.value, '::') + 2)),"
         " ';', '\",\"') || ']') AS b WHERE instr(c.value, '::') > 0 AND instr(b.value, ':') > 0))";
}

// "name:ON,transition:3,residency:200,duty_cycle:0.250000;name:OFF,..." becomes a row for each state.
std::string channelStates() {
  return "SELECT session, at, driver, group_name, subgroup, name,"
         " substr(state, 1, instr(state, ',transition:') - 1),"
         " CAST(substr(state, instr(state, ',transition:') + 12) AS INTEGER),"
         " CAST(substr(state, instr(state, ',residency:') + 11) AS INTEGER),"
         " CAST(substr(state, instr(state, ',duty_cycle:') + 12) AS REAL) FROM ("
         "SELECT c.session AS session, c.at AS at, c.driver AS driver, c.group_name AS group_name,"
         " c.subgroup AS subgroup, c.name AS name, b.value AS state FROM " +
         channels("State") +
         " AS c CROSS JOIN json_each('[' || replace(json_quote(substr(c.value, 6)), ';name:', '\",\"') || "
         "']')"
         " AS b WHERE instr(c.value, 'name:') = 1)";
}

constexpr StoreViewColumn kSession{"session", "integer", "the `session`"};
constexpr StoreViewColumn kService{"service", "text", "what the session reports for, as \"telephony\""};
constexpr StoreViewColumn kApplication{"application", "text", "the client application's identifier"};
constexpr StoreViewColumn kStretchBegin{"started_at", "real", "when the stretch began"};
constexpr StoreViewColumn kStretchEnd{"ended_at", "real", "when it ended"};
constexpr StoreViewColumn kDevice{"device", "text", "the devices that were active"};
constexpr StoreViewColumn kSampleRateColumn{"sample_rate", "integer",
                                            "in Hz, where the selected format begins with it"};
constexpr StoreViewColumn kChannels{"channels", "integer", "in a frame"};
constexpr StoreViewColumn kFormat{"format", "text", "the format's identifier, as \"lpcm\""};
constexpr StoreViewColumn kDriver{"driver", "text", "the driver's name"};
constexpr StoreViewColumn kGroup{"group_name", "text", "the channel's group"};
constexpr StoreViewColumn kSubgroup{"subgroup", "text", "and its subgroup"};
constexpr StoreViewColumn kChannelName{"name", "text", "the channel"};
constexpr StoreViewColumn kCountedAt{"at", "real", "when the session ended"};

std::vector<StoreView> makeViews() {
  return {
      {"session",
       "a session's life, from its start to its stop",
       {{"id", "integer", "its number in this store"},
        {"reporter_id", "integer", "the identifier that its client knows it by"},
        kService,
        kApplication,
        {"process", "text", "the client's process name"},
        {"user_id", "integer", "the user of the client"},
        {"started_at", "real", "when it began"},
        {"ended_at", "real", "when it ended; null while it runs"},
        {"ending", "text",
         "\"stopped\", \"replaced\" (by another session of its client under the same identifier), "
         "\"disconnected\" (its client had gone) or \"interrupted\" (the daemon had gone); null while it "
         "runs"},
        {"messages", "integer",
         "received, without the summaries made at its end; null while it runs, and when it was interrupted "
         "and "
         "no journal was kept"},
        {"unique_messages", "integer", "those that repeated none; null as `messages` is"},
        {"redundant_messages", "integer", "those that repeated another one; null as `messages` is"},
        {"active_seconds", "real", "the sum of the durations that it reported; null as `messages` is"},
        {"overloads", "integer", "the number of overloads that it reported; null as `messages` is"}},
       "SELECT id, reporter_id, nullif(service, 'unknown'), application, process, user_id, started_at, "
       "ended_at, ending, messages,"
       " messages - redundant_messages, redundant_messages, active_seconds, overloads FROM session_row"},
      {"event",
       "a message, once, whatever the number of its names",
       {{"id", "integer", "grows in the order of recording"},
        {"at", "real", "when it was recorded"},
        kSession,
        {"category", "text", "its category"},
        {"type", "text", "its type"},
        {"source", "text", "\"client\" or \"derived\" (the daemon has made it)"},
        {"payload", "text", "the message, as JSON"}},
       "SELECT r.id, r.recorded_at, r.session, n.category, n.type, n.source, r.payload"
       " FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set AND n.position = 0"
       " WHERE n.category IS NOT NULL"},
      {"volume_stretch",
       "a stretch of playback at one volume, on the same devices, in the same format",
       {{"id", "integer", "the `event`"},
        kSession,
        kService,
        kApplication,
        kStretchBegin,
        kStretchEnd,
        {"seconds", "real", "how long it played"},
        kDevice,
        {"volume", "real", "0 to 1"},
        {"volume_bucket", "real", "the nearest of 17 volumes, 0 to 1 in steps of 0.0625"},
        kSampleRateColumn,
        kChannels,
        kFormat,
        {"ringer", "integer", "1 when the ringer was on"},
        {"spatial", "integer", "1 when it was spatialised"}},
       volumeStretches()},
      {"input_stretch",
       "a stretch of recording on the same devices",
       {{"id", "integer", "the `event`"},
        kSession,
        kService,
        kApplication,
        kStretchBegin,
        kStretchEnd,
        {"seconds", "real", "how long input ran"},
        kDevice,
        {"mode", "text", "the operation mode of voice processing"},
        {"input_port", "text", "its input port"},
        {"vocoders", "text", "the vocoders that were switched to, with their rates, as \"A:16000,B:8000\""}},
       inputStretches()},
      {"gather_stretch",
       "a stretch of playback in a shared group session",
       {{"id", "integer", "the `event`"},
        kSession,
        kService,
        kApplication,
        kStretchBegin,
        kStretchEnd,
        {"seconds", "real", "how long it played"},
        kDevice,
        kSampleRateColumn,
        kChannels,
        kFormat},
       gatherStretches()},
      {"issue",
       "an overload or another issue",
       {{"id", "integer", "the `event`"},
        {"at", "real", "when it was recorded"},
        kSession,
        kService,
        kApplication,
        {"kind", "text", "\"overload\", or what its client calls it"},
        {"node", "text", "where in the audio graph"},
        {"duration_seconds", "real", "for how long a channel was silent"},
        {"buffer_frames", "integer", "the smallest buffer, in frames"},
        {"io_cycle", "integer", "the cycle's number"}},
       issues()},
      {"glitch",
       "an overload in one session, with the verdict on whose it was; sessions that one overload concerns "
       "share its `glitch_id`",
       {{"id", "integer", "the `event`"},
        {"at", "real", "when it was recorded"},
        {"began_at", "real", "when its cycle of the audio graph began"},
        {"glitch_id", "text", "the same in each session; null for an overload that nobody has judged"},
        kSession,
        kService,
        kApplication,
        {"cause", "text",
         "of the gap in this session: \"late\", \"not scheduled\", \"stuck\", \"waiting for another\", "
         "\"device\", \"graph changed\" or \"system slept\""},
        {"first_cause", "text", "of the first in the chain of those who waited, one of the same texts"},
        {"confidence", "real", "in the verdict, 0 to 1"},
        {"culprit_application", "text", "the application that caused it"},
        {"culprit_process", "text", "its process, or the one that held the processor"},
        {"culprit_pid", "integer", "the number of this process"},
        {"culprit_node", "text", "the node that was first in the chain"},
        {"node", "text", "the node through which this session lost its audio"},
        {"device", "text", "the node that drove the graph"},
        {"chain", "text", "from the first node to the device, as \"player > filter > sink\""},
        {"over_ms", "real", "milliseconds beyond the period's end that the culprit took, at least"},
        {"period_ms", "real", "the time for one cycle, in milliseconds"},
        {"quantum", "integer", "frames in a cycle"},
        {"rate", "integer", "in Hz"},
        {"lost_ms", "real", "how much audio was lost, in milliseconds"},
        {"overloads", "integer", "so many with the same cause within a second; 1 where nothing is said"},
        {"reason", "text", "the figures behind the verdict, in a sentence"},
        {"cycles", "text",
         "a JSON array of the cycles around it, with times in microseconds since its own cycle began; null "
         "when the message has another text"}},
       glitches()},
      {"haptics",
       "a power event of the haptics engine",
       {{"id", "integer", "grows in the order of recording"},
        {"at", "real", "when it was recorded"},
        kApplication,
        {"name", "text", "the power event"},
        {"seconds", "real", "for how long the engine was on, in the unit of the application that reports it"},
        {"status", "integer", "1 when the engine came on, 0 when it went off"}},
       haptics()},
      {"channel_value",
       "what a driver's counter counted in a session",
       {kSession,
        kCountedAt,
        kDriver,
        kGroup,
        kSubgroup,
        kChannelName,
        {"unit", "text", "null: simple counters report none"},
        {"value", "integer", "by how much it grew"}},
       "SELECT session, at, driver, group_name, subgroup, name, CAST(NULL AS TEXT),"
       " CASE WHEN typeof(value) IN ('integer', 'real') THEN CAST(value AS INTEGER) END FROM " +
           channels("Simple")},
      {"channel_bucket",
       "a bucket of a driver's histogram that had hits in a session",
       {kSession,
        kCountedAt,
        kDriver,
        kGroup,
        kSubgroup,
        kChannelName,
        {"unit", "text", "of the bounds"},
        {"lower", "integer", "the lower bound"},
        {"upper", "integer", "the upper bound"},
        {"hits", "integer", "in this session"}},
       channelBuckets()},
      {"channel_state",
       "a state in which a driver was in a session",
       {kSession,
        kCountedAt,
        kDriver,
        kGroup,
        kSubgroup,
        kChannelName,
        {"state", "text", "its name"},
        {"transitions", "integer", "into the state"},
        {"residency", "integer", "how long it was in the state, in the driver's unit"},
        {"duty_cycle", "real", "the part of the time, 0 to 1"}},
       channelStates()},
      {"ledger",
       "a request that was sent to an endpoint in the network; a request that is sent again has another row",
       {{"id", "integer", "grows in the order of sending"},
        {"at", "real", "when it was sent"},
        {"endpoint", "text", "the address, without user, password and query, at most 256 bytes of it"},
        {"signal", "text", "\"logs\""},
        {"records", "integer", "in the request"},
        {"bytes", "integer", "of the request's body, as it was sent"},
        {"first_event", "integer",
         "the first `event` in it; null where that is not known, as it is of all real-time-communication "
         "messages"},
        {"last_event", "integer", "the last one; null as `first_event` is"},
        {"status", "integer", "of HTTP; null when there was no answer"},
        {"outcome", "text",
         "what became of the records: \"delivered\", \"kept\" (to be sent again), \"split\" (to be sent "
         "again in halves) or \"dropped\""},
        {"rejected", "integer",
         "how many of the records it did not take, as its answer says; null unless it accepted the request"},
        {"problem", "text", "why there was no answer, or what is wrong with it"}},
       "SELECT id, sent_at, endpoint, signal, records, bytes, first_event, last_event, status, outcome, "
       "rejected, problem FROM sending_row"},
  };
}

std::string creationOf(const StoreView& view) {
  std::string sql = "CREATE VIEW ";
  sql.append(view.name).append(" (");
  for (const StoreViewColumn& column : view.columns) {
    sql.append(&column == view.columns.data() ? "" : ", ").append(column.name);
  }
  return sql.append(") AS ").append(view.select);
}

}  // namespace

const std::vector<StoreView>& storeViews() {
  static const std::vector<StoreView> views = makeViews();
  return views;
}

std::string storeViewsSql() {
  std::string sql;
  for (const StoreView& view : storeViews()) sql.append(creationOf(view)).append(";");
  return sql;
}

bool ensureStoreViews(SqliteDatabase& database) {
  std::string missing;
  SqliteStatement find =
      database.prepare("SELECT sql = ?2 FROM sqlite_master WHERE type = 'view' AND name = ?1");
  for (const StoreView& view : storeViews()) {
    const std::string creation = creationOf(view);
    find.bind(1, view.name);
    find.bind(2, creation);
    const SqliteStatement::Step step = find.step();
    if (step == SqliteStatement::Step::kFailed) return false;
    const bool isThere = step == SqliteStatement::Step::kRow && find.integer(0) == 1;
    find.reset();
    if (isThere) continue;
    missing.append("DROP VIEW IF EXISTS ").append(view.name).append(";").append(creation).append(";");
  }
  find = {};
  return missing.empty() || database.run("BEGIN IMMEDIATE;" + missing + "COMMIT;");
}

}  // namespace tonewerk
