Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:01:23Z, after 1:23: it was stopped.
13 messages, 0 of them redundant; 0 overloads; 60 s active.

Messages, by the seconds since it began
  1  +1 s  Setup Generic: session_selected_format=48000 Hz, 2 ch, Float32 mFormatID=lpcm
    mChannelsPerFrame=2 active_devices=Speaker ringerstate=0 spatializationEnabled=0
    spatial-audio-accessory-feature=0
  2  +2 s  Output Start: session_output_running=1 QMSessionVolume=0.5
  3  +5 s  Volume Generic: QMSessionVolume=0.3
  4  +6 s  Setup Setup: mFormatID=aac mChannelsPerFrame=6
  5  +8 s  Volume Generic: QMSessionVolume=0.25
  6  +8.5 s  Volume Generic: QMSessionVolume=0.75
  7  +20.5 s  RouteChange Generic: active_devices=Headphones
  8  +22.5 s  Generic Generic: ringerstate=1
  9  +24.5 s  Generic Generic: spatial-audio-accessory-feature=1
  10  +26.5 s  Generic Setup: spatializationEnabled=1
  11  +36.5 s  Output Stop: session_output_running=0
  12  +40 s  Output Start: session_output_running=1
  13  +82 s  Setup Stop: session_duration=60

Made by the daemon
  21  +83 s  Session_Generic Summary, which the store does not have

Volume summaries: 7. A stretch of output must be longer than 0.5 s.
  message 10 was merged into message 9: 2 s after it is less than 5 s
  +2 s  output began (message 2)
  +2 s to +5 s, 3 s  QMSessionVolume changed from 0.5 to 0.3 (message 3) -> Volume Summary 1 of 7,
    event 4; made of messages 1 to 3
  +5 s to +8 s, 3 s  QMSessionVolume changed from 0.3 to 0.25 (message 5) -> Volume Summary 2 of 7,
    event 5; made of messages 1 and 3 to 5
  +8 s to +8.5 s, 0.5 s  QMSessionVolume changed from 0.25 to 0.75 (message 6) -> no summary: 0.5 s
    is not longer than 0.5 s
  +8.5 s to +20.5 s, 12 s  active_devices changed from Speaker to Headphones (message 7) -> Volume
    Summary 3 of 7, event 6; made of messages 1, 4, 6 and 7
  +20.5 s to +22.5 s, 2 s  ringerstate changed from 0 to 1 (message 8) -> Volume Summary 4 of 7,
    event 7; made of messages 1, 4 and 6 to 8
  +22.5 s to +26.5 s, 4 s  spatializationEnabled changed from 0 to 1 (message 9) -> Volume Summary 5
    of 7, event 8; made of messages 1, 4 and 6 to 9
  +26.5 s to +36.5 s, 10 s  output stopped (message 11) -> Volume Summary 6 of 7, event 9; made of
    messages 1, 4, 6 to 9 and 11
  +40 s  output began (message 12)
  +40 s to +82 s, 42 s  the client said how long the session was (message 13) -> Volume Summary 7 of
    7, event 10; made of messages 1, 4, 6 to 9, 12 and 13
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  +83 s  output runs before the first message, as the latest values of the session say; this is
    their time
  +83 s to +1 s, -82 s  active_devices changed from Headphones to Speaker (message 1) -> no summary:
    -82 s is not longer than 0.5 s
  +1 s to +20.5 s, 19.5 s  active_devices changed from Speaker to Headphones (message 7) -> no
    summary: no message before its end said whether it was in a Gather session
  +20.5 s to +36.5 s, 16 s  output stopped (message 11) -> no summary: no message before its end
    said whether it was in a Gather session
  +40 s  output began (message 12); that begins no stretch, because the message does not say
    gather_session=1
  until +82 s  the client said how long the session was (message 13) -> no summary: no message that
    counts says when it began
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  message 10 was merged into message 9: 0 s after it is less than 2 s
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
