# The packages go from a running system, without a complaint.

export DEBIAN_FRONTEND=noninteractive
packages=$(dpkg-query --show --showformat '${Package} ' 'tonewerk-*' 'libtwreporting*')
# complaint FILE: lines of dpkg's that are not about what it does.
complaint() { grep -vE '^(\(Reading database|Removing |Purging configuration|Processing triggers)' "$1"; }

# Somebody whose service manager has no message bus.
loginctl enable-linger stranger
has_manager() { as "$1" systemctl --user --quiet is-active sockets.target; }
check 'a second user has a service manager' await has_manager stranger
check 'and the socket' as stranger systemctl --user --quiet is-active twreportingd.socket
check 'but no message bus' as stranger systemctl --user stop dbus.socket dbus.service

check 'the packages are removed' eval 'dpkg --remove $packages >/tmp/removal 2>&1 || { cat /tmp/removal; false; }'
check 'without a word' eval '! complaint /tmp/removal'
check 'no daemon is left' eval '! pgrep -a twreportingd'
check 'no socket either' eval '! find /run -name reporting.sock | grep .'
check 'the profile is gone from the kernel' eval '! grep twreportingd /sys/kernel/security/apparmor/profiles'
check 'reports and configuration are kept' test -s $store -a -s /etc/tonewerk/device-facts.toml
check 'they are purged' eval 'dpkg --purge $packages >/tmp/purge 2>&1 || { cat /tmp/purge; false; }'
check 'without a word' eval '! complaint /tmp/purge'
check 'nothing of the system'\''s is left' eval '! find / -xdev -path /tests -prune -o \( -name "*tonewerk*" -o -name "*twreporting*" \) \
  ! -path "/home/*" ! -path "/tmp/*" ! -path "/etc/hostname" -print | grep .'
check 'nor the user' refuses getent passwd tonewerk
check 'the system has nothing that failed' equal "$(systemctl --no-legend --plain list-units --failed)" ''
check 'what the user has kept is the user'\''s' test -s /home/player/.local/state/tonewerk/reports.db

# And back again, which a service manager sees this time.
check 'the packages install on a running system' eval 'dpkg --install /tests/{lib,tonewerk}*.deb >/tmp/install 2>&1 || { cat /tmp/install; false; }'
check 'without a word either' eval '! grep -vE "^(Selecting|Preparing|Unpacking|Setting up|Processing|Created symlink|\(Reading|Creating|/usr/lib/tmpfiles)" /tmp/install'
check 'the first client is served at once' as player twctl --system list
check "as is a user's own" as player twctl list
check 'whose socket waits for the user without a bus, too' as stranger systemctl --user --quiet is-active twreportingd.socket
