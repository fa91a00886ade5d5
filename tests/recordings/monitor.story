Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:08Z, after 8 s: it was stopped.
6 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  3  +1 s  Output Start: session_output_running=1 QMSessionVolume=0.5
  6  +7 s  Output Stop: session_output_running=0

Made by the daemon
  1  +0 s  Setup Setup, event 1: spatial-audio-accessory-feature=1 last_updated=1767225600
  2  +0 s  Setup Setup, event 2: device_name=Kitchen last_updated=1767225600
  4  +3 s  Setup Setup, event 4: ringerstate=0 last_updated=1767225603
  5  +5 s  Setup Setup, event 5: spatial-audio-accessory-feature=0 last_updated=1767225605
  8  +8 s  Session_Generic Summary, event 8: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=7 num_unique_messages=9
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 1. A stretch of output must be longer than 0.5 s.
  +1 s  output began (message 3)
  +1 s to +7 s, 6 s  output stopped (message 6) -> Volume Summary 1 of 1, event 7; made of messages
    3 to 6
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  +1 s  output began (message 3); that begins no stretch, because the message does not say
    gather_session=1
  until +7 s  output stopped (message 6) -> no summary: no message that counts says when it began
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
