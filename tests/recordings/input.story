Session 1: org.example.Phone (process recording, user 1000) for telephony, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:21Z, after 21 s: it was stopped.
10 messages, 0 of them redundant; 0 overloads; 19.5 s active.

Messages, by the seconds since it began
  1  +1 s  Input Start: session_input_running=1 active_devices=Mic vp_config_operation_mode=vc
    vp_config_input_port=Mic
  2  +2 s  Input Generic: vp_config_primary_vocoder=B vp_config_primary_vocoderFs=8000.000000
  3  +3 s  Input Generic: vp_config_primary_vocoder=Opus vp_config_primary_vocoderFs=0.000000
  4  +4 s  Input Generic: vp_config_primary_vocoder=A vp_config_primary_vocoderFs=16000.000000
  5  +5 s  Input Generic: vp_config_primary_vocoder=C
  6  +11 s  RouteChange Generic: active_devices=Headset
  7  +11.5 s  RouteChange Generic: active_devices=Mic
  8  +12.5 s  Input Stop: session_input_running=0
  9  +20 s  Input Start: session_input_running=1
  10  +20.5 s  Setup Stop: session_duration=19.5 session_input_running=0

Made by the daemon
  11  +21 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 2. A stretch of input must be longer than 0.5 s.
  +1 s  input began (message 1)
  +1 s to +11 s, 10 s  active_devices changed from Mic to Headset (message 6) -> Input Summary 1 of
    2, event 1; made of messages 1 to 6
  +11 s to +11.5 s, 0.5 s  active_devices changed from Headset to Mic (message 7) -> no summary: 0.5
    s is not longer than 0.5 s
  +11.5 s to +12.5 s, 1 s  input stopped (message 8) -> Input Summary 2 of 2, event 2; made of
    messages 1, 5, 7 and 8
  +20 s  input began (message 9)
  +20 s to +20.5 s, 0.5 s  input stopped (message 10) -> no summary: 0.5 s is not longer than 0.5 s

What was forwarded of it is not known: the store does not record sendings by session.
--------
