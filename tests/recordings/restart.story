Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:06Z, after 6 s: it was stopped.
2 messages, 0 of them redundant; 0 overloads; 4 s active.

Messages, by the seconds since it began
  1  +1 s  Output Start: session_output_running=1 QMSessionVolume=0.5 active_devices=Speaker
  2  +5 s  Setup Stop: session_duration=4

Made by the daemon
  4  +6 s  Session_Generic Summary, event 3: total_active_time=4 active_count=1 overload_count=0
    average_active_time=4 num_messages=3 num_unique_messages=5
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 1. A stretch of output must be longer than 0.5 s.
  +1 s  output began (message 1)
  +1 s to +5 s, 4 s  the client said how long the session was (message 2) -> Volume Summary 1 of 1,
    event 2; made of messages 1 and 2
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  +6 s  output runs before the first message, as the latest values of the session say; this is their
    time
  +6 s to +5 s, -1 s  the client said how long the session was (message 2) -> no summary: -1 s is
    not longer than 0.5 s
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 2: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:10Z and ended at 2026-01-01 00:00:16Z, after 6 s: it was stopped.
3 messages, 0 of them redundant; 0 overloads; 3 s active.

Messages, by the seconds since it began
  1  +1 s  Output Stop: session_output_running=0
  2  +2 s  Output Start: session_output_running=1
  3  +5 s  Output Stop: session_output_running=0 session_duration=3

Made by the daemon
  5  +6 s  Session_Generic Summary, event 6: total_active_time=7 active_count=2 overload_count=0
    average_active_time=3.5 num_messages=4 num_unique_messages=6
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 1. A stretch of output must be longer than 0.5 s.
  +2 s  output began (message 2)
  +2 s to +5 s, 3 s  output stopped (message 3) -> Volume Summary 1 of 1, event 5; made of messages
    2 and 3
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  +2 s  output began (message 2); that begins no stretch, because the message does not say
    gather_session=1
  until +5 s  output stopped (message 3) -> no summary: no message that counts says when it began
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 3: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:18Z and ended at 2026-01-01 00:00:19Z, after 1 s: it was stopped.
0 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  none

Made by the daemon
  1  +1 s  Session_Generic Summary, event 7: total_active_time=7 active_count=2 overload_count=0
    average_active_time=3.5 num_messages=0 num_unique_messages=2
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
