# Tests the directories into which all members of the group audio write.

shared=/run/tonewerk/notifications
useradd --create-home --groups audio neighbour
post_as() { as "$1" twctl --system notify post "${@:2}"; }
posted() { equal "$(twctl --system notify get "$1" | tr -dc '0-9')" "$2"; }
# free_in_run: the free space of /run itself, in KiB.
free_in_run() { df --output=avail /run | tail -n 1; }

for directory in channels notifications; do
  check "the $directory are a file system of their own" mountpoint -q /run/tonewerk/$directory
  check 'without programs, devices or rights of other users' \
    eval "grep ' /run/tonewerk/$directory tmpfs ' /proc/mounts | grep nosuid | grep nodev | grep noexec"
  check 'with bounds' eval "grep ' /run/tonewerk/$directory tmpfs ' /proc/mounts | grep size=8192k | grep nr_inodes=2048"
done
check 'who is not in the group sees nothing of them' refuses as outsider ls $shared

check 'a member posts' post_as player com.example.players 1
check 'and posts again' post_as player com.example.players 2
check 'another member cannot remove the file' refuses as neighbour rm -f $shared/com.example.players
check 'nor rename it' refuses as neighbour mv $shared/com.example.players $shared/com.example.neighbours
check 'nor replace it' refuses as neighbour sh -c "echo 7 >$shared/.new && mv -f $shared/.new $shared/com.example.players"
check 'nor write to it' refuses as neighbour sh -c "echo 7 >$shared/com.example.players"
check 'nor post its name' refuses post_as neighbour com.example.players 7
check 'nor post it with its state' refuses post_as neighbour com.example.players
check 'it has the state of its owner' posted com.example.players 2
check 'the other member posts other names' post_as neighbour com.example.neighbours 3

check "the daemon's user posts its own" post_as tonewerk com.example.daemons 4
check 'and posts it again' post_as tonewerk com.example.daemons
check 'with the state that it had' posted com.example.daemons 4
check 'and changes it' post_as tonewerk com.example.daemons 5
check 'it posts the names of members, too' post_as tonewerk com.example.players
check 'and keeps their state' posted com.example.players 2

before=$(free_in_run)
check 'a member who fills the directory meets its bound' \
  says 'No space left' as neighbour dd if=/dev/zero of=$shared/.fill bs=1M count=64
check 'the rest of /run is not touched' eval '[ $((before - $(free_in_run))) -lt 1024 ]'
check 'the daemon still writes there' runuser -u tonewerk -- sh -c 'echo 1 >/run/tonewerk/.there && rm /run/tonewerk/.there'
check 'and serves' as player twctl --system list
rm $shared/.fill
check 'a member who makes files without end meets a bound, too' \
  says 'No space left' as neighbour bash -c "for n in {1..3000}; do : >$shared/.x\$n || exit 1; done"
rm -f $shared/.x*

restart_daemon
check 'after a restart of the daemon the directories are mounted' eval 'mountpoint -q /run/tonewerk/channels && mountpoint -q $shared'
check 'and hold what they held' posted com.example.neighbours 3
systemctl restart twreportingd.socket
check 'after one of the socket, too' posted com.example.neighbours 3
check 'and the next client is served' as player twctl --system list
rm -f $shared/com.example.*
