# Tests a user's own daemon under the user's service manager, and the PipeWire bridge.

user_unit() { as player systemctl --user "$@"; }
user_daemon() { user_unit show --value --property MainPID $unit; }
user_runtime=/run/user/$(id -u player)/tonewerk
user_store=/home/player/.local/state/tonewerk/reports.db
user_stored() { [ -n "$(sqlite3 -readonly $user_store "SELECT 1 FROM analytics_event WHERE $1 LIMIT 1")" ]; }

loginctl enable-linger player
check 'the user has a service manager' await eval '[[ $(user_unit is-system-running) =~ running|degraded ]]'
check 'in which the socket waits' await user_unit --quiet is-active twreportingd.socket
check 'for this user' equal "$(stat --format '%U %a' $user_runtime/reporting.sock)" 'player 660'
check 'no daemon runs without a client' equal "$(user_daemon)" 0
check 'the first client is served' as player twctl list
check "by a daemon of the user's" equal "$(ps -o user:16= -p "$(user_daemon)" | tr -d ' ')" player
check 'which is held to its profile, too' equal "$(cat "/proc/$(user_daemon)/attr/current")" 'twreportingd (enforce)'
user_status() { awk -v key="$1:" '$1 == key { print $2 }' "/proc/$(user_daemon)/status"; }
check 'can gain no rights, and its system calls are filtered' equal "$(user_status NoNewPrivs) $(user_status Seccomp)" '1 2'
check 'and its memory and its threads are bounded' \
  equal "$(user_unit show --value --property MemoryMax --property TasksMax $unit | grep . | sort | paste -sd' ')" '1073741824 256'
check 'systemd finds it restricted, without privileges' \
  says 'Overall exposure level for twreportingd.service: [0-6]\.' as player systemd-analyze --user --no-pager security $unit
# Why the unit has no more restrictions: they need a user namespace, in which the daemon's client root would be nobody.
check 'in a user namespace of a service of a user root would be nobody' \
  says '^nobody$' as player systemd-run --user --quiet --wait --pipe --property PrivateUsers=yes stat --format %U /etc/passwd
check "and which is not the system's" eval '[ "$(user_daemon)" != "$(daemon)" ]'
check "the user's bus has the daemon's name" await says '^b true' as player busctl --user call com.orvane.tonewerk.reporting \
  /com/orvane/tonewerk/reporting com.orvane.tonewerk.TWReportingServiceProtocol CreateReportingSession x 5
check 'a preference is written and kept at home' eval 'as player twctl defaults write com.orvane.tonewerk.store max_days 7 &&
  [ "$(stat --format %U /home/player/.local/state/tonewerk/preferences/com.orvane.tonewerk.store.toml)" = player ]'
check 'an example reports to it, and prints the report that came of it' says 'org.example.Report.*Volume.Summary' as player /tests/report.c.out
check 'from the store at home' user_stored "name = 'com.orvane.longformaudio.Volume.Summary' AND payload LIKE '%org.example.Report%'"

# PipeWire is started by its socket. The guest has no sound card, so a virtual sink is created.
check 'the bridge starts' user_unit enable --now --quiet tw-pipewire.service pipewire.service wireplumber.service
await as player pw-cli info 0 >/dev/null
as player pw-cli create-node adapter '{ factory.name=support.null-audio-sink node.name=hall node.description="The hall"
  media.class=Audio/Sink object.linger=true audio.position=[FL FR] audio.rate=48000 }'
python3 -c 'import wave
with wave.open("/tmp/tone.wav", "wb") as tone:
    tone.setparams((2, 2, 48000, 0, "NONE", ""))
    tone.writeframes(bytes(48000 * 4 * 30))'
as player pw-play --target hall /tmp/tone.wav &
tone=$!
check 'and reports what plays' await says longformaudio as player twctl list
pkill --parent $tone
check 'with program and device, when it has ended' await user_stored "payload LIKE '%The hall%' AND payload LIKE '%pw-cat%'"
check 'the bridge publishes what the graph counts' eval "ls $user_runtime/channels/ | grep -q ."
user_unit stop pipewire.socket pipewire.service wireplumber.service
check 'without PipeWire the bridge waits' user_unit --quiet is-active tw-pipewire.service
check "without complaints of the user's manager" eval '[ -z "$(user_unit --quiet --no-legend --plain list-units --failed)" ]'
