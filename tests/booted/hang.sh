# Tests that a disk which does not answer does not leave a daemon that serves nobody: the watchdog ends it.

# The state lies on a file system of its own, which can be made to hang.
stop_daemon
truncate --size 48M /tmp/disk
mke2fs -q -t ext4 /tmp/disk
cp -a /var/lib/tonewerk /tmp/state
mount -o loop /tmp/disk /var/lib/tonewerk
cp -a /tmp/state/. /var/lib/tonewerk
mkdir -p /etc/systemd/system/$unit.d
printf '[Service]\nWatchdogSec=10\n' >/etc/systemd/system/$unit.d/watchdog.conf
systemctl daemon-reload
check 'the daemon works on a file system of its own' start_daemon
before=$(daemon)
as player twctl --system send --category Playback --type Start hello=disk
check 'and stores there' await stored_with '"hello":"disk"'

# Other topics end the daemon by the watchdog, too.
cursor=$(journalctl --boot --lines 0 --show-cursor | sed -n 's/^-- cursor: //p')
journal() { journalctl --after-cursor "$cursor" --unit $unit --output cat; }
fsfreeze --freeze /var/lib/tonewerk
as player twctl --system send --category Playback --type Start hello=frozen
check 'when the disk hangs, the log names the thread that stands still' \
  await says 'the (work queue|store) has made no progress for [0-9]+ s; the watchdog is told nothing until it does' journal
check 'and the watchdog ends the daemon' await says "$unit: Watchdog timeout" journal
fsfreeze --unfreeze /var/lib/tonewerk
check 'which is gone when the disk answers again' await test ! -e "/proc/$before"
check 'and the next client is served' await twctl --system list
check 'by another daemon' eval 'is_in_state active && [ "$(daemon)" != "$before" ]'

stop_daemon
umount /var/lib/tonewerk
rm -r /etc/systemd/system/$unit.d/watchdog.conf /tmp/disk /tmp/state
systemctl daemon-reload
check 'the daemon works again on the disk that it had' start_daemon
