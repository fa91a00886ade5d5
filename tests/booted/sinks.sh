# Tests every sink of the daemon, and every input from outside that reaches a running session.

python3 /tests/receiver.py 4318 >/tmp/received 2>/tmp/receiver.log &
receiver=$!

check 'a recording that uses every sink is played' as player twctl --system replay --speed max /tests/every-sink.jsonl
check 'events are stored' await stored com.orvane.longformaudio.Output.Start
check 'the volume is summed up' await stored com.orvane.tonewerk.Volume.Summary
check 'power events are stored' await has_rows power_event
check 'metrics are stored' await has_rows metric
check 'real-time communication is stored' await has_rows rtc_message
check 'and sent to the endpoint' await grep -q '^/v1/logs .*longformaudio' /tmp/received
summaries() { find /var/log/tonewerk/Audio -type f -name '*.json'; }
check 'a summary file is written' await eval '[ -n "$(summaries)" ]'
summaries_are_as_they_should_be() {
  local file
  for file in $(summaries); do
    python3 -m json.tool "$file" >/dev/null && equal "$(stat --format '%U:%G %a' "$file")" 'tonewerk:tonewerk 640' || return 1
  done
}
check 'as JSON, for the group tonewerk' summaries_are_as_they_should_be
check 'the tools read each of them' eval 'twctl --system events | grep -q Volume && twctl --system power | grep -q Haptic &&
  twctl --system metrics | grep -q . && twctl --system rtc | grep -q .'

# A session that a client holds open.
printf '%s\n' '{"at": 0, "call": "createReportingSession", "params": [41]}' '{"at": 0, "call": "setServiceType", "params": [7, 41]}' \
  '{"at": 0, "call": "startReportingSessionForID", "params": [41]}' '{"at": 3000, "call": "stopReportingSessionForID", "params": [41]}' \
  >/tmp/hold.jsonl
as player twctl --system replay /tmp/hold.jsonl &
holder=$!
check 'a session runs' await says '\b41\b' as player twctl --system list

check 'the name of the device is written' twctl --system defaults write com.orvane.tonewerk device_name Kitchen
check 'and the running session is told of the name' await stored_with Kitchen
check 'a notification is posted by a member of the group' as player twctl --system notify post com.orvane.homedeck.ringerstate 1
check 'and the running session is told of it' await stored_with '"ringerstate":true'
check 'nobody else posts' refuses as outsider twctl --system notify post com.orvane.homedeck.ringerstate 0

twctl --system defaults delete com.orvane.tonewerk device_name
printf 'device_name = "Cellar"\n' >/etc/tonewerk/preferences/com.orvane.tonewerk.toml
before=$(daemon)
check 'the daemon is told to read its files again' systemctl reload $unit
check 'and lives on' equal "$(daemon)" "$before"
check 'with the preference that has changed' await stored_with Cellar

check 'published channels are seen' says 'Rail Volts' as player twctl --system channels
sed 's/"value": 12/"value": 90/; s/"hits": 5/"hits": 25/' driver-channels.json >/run/tonewerk/channels/.amp.new
mv /run/tonewerk/channels/.amp.new /run/tonewerk/channels/amp.json
pkill --parent $holder
check 'what changed in them is reported when the session ends' await stored_with AmpDrv_Speaker_Simple_RailVolts

# Counts the summaries of the examples; each program adds one.
example_summaries() {
  sqlite3 -readonly $store "SELECT count(*) FROM analytics_event
    WHERE name = 'com.orvane.longformaudio.Volume.Summary' AND payload LIKE '%org.example.Report%'"
}
has_example_summaries() { [ "$(example_summaries)" -eq "$1" ]; }
check 'no example has reported so far' has_example_summaries 0
count=0
for program in report.c report.cpp; do
  count=$((count + 1))
  check "examples/$program reports" says 'report: done' as player env TONEWERK_REPORTING_SOCKET=/run/tonewerk/reporting.sock /tests/$program.out
  check "and what examples/$program played is summed up" await has_example_summaries $count
done
kill $receiver
