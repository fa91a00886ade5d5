Session 1: org.example.Player (process player, user 1001) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:01Z and ended at 2026-01-01 00:00:07Z, after 6 s: its client had gone.
3 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  RouteChange Generic: of=player
  2  +2 s  RouteChange Start: of=remote, the same user
  3  +3 s  RouteChange Stop: of=all sessions of its user

Made by the daemon
  4  +6 s  Session_Generic Summary, event 6: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=3 num_unique_messages=5
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
Session 2: org.example.Phone (process phone, user 1002) for telephony, reporter 7.
It began at 2026-01-01 00:00:01Z and ended at 2026-01-01 00:00:08Z, after 7 s: it was stopped.
1 message, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  RouteChange Generic: of=phone

Made by the daemon
  2  +7 s  Session_Generic Summary, event 7: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=1 num_unique_messages=3
    num_redundant_messages=18446744073709551614 singleMessageSession=0 summaryServiceName=telephony
    thermal_state=Nominal low_power_enabled=0 vmInfo_phys_footprint_MiB=8 load_avg_1_min=0
    load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
