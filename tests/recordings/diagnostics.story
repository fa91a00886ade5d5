Session 1: an unknown application (process recording, user 1000) for haptics, reporter 3001.
It began at 2026-01-01 00:00:00.100Z and ended at 2026-01-01 00:01:18.500Z, after 1:18: it was
stopped.
2 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +0.5 s  Generic Energybook: Haptic_Active_Hardware_Time_Seconds=3600 Active_Clients=player
  2  +61.9 s  Generic Energybook: Haptic_Active_Hardware_Time_Seconds=3661 Active_Clients=player

Made by the daemon
  3  +78.4 s  Session_Generic Summary, event 10: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=2 num_unique_messages=4
    num_redundant_messages=18446744073709551614 singleMessageSession=0 summaryServiceName=haptics
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
Session 2: an unknown application (process recording, user 1000) for alarms, reporter 3002.
It began at 2026-01-01 00:00:00.100Z and ended at 2026-01-01 00:01:18.500Z, after 1:18: it was
stopped.
3 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +0.9 s  Error IssueDetector: issue_type=LowRMS node=speaker rms=-71.5
  2  +8.9 s  Error IssueDetector: issue_type=LowRMS node=speaker rms=-72
  3  +16.9 s  Error IssueDetector: issue_type=LowRMS node=speaker rms=-73.5

Made by the daemon
  4  +78.4 s  Session_Generic Summary, event 12: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=3 num_unique_messages=5
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
  +0.9 s  LowRMS at speaker (event 5)
  +8.9 s  LowRMS at speaker (event 6)
  +16.9 s  LowRMS at speaker (event 7)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 3: org.example.Ringwork (process recording, user 1000) for telephony, reporter 3003.
It began at 2026-01-01 00:00:00.100Z and ended at 2026-01-01 00:01:18.500Z, after 1:18: it was
stopped.
4 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  -9.9 s  Output Start: session_output_running=1
  2  +0.2 s  Error Generic: vdac_invalid_x=1 vdac_invalid_y=0
  3  +0.3 s  IO Error: smallest_buffer_frame_size=1024 io_cycle=3 cause=the mixer missed its
    deadline
  4  +17.9 s  Performance MemoryLog: reason=footprint above its limit

Made by the daemon
  5  +78.4 s  Session_Generic Summary, event 14: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=4 num_unique_messages=6
    num_redundant_messages=18446744073709551614 singleMessageSession=0 summaryServiceName=telephony
    thermal_state=Nominal low_power_enabled=0 vmInfo_phys_footprint_MiB=8 load_avg_1_min=0
    load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  -9.9 s  output began (message 1)
  -9.9 s  a stretch of output began that nothing ended -> no summary: it has no length
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  +17.9 s  output runs before the first message, as the latest values of the session say; this is
    their time
  +17.9 s  a stretch of output began that nothing ended -> no summary: it has no length
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
