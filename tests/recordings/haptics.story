Session 1: org.example.Game (process recording, user 1000) for haptics, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:09Z, after 9 s: it was stopped.
6 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  Generic Energybook: EngineOnTime=1.5 EngineState=EngineOn
    Haptic_Active_Hardware_Time_Seconds=3600 Active_Clients=game
  2  +2 s  Generic Energybook: EngineState=EngineOff
  3  +3 s  Generic Energybook: EngineState=1
  4  +4 s  Generic Energybook: Haptic_Active_Hardware_Time_Seconds=10
  5  +5 s  Generic Energybook: other=1
  6  +6 s  Generic Generic: EngineOnTime=9

Made by the daemon
  7  +9 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 2: an unknown application (process recording, user 1000) for haptics, reporter 8.
It began at 2026-01-01 00:00:07Z and ended at 2026-01-01 00:00:09Z, after 2 s: it was stopped.
1 message, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  Generic Energybook: EngineOnTime=2.5 EngineState=EngineOn

Made by the daemon
  2  +2 s  Session_Generic Summary, which the store does not have

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
