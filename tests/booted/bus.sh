# Tests the system's message bus: which users may call, which may own the name, and that a call starts the daemon.

bus_name=com.orvane.tonewerk.reporting
ask() { busctl --system --timeout=30 call $bus_name /com/orvane/tonewerk/reporting com.orvane.tonewerk.TWReportingServiceProtocol "$@"; }
ask_as() { as "$1" bash -c "$(declare -f ask); bus_name=$bus_name; ask ${*:2}"; }
# take_name_as USER: requests the daemon's name from the bus. An answer of 1 means that the user now owns the name, 2 that it
# waits for the name.
take_name_as() {
  as "$1" busctl --system call org.freedesktop.DBus /org/freedesktop/DBus org.freedesktop.DBus RequestName su $bus_name 0
}
owner() { busctl --system call org.freedesktop.DBus /org/freedesktop/DBus org.freedesktop.DBus GetConnectionUnixUser s $bus_name; }

stop_daemon
check 'somebody outside the group may not call' says 'rejected|Access ?[Dd]enied|not permitted' ask_as outsider GetAllReporters
check 'and may not have the name' says 'Access denied' take_name_as outsider
check 'a member of the group may not have the name either' says 'Access denied' take_name_as player
stop_daemon
check 'a call of a member starts the daemon' says '^ax ' ask_as player GetAllReporters
check 'as its unit' is_in_state active
check 'the name is the user tonewerk' equal "$(owner)" "u $(id -u tonewerk)"
check 'a session is made' says '^b true' ask_as player CreateReportingSession x 77
check 'and lives as long as its connection' await says '^ax 0$' ask_as player GetAllReporters
check 'a message is taken' ask_as player SendMessage "'a{sv}uqax'" 2 volume d 0.5 app s bus 4 1 0
check 'and stored' await stored_with '"app":"bus"'
check 'what is wrong is refused with its reason' says 'argument 1' ask_as player CreateReportingSession s hello
check 'somebody outside the group may not call a running daemon' says 'rejected|[Dd]enied|not permitted' ask_as outsider GetAllReporters
check 'the socket is still served' as player twctl --system list
check 'the daemon has logged no error so far' eval '! journalctl --boot --unit $unit --priority 3 --output cat _COMM=twreportingd | grep .'
