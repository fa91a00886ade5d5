# Tests that the packages can be removed from a running system without errors.

export DEBIAN_FRONTEND=noninteractive
# These files belong to the device's owner; no package removes them.
rm -r /etc/systemd/system/$unit.d
systemctl daemon-reload
packages=$(dpkg-query --show --showformat '${Package} ' '*tonewerk-*' 'libtwreporting*')
# complaint FILE: prints the lines of dpkg that are not about its normal work.
complaint() { grep -vE '^(\(Reading database|Removing |Purging configuration|Processing triggers)' "$1"; }

# A user whose service manager has no message bus.
loginctl enable-linger outsider
has_manager() { as "$1" systemctl --user --quiet is-active sockets.target; }
check 'a second user has a service manager' await has_manager outsider
check 'and the socket' as outsider systemctl --user --quiet is-active twreportingd.socket
check 'but no message bus' as outsider systemctl --user stop dbus.socket dbus.service

# left_of PACKAGE...: prints those packages of which dpkg still keeps configuration files.
left_of() { dpkg-query --show --showformat '${Package} ${db:Status-Status}\n' "$@" 2>/dev/null | sed -n 's/ config-files$//p'; }
check 'the packages are removed' eval 'dpkg --remove $packages >/tmp/removal 2>&1 || { cat /tmp/removal; false; }'
check 'the removal complains of nothing' eval '! complaint /tmp/removal'
check 'no daemon is left' eval '! pgrep -a twreportingd'
check 'nor a mount' eval '! grep tonewerk /proc/mounts'
check 'no socket either' eval '! find /run -name reporting.sock | grep .'
check 'the profile is gone from the kernel' eval '! grep twreportingd /sys/kernel/security/apparmor/profiles'
check 'reports and configuration are kept' test -s $store -a -s /etc/tonewerk/device-facts.toml
check 'they are purged' eval 'dpkg --purge $(left_of $packages) >/tmp/purge 2>&1 || { cat /tmp/purge; false; }'
check 'the purge complains of nothing' eval '! complaint /tmp/purge'
check 'nothing of the system'\''s is left' eval '! find / -xdev -path /tests -prune -o \( -name "*tonewerk*" -o -name "*twreporting*" \) \
  ! -path "/home/*" ! -path "/tmp/*" -print | grep .'
check 'nor the user' refuses getent passwd tonewerk
check 'the system has nothing that failed' equal "$(systemctl --no-legend --plain list-units --failed)" ''
check 'what the user has kept is the user'\''s' test -s /home/player/.local/state/tonewerk/reports.db

# Installs the packages again, now with a running service manager.
check 'the packages install on a running system' eval 'dpkg --install /tests/{lib,python3,tonewerk}*.deb >/tmp/install 2>&1 || { cat /tmp/install; false; }'
check 'the installation complains of nothing' eval '! grep -vE "^(Selecting|Preparing|Unpacking|Setting up|Processing|Created symlink|\(Reading|Creating|/usr/lib/tmpfiles)" /tmp/install'
check 'the first client is served at once' as player twctl --system list
check 'whose directories are mounted' eval 'mountpoint -q /run/tonewerk/channels && mountpoint -q /run/tonewerk/notifications'
check "as is a user's own" as player twctl list
check 'whose socket waits for the user without a bus, too' as outsider systemctl --user --quiet is-active twreportingd.socket
