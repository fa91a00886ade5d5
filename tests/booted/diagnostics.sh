# Tests the diagnostics that were caused by the recording which `internal` started.

check 'the recording was played to its end' eval 'wait $diagnostics || { cat /tmp/diagnostics.log; false; }'
how_many() { twctl --system --json "$1" | grep -c .; }
has() { [ "$(how_many "$1")" -ge "$2" ]; }
check 'leaking haptics and a silent alarm were captured' await has captures 2
check 'a draft was made' await has drafts 1
check 'an overload left a stall trace' await has whirlcaps 1
check 'of which the daemon has told' equal "$(stat --format %U /run/tonewerk/notifications/com.orvane.tonewerk.dropped-whirlcap)" tonewerk
check 'nothing of it was forbidden' eval '! grep -rE "ermission|EACCES|not permitted" /var/lib/tonewerk/{captures,issue-drafts,whirlcaps}/*/request.json'
folders_are_complete() {
  local folder file
  for folder in /var/lib/tonewerk/{captures,issue-drafts,whirlcaps}/*/; do
    for file in processes.txt load.txt log.txt; do [ -s "$folder/$file" ] || { echo "$folder lacks $file"; return 1; }; done
  done
}
check 'each holds processes, load and the log' folders_are_complete
check 'the memory log was taken' says 'WIRED LOG BLOCK' journalctl --boot --unit $unit --output cat
check 'by its tool' says 'phys_footprint' journalctl --boot --unit $unit --output cat
check 'beside what root wrote the daemon keeps its own' \
  says VidroInvalidXyIDRlastRun cat /var/lib/tonewerk/preferences/com.orvane.tonewerk.twreporting.toml
check "and the day's captures" says accepted cat /var/lib/tonewerk/preferences/com.orvane.tonewerk.captures.toml
twctl --system defaults delete com.orvane.tonewerk.service trusted_users
