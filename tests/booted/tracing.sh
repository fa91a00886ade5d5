# Tests performance traces. Alone, the daemon traces programs of its own user. With root's session daemon, and in the group
# that may use it, the daemon traces the programs of all users.

cat >/etc/tonewerk/probes.json <<'END'
[{"name": "Requests", "children": [{"name": "sendMessage", "type": "interval"}]}, {"name": "decode", "type": "interval"}]
END
cat >/tmp/trace.jsonl <<'END'
{"at": 0, "call": "createReportingSession", "params": [91]}
{"at": 0, "call": "setServiceType", "params": [11, 91]}
{"at": 0, "call": "setConfiguration", "params": [{"TWReportingKolviPlistFilePath": "/etc/tonewerk/probes.json", "TWReportingKolviOutputFileName": "FILE"}, 91]}
{"at": 0, "call": "startReportingSessionForID", "params": [91]}
{"at": 0, "call": "sendMessage", "params": [{"a": 1}, 4, 1, [91]]}
{"at": 3000, "call": "stopReportingSessionForID", "params": [91]}
END

traces=/var/log/tonewerk/Audio/Traces
# Lists the results of all starts so far, successful or not.
starts() { journalctl --boot --unit $unit --output cat --grep 'Performance Trace Started|runtraceDidStart' --quiet; }
has_more_starts() { [ "$(starts | wc -l)" -gt "$1" ]; }
# start_trace FILE: starts a test session, which the process `holder` keeps open. The session daemon must start within five
# seconds. An emulated processor on a busy machine may be too slow for that: then the session ends, and the call may be
# repeated.
start_trace() {
  local before
  before=$(starts | wc -l)
  sed "s/FILE/$1/" /tmp/trace.jsonl >/tmp/this-trace.jsonl
  as player twctl --system replay /tmp/this-trace.jsonl &
  holder=$!
  await has_more_starts "$before"
  starts | tail -n 1
  [[ $(starts | tail -n 1) == *Started* ]] || { end_session && false; }
}
end_session() {
  pkill --parent $holder
  wait $holder
  true
}
# record FILE: records a trace of a program of the daemon's user (5 intervals) and of another user's (7 intervals).
record() {
  await start_trace "$1" || return 1
  runuser -u tonewerk -- env HOME=/var/lib/tonewerk /tests/signpost_program 1 5 >/dev/null
  as player /tests/signpost_program 1 7 >/dev/null
  end_session
  await test -s "$traces/$1"
}
traced() { grep -c "\"name\":\"$1\"" "$traces/$2"; }

check 'the daemon starts a session daemon of its own, and leaves a file' record own.bdj
check 'with its own requests' equal "$(traced sendMessage own.bdj)" 1
check "and its own user's program; another user's is not seen" equal "$(traced decode own.bdj)" 5

mkdir -p /etc/systemd/system/$unit.d
printf '[Service]\nSupplementaryGroups=tracing\n' >/etc/systemd/system/$unit.d/tracing.conf
systemctl daemon-reload
systemctl start lttng-sessiond
restart_daemon
check "with root's session daemon there is a file, too" record everybodys.bdj
check "with the daemon's requests" equal "$(traced sendMessage everybodys.bdj)" 1
check "and everybody's programs" equal "$(traced decode everybodys.bdj)" 12
check 'of the traces themselves nothing is left' equal "$(find /var/lib/tonewerk/traces -mindepth 1 -type d)" ''
rm /etc/systemd/system/$unit.d/tracing.conf
systemctl daemon-reload
systemctl stop lttng-sessiond
restart_daemon
