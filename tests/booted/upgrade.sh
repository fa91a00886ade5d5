# Tests the upgrade to a new version of the package on a running system. A configuration file that the device's owner has
# changed also differs in the new version.

export DEBIAN_FRONTEND=noninteractive
before=$(daemon)
preferences=/var/lib/tonewerk/preferences
chown root:root $preferences $preferences/.lock $preferences/*.toml
check 'the new version installs' dpkg --install --force-confold /tests/upgrade.deb
check 'the daemon that ran has ended' test ! -e "/proc/$before"
check 'the new one runs or waits for its client' await twctl --system list
check 'from the new file' eval '[ "/proc/$(daemon)/exe" -ef /usr/bin/twreportingd ]'
check 'as the version that is installed' says upgrade dpkg-query --show tonewerk-reporting-daemon
check "the owner's configuration is kept" grep -qx 'InternalBuild = true' /etc/tonewerk/device-facts.toml
check "preferences that were root's are the daemon's again" \
  equal "$(stat --format %U $preferences $preferences/.lock $preferences/*.toml | sort -u)" tonewerk
check "the maker's lies beside it" grep -qx '# A line of the new version.' /etc/tonewerk/device-facts.toml.dpkg-dist
check 'the socket is served and belongs to the group' equal "$(stat --format '%U:%G %a' /run/tonewerk/reporting.sock)" 'tonewerk:audio 660'
check 'what was stored is there' stored com.orvane.standalone.Playback.Start
check "the user's socket waits" as player systemctl --user --quiet is-active twreportingd.socket

# A link in place of the daemon's preferences. An attacker with the rights of the daemon could make one.
stop_daemon
mv $preferences $preferences.away
mkdir /tmp/of-root
touch /tmp/of-root/x.toml
ln -s /tmp/of-root $preferences
/var/lib/dpkg/info/tonewerk-reporting-daemon.postinst configure >/dev/null 2>&1
check "root's files behind a link stay root's" equal "$(stat --format %U /tmp/of-root /tmp/of-root/x.toml | sort -u)" root
rm $preferences
mv $preferences.away $preferences
check 'the daemon starts after it' start_daemon
