Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2025-11-20 10:18:00Z and ended at 2025-11-20 10:18:08Z, after 8 s: it was stopped.
7 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  RouteChange Generic: no_time=1
  2  +2 s  RouteChange Start: too_old=1
  3  +3603 s  RouteChange Stop: ahead=1
  4  +4 s  Setup Generic
  5  +5 s  Setup Start
  6  +6 s  _Playback Generic: unknown=numbers
  7  +7 s  Undefined Unknown: text="\
€ list=[1,{"a":false}] big=18446744073709551615

Made by the daemon
  8  +8 s  Session_Generic Summary, event 8: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=7 num_unique_messages=9
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
