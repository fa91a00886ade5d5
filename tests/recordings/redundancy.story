Session 1: org.example.Player (process recording, user 1000) for longformaudio, reporter 7.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:14Z, after 14 s: it was stopped.
13 messages, 3 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +1 s  RouteChange Generic: route=Speaker
  2  +2 s  RouteChange Generic: redundant, it repeats message 1 in everything but its times
  3  +3 s  RouteChange Start: route=Speaker
  4  +4 s  RouteChange Generic: route=Headphones
  5  +5 s  RouteChange Generic: route=Speaker
  6  +6 s  Error Generic: code=1
  7  +7 s  Error Generic: code=1
  8  +8 s  RouteChange Error: code=1
  9  +9 s  RouteChange Error: code=1
  10  +10 s  DSP_Error Generic: code=1
  11  +11 s  DSP_Error Generic: redundant, it repeats message 10 in everything but its times
  12  +12 s  Generic Generic: number=1
  13  +13 s  Generic Generic: redundant, it repeats message 12 in everything but its times

Made by the daemon
  14  +14 s  Session_Generic Summary, event 11: total_active_time=0 active_count=0 overload_count=0
    average_active_time=0 num_messages=13 num_unique_messages=12 num_redundant_messages=1
    singleMessageSession=0 summaryServiceName=longformaudio thermal_state=Nominal
    low_power_enabled=0 vmInfo_phys_footprint_MiB=8 load_avg_1_min=0 load_avg_5_min=0
    load_avg_15_min=0

Volume summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Gather summaries: 0. A stretch of output must be longer than 0.5 s.
  none: no message said that output began (session_output_running)
Input summaries: 0. A stretch of input must be longer than 0.5 s.
  none: no message said that input began (session_input_running)

What was forwarded of it is not known: the store does not record sendings by session.
--------
