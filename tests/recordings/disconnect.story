Session 1: org.example.Player (process player, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:06Z, after 6 s: its client had gone.
2 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  Output Start: session_output_running=1 QMSessionVolume=1
  2  +4 s  Output Stop: session_output_running=0

Made by the daemon
  4  +6 s  Session_Generic Summary, event 3: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=3 num_unique_messages=5
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 1. A stretch of output must be longer than 0.5 s.
  +1 s  output began (message 1)
  +1 s to +4 s, 3 s  output stopped (message 2) -> Volume Summary 1 of 1, event 2; made of messages
    1 and 2
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  +1 s  output began (message 1); that begins no stretch, because the message does not say
    gather_session=1
  until +4 s  output stopped (message 2) -> no summary: no message that counts says when it began
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 2: org.example.Phone (process player, user 1000) for telephony, reporter 8.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:05Z, after 5 s: a new session of the
same client replaced it.
1 message, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  Output Start: session_output_running=1 QMSessionVolume=1

No producer looked for stretches.

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 3: an unknown application (process player, user 1000) for an unknown service, reporter 9.
It began at 2026-01-01 00:00:01Z and ended at 2026-01-01 00:00:06Z, after 5 s: its client had gone.
1 message, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +0 s  Output Start: session_output_running=1 QMSessionVolume=1

No producer looked for stretches.

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 4: org.example.Player (process player, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:08Z and ended at 2026-01-01 00:00:09Z, after 1 s: a new session of the
same client replaced it.
0 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  none

No producer looked for stretches.

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 5: an unknown application (process player, user 1000) for an unknown service, reporter 7.
It began at 2026-01-01 00:00:10Z and ended at 2026-01-01 00:00:12Z, after 2 s: it was stopped.
1 message, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +0 s  RouteChange Generic: route=Speaker

Made by the daemon
  2  +2 s  Session_Generic Summary, event 4: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=1 num_unique_messages=3
    num_redundant_messages=18446744073709551614 singleMessageSession=0 summaryServiceName=unknown
    clientProcessName=player thermal_state=Nominal low_power_enabled=0 vmInfo_phys_footprint_MiB=8
    load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
