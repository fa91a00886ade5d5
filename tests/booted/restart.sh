# Tests that the next client starts a new daemon, in whatever way the old one ended.

# has_another PID: succeeds when a daemon runs that is not this process.
has_another() { is_in_state active && [ "$(daemon)" != "$1" ]; }

before=$(daemon)
kill -KILL "$before"
check 'after a crash the next client is served' await twctl --system list
check 'by another daemon' has_another "$before"

before=$(daemon)
twctl --system kill
check 'a daemon that a client has ended counts as ended well' await is_in_state inactive
check 'its socket stays' is_in_state active twreportingd.socket
check 'and the next client is served' twctl --system list

mkdir -p /etc/systemd/system/$unit.d
printf '[Service]\nWatchdogSec=10\n' >/etc/systemd/system/$unit.d/watchdog.conf
systemctl daemon-reload
restart_daemon
before=$(daemon)
kill -STOP "$before"
check 'a daemon that hangs is ended by the watchdog' await test ! -e "/proc/$before"
check 'the next client is served again' await twctl --system list
check 'by yet another daemon' has_another "$before"
check 'and the journal says why' says 'Watchdog timeout' journalctl --boot --unit $unit --output cat
rm /etc/systemd/system/$unit.d/watchdog.conf
systemctl daemon-reload
restart_daemon

check 'the daemon that is stopped ends in order' stop_daemon
check 'with a good result' equal "$(state Result)" success
start_daemon
