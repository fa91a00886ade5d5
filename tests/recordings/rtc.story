Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:04Z, after 4 s: it was stopped.
3 messages, 1 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  HAL_Playback Generic: a=1
  2  +2 s  HAL_Playback Generic: a=2
  3  +3 s  HAL_Playback Generic: redundant, it repeats message 2 in everything but its times

Made by the daemon
  4  +4 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 2: org.example.Library (process recording, user 1000) for apiusage, reporter 8.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:04Z, after 4 s: it was stopped.
2 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  HAL_Playback Generic: a=1
  2  +2 s  HAL_Playback Generic: a=2

Made by the daemon
  3  +4 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 3: org.example.Player (process recording, user 1000) for test, reporter 9.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:04Z, after 4 s: it was stopped.
2 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  HAL_Playback Generic: a=1
  2  +2 s  HAL_Playback Generic: a=2

Made by the daemon
  3  +4 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 4: org.example.Player (process recording, user 1000) for longformaudio, reporter 10.
It began at 2026-01-01 00:00:05Z and ended at 2026-01-01 00:00:06Z, after 1 s: it was stopped.
0 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  none

Made by the daemon
  1  +1 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
