Session 1: an unknown application (process unknown, user 1000) for standalone, reporter 1.
It began at 2026-01-01 00:00:01Z and ended at 2026-01-01 00:00:08.500Z, after 7 s: it was stopped.
2 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +0 s  RouteChange Generic: route=Speaker
  2  +2 s  HAL_Error Error: code=-19

No producer looked for stretches.

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 2: org.example.Player (process tool, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:04Z and ended at 2026-01-01 00:00:13Z, after 9 s: it was stopped.
1 message, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  RouteChange Generic: route=Headphones

Made by the daemon
  2  +9 s  Session_Generic Summary, event 5: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=1 num_unique_messages=3
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
Session 3: an unknown application (process unknown, user 1000) for standalone, reporter 1.
It began at 2026-01-01 00:00:14Z and ended at 2026-01-01 00:00:14Z, after 0 s: it was stopped.
1 message, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +0 s  RouteChange Generic: route=Lineout

No producer looked for stretches.

What was forwarded of it is not known: the store does not record sendings by session.
--------
