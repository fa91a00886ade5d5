# Functions for the topics. Sourced by `run`. Results go to file descriptor 3: one line for each check, and below it the
# output of a failed check.

begin_topic() {
  printf '\n===== %s\n' "$1"
  printf '%s\n' "-- $1 ($(cut -d. -f1 /proc/uptime) s)" >&3
}

# check NAME COMMAND...: runs the command and reports whether it succeeds.
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

# await COMMAND...: repeats the command until it succeeds. The time limit is far above the duration of any step here.
await() {
  local end=$((SECONDS + 120))
  until "$@"; do
    [ $SECONDS -lt $end ] || { echo "waited in vain for: $*"; return 1; }
    sleep 0.2
  done
}

# refuses COMMAND...: succeeds when the command itself fails (a signal or a missing program does not count).
refuses() {
  local status=0
  "$@" || status=$?
  [ $status -gt 0 ] && [ $status -lt 126 ]
}

# says PATTERN COMMAND...: succeeds when the command prints a matching line; its status does not matter.
says() {
  local pattern=$1 output
  shift
  output=$("$@" 2>&1)
  printf '%s\n' "$output"
  grep -qE -- "$pattern" <<<"$output"
}

equal() { [ "$1" = "$2" ] || { printf 'found:    %s\nexpected: %s\n' "$1" "$2"; return 1; }; }

# as USER COMMAND...: runs the command as the user, with the user's groups and runtime directory, but without a login session.
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

# restart_daemon: ends the daemon in order and lets the next client start a new one.
stop_daemon() { systemctl stop $unit && is_in_state inactive; }
start_daemon() { twctl --system list >/dev/null && is_in_state active; }
restart_daemon() { stop_daemon && start_daemon; }

# Lists what the kernel and the message bus have denied. has_no_new_denials succeeds when nothing was denied since its last
# call.
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

# has_rows TABLE [WHERE ...]: succeeds when the store of the system's daemon has matching rows.
store=/var/lib/tonewerk/reports.db
has_rows() { [ "$(sqlite3 -readonly $store "SELECT count(*) FROM $*")" -gt 0 ]; }
stored() { has_rows "analytics_event WHERE name = '$1'"; }
stored_with() { has_rows "analytics_event WHERE payload LIKE '%$1%'"; }
