# Tests that the first client starts the daemon, and which users may be clients.

check 'somebody outside the group is refused' refuses as outsider twctl --system list
check 'and told that it is for want of permission' says '[Pp]ermission denied' as outsider twctl --system list
check 'which starts nothing' is_in_state inactive
check 'a member of the group audio is served' as player twctl --system list
check 'by a daemon that this client has started' is_in_state active
check 'the daemon is the user tonewerk' equal "$(ps -o user:16= -p "$(daemon)" | tr -d ' ')" tonewerk
check 'root is served' twctl --system list
check "and what is the daemon's is closed to others" refuses as outsider ls /var/lib/tonewerk
check 'a message of a member is taken' as player twctl --system send --category Playback --type Start hello=world
check 'and what was sent is stored' await stored com.orvane.standalone.Playback.Start
check 'but the store is not for the group audio' refuses as player twctl --system --json events
