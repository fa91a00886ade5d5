Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:41Z, after 41 s: it was stopped.
9 messages, 0 of them redundant; 0 overloads; 10 s active.

Messages, by the seconds since it began
  1  +1 s  Output Start: session_output_running=1 gather_session=1 session_selected_format=A
    mFormatID=lpcm mChannelsPerFrame=2 active_devices=Speaker
  2  +13 s  Setup Generic: session_selected_format=B
  3  +15 s  Output Stop: session_output_running=0 gather_session=1
  4  +20 s  Output Start: session_output_running=1 gather_session=0
  5  +25 s  Output Stop: session_output_running=0
  6  +30 s  Output Start: session_output_running=1 gather_session=1
  7  +32 s  Gather Generic: gather_session=0
  8  +34 s  Gather Setup: gather_session=0 note=again
  9  +40 s  Setup Stop: session_duration=10

Made by the daemon
  14  +41 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  +1 s  output began (message 1)
  +1 s to +13 s, 12 s  session_selected_format changed from A to B (message 2) -> no summary: no
    message before its end said the volume
  +13 s to +15 s, 2 s  output stopped (message 3) -> no summary: no message before its end said the
    volume
  +20 s  output began (message 4)
  +20 s to +25 s, 5 s  output stopped (message 5) -> no summary: no message before its end said the
    volume
  +30 s  output began (message 6)
  +30 s to +40 s, 10 s  the client said how long the session was (message 9) -> no summary: no
    message before its end said the volume
Gather summaries: 4. A stretch of output must be longer than 0.5 s.
  +40 s  output runs before the first message, as the latest values of the session say; this is
    their time
  +40 s to +1 s, -39 s  session_selected_format changed from B to A (message 1) -> no summary: -39 s
    is not longer than 0.5 s
  +1 s to +13 s, 12 s  session_selected_format changed from A to B (message 2) -> Gather Summary 1
    of 4, event 1; made of messages 1 and 2
  +13 s to +15 s, 2 s  output stopped (message 3) -> Gather Summary 2 of 4, event 2; made of
    messages 1 to 3
  +20 s  output began (message 4); that begins no stretch, because the message does not say
    gather_session=1
  until +25 s  output stopped (message 5) -> no summary: no message that counts says when it began
  +30 s  output began (message 6)
  +30 s to +34 s, 4 s  gather_session=0 came again (message 8) -> Gather Summary 3 of 4, event 3;
    made of messages 1, 2 and 6 to 8
  +34 s to +40 s, 6 s  the client said how long the session was (message 9) -> Gather Summary 4 of
    4, event 4; made of messages 1, 2, 8 and 9
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
