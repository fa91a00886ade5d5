Session 1: org.example.Ringwork (process recording, user 1000) for telephony, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:34Z, after 34 s: it was stopped.
5 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  IO Error: smallest_buffer_frame_size=1024 io_cycle=3
  2  +2 s  Error Generic: vdac_invalid_x=1
  3  +14 s  Error Generic: vdac_invalid_x=1 vdac_invalid_y=1
  4  +32 s  Performance MemoryLog: reason=footprint
  5  +33 s  RouteChange Generic: route=Speaker sendSingleMessage=1

Made by the daemon
  6  +34 s  Session_Generic Summary, event 10: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=5 num_unique_messages=7
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
Session 2: org.example.Player (process recording, user 1000) for alarms, reporter 8.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:34Z, after 34 s: it was stopped.
4 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +15 s  Error IssueDetector: issue_type=LowRMS rms=-85
  2  +23 s  Error IssueDetector: issue_type=LowRMS rms=-93
  3  +31 s  Error IssueDetector: issue_type=LowRMS rms=-101
  4  +33 s  RouteChange Generic: route=Speaker sendSingleMessage=1

Made by the daemon
  5  +34 s  Session_Generic Summary, event 12: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=4 num_unique_messages=6
    num_redundant_messages=18446744073709551614 singleMessageSession=0 summaryServiceName=alarms
    thermal_state=Nominal low_power_enabled=0 vmInfo_phys_footprint_MiB=8 load_avg_1_min=0
    load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

Issues
  +15 s  LowRMS (event 4)
  +23 s  LowRMS (event 5)
  +31 s  LowRMS (event 6)

What was forwarded of it is not known: the store does not record sendings by session.
--------
