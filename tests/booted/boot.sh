# Tests that after the boot only the socket of the daemon exists.

check 'the system comes up with nothing failed' says '^running$' systemctl is-system-running --wait
check 'AppArmor holds the daemon to its profile' grep -qx 'twreportingd (enforce)' /sys/kernel/security/apparmor/profiles
check 'what the profile denies cannot be read' refuses aa-exec --profile=twreportingd -- cat /etc/shadow
check 'and would be seen' refuses has_no_new_denials
check 'the socket waits for the first client' is_in_state active twreportingd.socket
check 'no daemon runs without a client' is_in_state inactive
check 'the socket belongs to the daemon and the group audio' \
  equal "$(stat --format '%U:%G %a' /run/tonewerk/reporting.sock)" 'tonewerk:audio 660'
check 'its directories belong to them, too' \
  equal "$(stat --format '%n %U:%G %a' /run/tonewerk /run/tonewerk/channels /run/tonewerk/notifications | paste -sd,)" \
  '/run/tonewerk tonewerk:tonewerk 755,/run/tonewerk/channels tonewerk:audio 3770,/run/tonewerk/notifications tonewerk:audio 3770'
