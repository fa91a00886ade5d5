# Tests that the lines of the daemon are in the journal with their fields.

# Counts the daemon's entries by kind: PRIORITY LEVEL IDENTIFIER CATEGORY SUBSYSTEM.
entries() {
  journalctl --boot --output json --unit $unit _COMM=twreportingd | python3 -c '
import json, sys
for line in sys.stdin:
    entry = json.loads(line)
    print(*(entry.get(key, "-") for key in ("PRIORITY", "TONEWERK_LEVEL", "SYSLOG_IDENTIFIER", "TONEWERK_CATEGORY", "TONEWERK_SUBSYSTEM")))' |
    sort | uniq -c
}
journalctl --sync
entries >/tmp/entries
check 'every line says level, program, category and subsystem' eval 'cat /tmp/entries && [ -s /tmp/entries ] &&
  ! grep -vE "^ +[0-9]+ (3 error|5 default|6 info|7 debug) twreportingd tw[a-z]+ com\.orvane\.[a-z.]+$" /tmp/entries'
check 'a category can be asked for' eval '[ -n "$(journalctl --boot --quiet --output cat TONEWERK_CATEGORY=$(awk "{ print \$5; exit }" /tmp/entries))" ]'
