# SPDX-License-Identifier: Apache-2.0
"""What one address may ask for before it is not heard for a while."""
import collections
import time

REFUSAL_SECONDS = 60
ADDRESSES = 4096


class Refusals:
    """Which addresses have shown too many codes that were refused."""

    def __init__(self, limit, clock=time.monotonic):
        self._limit = limit
        self._clock = clock
        self._times = collections.OrderedDict()  # the address that was refused last is the last

    def too_many(self, address):
        times = self._times.get(address, ())
        return sum(self._clock() - t < REFUSAL_SECONDS for t in times) >= self._limit

    def add(self, address):
        times = self._times.setdefault(address, collections.deque(maxlen=self._limit))
        times.append(self._clock())
        self._times.move_to_end(address)
        while len(self._times) > ADDRESSES:
            self._times.popitem(last=False)
