# What the topics are written in. Sourced by `run`; file descriptor 3 takes the results, one line a check, and what a failed
# one printed below it.

begin_topic() {
  printf '\n===== %s\n' "$1"
  printf '%s\n' "-- $1 ($(cut -d. -f1 /proc/uptime) s)" >&3
}

# check NAME COMMAND...: whether the command succeeds.
check() {
  local name=$1 output=/tmp/check
  shift
  printf '\n--- %s\n' "$name"
  if "$@" >$output 2>&1; then
    cat $output
    printf 'ok %s\n' "$name" >&3
  else
    printf 'status %s\n' $?
    cat $output
    { printf 'FAILED %s\n' "$name" && tail -n 12 $output | cut -c1-300 | sed 's/^/  | /'; } >&3
  fi
}

# await COMMAND...: repeats the command until it succeeds; the bound is far above what anything here takes.
await() {
  local end=$((SECONDS + 120))
  until "$@"; do
    [ $SECONDS -lt $end ] || { echo "waited in vain for: $*"; return 1; }
    sleep 0.2
  done
}

# refuses COMMAND...: succeeds when the command fails with a status of its own (not by a signal, not for not being found).
refuses() {
  local status=0
  "$@" || status=$?
  [ $status -gt 0 ] && [ $status -lt 126 ]
}

# says PATTERN COMMAND...: succeeds when the command prints a line that matches, whatever its status.
says() {
  local pattern=$1 output
  shift
  output=$("$@" 2>&1)
  printf '%s\n' "$output"
  grep -qE -- "$pattern" <<<"$output"
}

equal() { [ "$1" = "$2" ] || { printf 'found:    %s\nexpected: %s\n' "$1" "$2"; return 1; }; }

# as USER COMMAND...: with the user's groups and nothing else of a session; with the user's runtime directory where there is one.
as() {
  local user=$1 runtime
  shift
  runtime=/run/user/$(id -u "$user")
  runuser -u "$user" -- env -i PATH=/usr/bin:/bin LC_ALL=C.UTF-8 HOME="/home/$user" USER="$user" XDG_RUNTIME_DIR="$runtime" \
    DBUS_SESSION_BUS_ADDRESS="unix:path=$runtime/bus" "$@"
}

unit=twreportingd.service
state() { systemctl show --value --property "$1" $unit; }
daemon() { state MainPID; }
is_in_state() { [ "$(systemctl is-active "${2:-$unit}")" = "$1" ]; }

# restart_daemon: ends the daemon in order and has the next client start another.
stop_daemon() { systemctl stop $unit && is_in_state inactive; }
start_daemon() { twctl --system list >/dev/null && is_in_state active; }
restart_daemon() { stop_daemon && start_daemon; }

# What the kernel has denied since the last look, and the message bus.
denials_seen=0
denials() { journalctl --boot --output cat --grep 'apparmor="DENIED"' --case-sensitive --quiet; }
has_no_new_denials() {
  local all count
  journalctl --sync
  all=$(denials)
  count=$(grep -c . <<<"$all")
  local new=$((count - denials_seen))
  denials_seen=$count
  [ $new -eq 0 ] || { tail -n $new <<<"$all"; return 1; }
}

# has_rows TABLE [WHERE ...]: whether the store of the system's daemon has such rows.
store=/var/lib/tonewerk/reports.db
has_rows() { [ "$(sqlite3 -readonly $store "SELECT count(*) FROM $*")" -gt 0 ]; }
stored() { has_rows "analytics_event WHERE name = '$1'"; }
stored_with() { has_rows "analytics_event WHERE payload LIKE '%$1%'"; }
