# SPDX-License-Identifier: Apache-2.0
"""Says what a player does, without a key: PYTHONPATH=python /usr/bin/python3 examples/player.py"""

import time

from tonewerk.reporting import Client, Service


def play() -> None:
    time.sleep(0.75)


with Client() as client:
    with client.session(Service.LONG_FORM_AUDIO, "org.example.Player") as session:
        session.device("Speaker")
        session.format(48000, 2, "lpcm")
        with session.playing(0.5) as playing:
            play()
            session.overload()  # the device ran out of data
            playing.volume(0.3)  # begins another summary
            play()
    # The session has stopped, and the daemon makes its summaries.
    print("player: sent" if client.flush(2.0) else "player: no daemon")
