Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 1001.
It began at 2026-01-01 00:00:00.100Z and ended at 2026-01-01 00:00:06.200Z, after 6 s: it was
stopped.
8 messages, 0 of them redundant; 1 overload; 6 s active.

Messages, by the seconds since it began
  1  +0.1 s  Session_Setup Generic: session_selected_format=48000 Hz, 2 ch, Float32 mFormatID=lpcm
    mChannelsPerFrame=2
  2  +0.2 s  Session_RouteChange Generic: active_devices=Speaker QMSessionVolume=0.5
  3  +0.4 s  Session_Playback Start: session_output_running=1
  4  +2.4 s  Session_Volume Generic: QMSessionVolume=0.8
  5  +2.9 s  HAL_Performance IssueDetector: issue_type=overload cause=deadline missed late_us=2300
  6  +4.4 s  Session_RouteChange Generic: active_devices=Headphones
  7  +5.9 s  Session_Playback Stop: session_output_running=0
  8  +6 s  Session_Setup Stop: session_duration=6

Made by the daemon
  12  +6.1 s  Session_Generic Summary, event 12: total_active_time=6 active_count=1 overload_count=1
    average_active_time=6 num_messages=11 num_unique_messages=13
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 3. A stretch of output must be longer than 0.5 s.
  +0.4 s  output began (message 3)
  +0.4 s to +2.4 s, 2 s  QMSessionVolume changed from 0.5 to 0.8 (message 4) -> Volume Summary 1 of
    3, event 9; made of messages 1 to 4
  +2.4 s to +4.4 s, 2 s  active_devices changed from Speaker to Headphones (message 6) -> Volume
    Summary 2 of 3, event 10; made of messages 1, 2, 4 and 6
  +4.4 s to +5.9 s, 1.5 s  output stopped (message 7) -> Volume Summary 3 of 3, event 11; made of
    messages 1, 4, 6 and 7
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  +0.4 s  output began (message 3); that begins no stretch, because the message does not say
    gather_session=1
  until +4.4 s  active_devices changed from Speaker to Headphones (message 6) -> no summary: no
    message that counts says when it began
  +4.4 s to +5.9 s, 1.5 s  output stopped (message 7) -> no summary: no message before its end said
    whether it was in a Gather session
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

Issues
  +2.9 s  overload (event 5)

What was forwarded of it is not known: the store does not record sendings by session.
--------
