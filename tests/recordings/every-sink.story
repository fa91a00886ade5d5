Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 2001.
It began at 2026-01-01 00:00:00.100Z and ended at 2026-01-01 00:00:01.100Z, after 1 s: it was
stopped.
9 messages, 0 of them redundant; 1 overload; 30 s active.

Messages, by the seconds since it began
  1  -29.9 s  Output Start: session_output_running=1 gather_session=1 QMSessionVolume=0.5
    active_devices=Speaker session_selected_format=48000 Hz, 2 ch, Float32 mFormatID=lpcm
    mChannelsPerFrame=2
  2  -19.8 s  Volume Generic: QMSessionVolume=0.8
  3  -17.7 s  Input Start: session_input_running=1 vp_config_primary_vocoder=narrow
    vp_config_primary_vocoderFs=8000.000000
  4  -14.6 s  Input Generic: vp_config_primary_vocoder=wide vp_config_primary_vocoderFs=16000.000000
  5  -11.5 s  IO IssueDetector: issue_type=overload node=mixer rtaid_client=player
    any_channel_silence_seconds=2
  6  -10.4 s  Generic Energybook: EngineOnTime=1.5 EngineState=EngineOn
    Haptic_Active_Hardware_Time_Seconds=3600 Active_Clients=player
  7  -7.3 s  Input Stop: session_input_running=0
  8  -4.2 s  Output Stop: session_output_running=0
  9  +0.9 s  Setup Stop: session_duration=30

Made by the daemon
  13  +1 s  Session_Generic Summary, event 13: total_active_time=30 active_count=1 overload_count=1
    average_active_time=30 num_messages=12 num_unique_messages=14
    num_redundant_messages=18446744073709551614 singleMessageSession=0
    summaryServiceName=longformaudio thermal_state=Nominal low_power_enabled=0
    vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0 load_avg_15_min=0

Volume summaries: 2. A stretch of output must be longer than 0.5 s.
  -29.9 s  output began (message 1)
  -29.9 s to -19.8 s, 10.1 s  QMSessionVolume changed from 0.5 to 0.8 (message 2) -> Volume Summary
    1 of 2, event 10; made of messages 1 and 2
  -19.8 s to -4.2 s, 15.6 s  output stopped (message 8) -> Volume Summary 2 of 2, event 11; made of
    messages 1, 2 and 8
Gather summaries: 1. A stretch of output must be longer than 0.5 s.
  -29.9 s  output began (message 1)
  -29.9 s to -4.2 s, 25.7 s  output stopped (message 8) -> Gather Summary 1 of 1, event 12; made of
    messages 1 and 8
Input summaries: 1. A stretch of input must be longer than 0.5 s.
  -17.7 s  input began (message 3)
  -17.7 s to -7.3 s, 10.4 s  input stopped (message 7) -> Input Summary 1 of 1, event 14; made of
    messages 1, 3, 4 and 7

Issues
  +0.5 s  overload at mixer, 2 s of silence (event 5)

What was forwarded of it is not known: the store does not record sendings by session.
--------
