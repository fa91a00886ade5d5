Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:09Z, after 9 s: it was stopped.
8 messages, 0 of them redundant; 3 overloads; 8 s active.

Messages, by the seconds since it began
  1  +1 s  IO IssueDetector: issue_type=overload node=mixer rtaid_client=player
    any_channel_silence_seconds=2
  2  +2 s  IO IssueDetector: issue_type=overload node=mixer rtaid_client=player
    any_channel_silence_seconds=4294967297
  3  +3 s  Performance IssueDetector
  4  +4 s  HAL_Performance IssueDetector: issue_type=5 node=hal
  5  +5 s  IO Error: smallest_buffer_frame_size=1024 io_cycle=3
  6  +6 s  IO Generic: issue_type=overload
  7  +7 s  IO IssueDetector: issue_type=overload session_duration=3
  8  +8 s  Setup Stop: session_duration=5

Made by the daemon
  9  +9 s  Session_Generic Summary, event 1: total_active_time=8 active_count=2 overload_count=3
    average_active_time=4 num_messages=8 num_unique_messages=10
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
