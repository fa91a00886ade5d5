# Makes the device a development device: an internal build with all its features enabled.

# The daemon subscribes to channels at its first session, so they are published before.
cp driver-channels.json /run/tonewerk/channels/.amp.new
chown player:audio /run/tonewerk/channels/.amp.new
mv /run/tonewerk/channels/.amp.new /run/tonewerk/channels/amp.json

printf 'InternalBuild = true\nHapticLeakCapture = true\n' >>/etc/tonewerk/device-facts.toml
mkdir -p /etc/systemd/system/$unit.d
printf '[Service]\nEnvironment=TONEWERK_LOG=info\n' >/etc/systemd/system/$unit.d/log.conf
systemctl daemon-reload

write_preference() { twctl --system defaults write "$@"; }
check 'root writes preferences' write_preference com.orvane.tonewerk.twreporting VidroInvalidXyBackOffSeconds 3600
write_preference com.orvane.tonewerk.twreporting enable_whirlcap true
# As on a device whose audio server has a user of its own: only trusted users have memory logs.
write_preference com.orvane.tonewerk.service trusted_users '["player"]'
write_preference com.orvane.linkreport backends '["local", "http://127.0.0.1:4318"]'
check 'which stay the daemon'\''s' \
  equal "$(stat --format '%U:%G' /var/lib/tonewerk/preferences /var/lib/tonewerk/preferences/* /var/lib/tonewerk/preferences/.lock | sort -u)" tonewerk:tonewerk
restart_daemon
check 'programs are told that they can be traced' await test -e /run/tonewerk/signposts

# Diagnostics depend on the daemon's clock and take more than a minute. The topic `diagnostics` checks their results.
as player twctl --system replay /tests/diagnostics.jsonl >/tmp/diagnostics.log 2>&1 &
diagnostics=$!
