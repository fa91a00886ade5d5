# Tests in the kernel that the restrictions of the unit are in force.

status_of_daemon() { awk -v key="$1:" '$1 == key { print $2 }' "/proc/$(daemon)/status"; }
# in_its_place COMMAND...: runs the command in the daemon's mount namespace, with the rights of root.
in_its_place() { nsenter --target "$(daemon)" --mount -- "$@"; }

check 'the daemon has no capabilities' equal "$(status_of_daemon CapEff)" 0000000000000000
check 'and can gain none' equal "$(status_of_daemon CapBnd) $(status_of_daemon NoNewPrivs)" '0000000000000000 1'
check 'its system calls are filtered' equal "$(status_of_daemon Seccomp)" 2
check 'its profile is in force' equal "$(cat "/proc/$(daemon)/attr/current")" 'twreportingd (enforce)'
check 'what it writes is not for everybody' equal "$(status_of_daemon Umask)" 0027
check 'it cannot write to the system' says 'Read-only file system' in_its_place touch /usr/lib/tonewerk-was-here
check 'nor, as its user, to its configuration' says 'Permission denied' in_its_place runuser -u tonewerk -- touch /etc/tonewerk/tonewerk-was-here
check 'it can write its state' in_its_place test -w /var/lib/tonewerk -a -w /var/log/tonewerk -a -w /run/tonewerk
check 'it sees no homes' equal "$(in_its_place ls -A /home /root /run/user | paste -sd' ')" '/home:  /root:  /run/user:'
check 'its memory and its threads are bounded' equal "$(state MemoryMax) $(state TasksMax)" '1073741824 256'
check 'it sees no devices but the harmless ones' equal "$(in_its_place sh -c 'find /dev -type b; ls -d /dev/null')" /dev/null
check "its temporary files are not others'" equal "$(touch /tmp/of-somebody && in_its_place sh -c 'ls -d /tmp /tmp/*' 2>/dev/null)" /tmp
check "it cannot change the kernel's variables" says 'Read-only file system' in_its_place sh -c 'echo 1 >/proc/sys/kernel/panic'
check 'it sees other processes' in_its_place test -r /proc/1/status
