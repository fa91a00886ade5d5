Session 1: org.example.Player (process unknown, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01T00:00:00Z and ended at 2026-01-01T00:00:05Z, after 5 s: it was stopped.
3 messages, 0 of them redundant; 3 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1.99 s  IO Error: issue_type=overload smallest_buffer_frame_size=256 io_cycle=47 xrun_count=1
    glitch_id=1767225601990-47 glitch_first_cause=late glitch_confidence=0.9
    glitch_culprit_application=org.example.Studio glitch_culprit_process=studio
    glitch_culprit_pid=4711 glitch_culprit_node=studio glitch_device=speaker glitch_over_ms=3.0672
    glitch_period_ms=5.3333 glitch_quantum=256 glitch_rate=48000 glitch_lost_ms=5.3333
    glitch_reason=studio took 8.4 ms of 5.3 ms.
    glitch_cycles=[{"begin":-5333.3,"period":5333.3,"nodes":[{"name":"studio","process":"studio","signal":10,"awake":15,"finish":2100},{"name":"player","process":"mpv","signal":12.1,"awake":15.3,"finish":820.4}]},{"begin":0,"period":5333.3,"nodes":[{"name":"studio","process":"studio","signal":10,"awake":15,"finish":8400.5},{"name":"player","process":"mpv","signal":8401}]}]
    glitch_cause=waiting for another glitch_node=player glitch_chain=studio > player > speaker
  2  +3 s  IO Error: issue_type=overload xrun_count=4 smallest_buffer_frame_size=256
    glitch_id=1767225603000-90 glitch_cause=unknown glitch_first_cause=unknown glitch_confidence=0.1
    glitch_cycles=[{ glitch_over_ms=long
  3  +4 s  IO Error: issue_type=overload xrun_count=1

Made by the daemon
  4  +5 s  Session_Generic Summary: total_active_time=0 active_count=0 overload_count=3
    average_active_time=0 num_messages=3 num_unique_messages=5
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began or ended (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began or ended (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began or ended (session_input_running)

Issues
  +2 s  overload, buffer of 256 frames (event 1)
  +3 s  overload, buffer of 256 frames (event 3)
  +4 s  overload (event 4)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 2: org.example.Studio (process unknown, user 1000) for longformaudio, reporter 8.
It began at 2026-01-01T00:00:00Z and ended at 2026-01-01T00:00:05Z, after 5 s: it was stopped.
1 message, 0 of them redundant; 1 overload; 0 s active.

Messages, by the seconds since it began
  1  +1.99 s  IO Error: issue_type=overload smallest_buffer_frame_size=256 io_cycle=47 xrun_count=1
    glitch_id=1767225601990-47 glitch_first_cause=late glitch_confidence=0.9
    glitch_culprit_application=org.example.Studio glitch_culprit_process=studio
    glitch_culprit_pid=4711 glitch_culprit_node=studio glitch_device=speaker glitch_over_ms=3.0672
    glitch_period_ms=5.3333 glitch_quantum=256 glitch_rate=48000 glitch_lost_ms=5.3333
    glitch_reason=studio took 8.4 ms of 5.3 ms.
    glitch_cycles=[{"begin":-5333.3,"period":5333.3,"nodes":[{"name":"studio","process":"studio","signal":10,"awake":15,"finish":2100},{"name":"player","process":"mpv","signal":12.1,"awake":15.3,"finish":820.4}]},{"begin":0,"period":5333.3,"nodes":[{"name":"studio","process":"studio","signal":10,"awake":15,"finish":8400.5},{"name":"player","process":"mpv","signal":8401}]}]
    glitch_cause=late glitch_node=studio

Made by the daemon
  2  +5 s  Session_Generic Summary: total_active_time=0 active_count=0 overload_count=1
    average_active_time=0 num_messages=1 num_unique_messages=3
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began or ended (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began or ended (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began or ended (session_input_running)

Issues
  +2 s  overload, buffer of 256 frames (event 2)

What was forwarded of it is not known: the store does not record sendings by session.
--------
