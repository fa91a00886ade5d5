Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:10Z, after 10 s: it was stopped.
3 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  Output Start: session_output_running=1 orientation=portrait
  2  +4 s  Generic Generic: orientation=landscape
  3  +9 s  Output Stop: session_output_running=0

Made by the daemon
  4  +10 s  Session_Generic Summary, event 4: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=3 num_unique_messages=5
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  +1 s  output began (message 1)
  +1 s to +9 s, 8 s  output stopped (message 3) -> no summary: no message before its end said the
    volume
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  +1 s  output began (message 1); that begins no stretch, because the message does not say
    gather_session=1
  until +9 s  output stopped (message 3) -> no summary: no message that counts says when it began
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
