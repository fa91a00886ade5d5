Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:05Z, after 5 s: it was stopped.
0 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  none

Made by the daemon
  1  +5 s  Session_Generic Summary, which the store does not have
  2  +5 s  Chanmetering Simple, event 1: AmpDrv_Speaker_Simple_RailVolts=30
  3  +5 s  Chanmetering Histogram, event 2:
    AmpDrv_Tx_Queue_Histogram_Delay=count=2,lower=0,upper=20,min=1,max=90,unit=us::0-10:4
  4  +5 s  Chanmetering State, event 3:
    AmpDrv_pdm_State_Mic=name:on,transition:3,residency:300,duty_cycle:1.000000;

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
Session 2: org.example.Player (process recording, user 1000) for longformaudio, reporter 8.
It began at 2026-01-01 00:00:06Z and ended at 2026-01-01 00:00:07Z, after 1 s: it was stopped.
0 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  none

Made by the daemon
  1  +1 s  Session_Generic Summary, which the store does not have
  2  +1 s  Chanmetering State, event 4: AmpDrv_pdm_State_Mic=

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
