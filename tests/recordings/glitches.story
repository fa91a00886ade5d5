Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:05Z, after 5 s: it was stopped.
3 messages, 0 of them redundant; 3 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1.99 s  IO Error: issue_type=overload smallest_buffer_frame_size=256 io_cycle=47 xrun_count=1
  2  +3 s  IO Error: issue_type=overload xrun_count=4 smallest_buffer_frame_size=256
  3  +4 s  IO Error: issue_type=overload xrun_count=1

Made by the daemon
  4  +5 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

Issues
  +2 s  overload, buffer of 256 frames; it waited for another, which was first in the chain: late,
    culprit org.example.Studio (studio, 4711), at least 3.07 ms beyond the deadline, 5.33 ms lost
    (event 1; `twctl glitches --why 1` tells more)
  +3 s  overload, buffer of 256 frames; whose it was could not be told (event 3; `twctl glitches
    --why 3` tells more)
  +4 s  overload (event 4)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 2: org.example.Studio (process recording, user 1000) for longformaudio, reporter 8.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:05Z, after 5 s: it was stopped.
1 message, 0 of them redundant; 1 overload; 0 s active.

Messages, by the seconds since it began
  1  +1.99 s  IO Error: issue_type=overload smallest_buffer_frame_size=256 io_cycle=47 xrun_count=1

Made by the daemon
  2  +5 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

Issues
  +2 s  overload, buffer of 256 frames; cause: late, culprit org.example.Studio (studio, 4711), at
    least 3.07 ms beyond the deadline, 5.33 ms lost (event 2; `twctl glitches --why 2` tells more)

What was forwarded of it is not known: the store does not record sendings by session.
--------
