Session 1: an unknown application (process unknown, user 1000) for standalone, reporter 1.
It began at 2026-01-01 00:00:00Z and ended at 2026-01-01 00:00:01Z, after 1 s: it was stopped.
2 messages, 0 of them redundant; 0 overloads; 0 s active.

Messages, by the seconds since it began
  1  +0 s  RouteChange Generic: route=Speaker reason=headphones unplugged
  2  +0.5 s  HAL_Error Error: error=device lost code=-19

No producer looked for stretches.

What was forwarded of it is not known: the store does not record sendings by session.
--------
