# SPDX-License-Identifier: Apache-2.0
"""Gives a host an account for its code. Knows nothing of connections."""
import asyncio
import dataclasses
import time

from . import codes, store, units
from .domain import NET_SECONDS, NetError, NoSuchUnit
from .log import ERROR, NOTICE, WARNING, log

# A host's wait for one of the places of those whose account is being made.
PLACE_SECONDS = 8


class Answer(Exception):
    """Ends a request with an error that the host's provider knows."""

    def __init__(self, error):
        super().__init__(error)
        self.error = error


@dataclasses.dataclass(frozen=True)
class Account:
    controller: str
    blob: str
    claim: str


class Joining:
    def __init__(self, kept, domain, default_unit, refusals, places, threads=None):
        self._store = kept
        self._domain = domain
        self._default_unit = default_unit
        self._refusals = refusals
        self._places = asyncio.Semaphore(places)
        self._threads = threads
        self._unnoted = []
        self._noting = asyncio.Lock()

    @property
    def domain(self):
        return self._domain

    async def account(self, attempt):
        """The account of a host that shows its code. Answer where it gets none."""
        who = {"address": attempt.address, "host": attempt.host}
        wants = f"{attempt.address} wants an account for {attempt.host}"
        if attempt.unit is not None:
            wants += f" in '{attempt.unit}'"
        if self._refusals.too_many(attempt.address):
            log(WARNING, f"{wants}: not heard, too many refused codes", **who)
            raise Answer("too-many-attempts")
        try:
            # All that can be known before is asked before the code is claimed, and before the
            # host takes a place: who has no code waits for nobody.
            seen = await self._in_thread(self._store.check, attempt, self._fits(attempt.unit))
            async with _place(self._places):
                return await self._make(attempt, seen, who)
        except codes.Refused as reason:
            self._refusals.add(attempt.address)
            log(WARNING, f"{wants}: refused, {reason}", **who)
            await self._note_refusal(attempt, str(reason))
            raise Answer("code-refused") from None
        except store.InUse:
            log(WARNING, f"{wants}: its account is being made already", **who)
            raise Answer("busy") from None
        except asyncio.TimeoutError:
            log(WARNING, f"{wants}: too many others do, too", **who)
            raise Answer("busy") from None
        except NoSuchUnit:
            log(WARNING, f"{wants}: the domain has no such unit", **who)
            raise Answer("no-such-unit") from None
        except (NetError, store.BrokenState, store.NoStore, OSError, ValueError) as error:
            log(ERROR, f"{attempt.address}: no account for {attempt.host}: {error}", **who)
            raise Answer("failed") from None

    async def received(self, claim, address):
        """Whether there was an account to be received under this claim."""
        try:
            return await self._in_thread(self._store.received, claim, address)
        except (store.BrokenState, store.NoStore) as error:
            log(ERROR, f"{address}: a receipt cannot be kept: {error}", address=address)
            raise Answer("failed") from None

    async def _make(self, attempt, seen, who):
        begin = time.monotonic()
        end = begin + NET_SECONDS
        unit = self._unit(seen.unit)
        exists = await self._domain.has_account(attempt.host, end)
        if exists and not seen.reuse and not seen.is_again:
            # Another host with this code may have had it made since.
            await self._in_thread(self._store.check, attempt, self._fits(attempt.unit))
            log(WARNING, f"{attempt.address}: the account of {attempt.host} exists already, and "
                         f"its code was issued without --reuse", **who)
            raise Answer("account-exists")
        claim = await self._in_thread(self._store.claim, attempt, self._fits(attempt.unit))
        blob = await self._claimed(claim, unit, exists or claim.is_again, end)
        log(NOTICE, f"{attempt.address}: made the account of {attempt.host}"
                    f"{' (taken over)' if exists else ''} in {unit or 'the default container'}, "
                    f"{time.monotonic() - begin:.1f} s", **who)
        return Account(self._domain.controller, blob, claim.name)

    async def _claimed(self, claim, unit, reuse, end):
        """The blob; the claim ends here in one way or the other, unless this process does."""
        try:
            blob = await self._domain.make_account(claim.host, unit, reuse, end)
        except NoSuchUnit:
            await self._in_thread(self._store.give_up, claim, "no such unit", True)
            raise
        except BaseException as error:
            outcome = "failed" if isinstance(error, Exception) else "ended"
            await asyncio.shield(self._in_thread(self._store.give_up, claim, outcome))
            raise
        if not await self._in_thread(self._store.made, claim):
            raise NetError("its code was revoked or replaced meanwhile; the account is there")
        return blob

    async def _note_refusal(self, attempt, reason):
        """The audit's entry; the answer is the same without. Those that come while one batch is
        written go into the next, so that a flood of them is no flood of transactions."""
        self._unnoted.append((attempt.host, attempt.address, reason))
        async with self._noting:
            batch, self._unnoted = self._unnoted, []
            if not batch:
                return  # another one's batch had it
            try:
                await self._in_thread(self._store.refused, batch)
            except (store.BrokenState, store.NoStore) as error:
                log(ERROR, f"{len(batch)} refusals cannot be noted: {error}")

    def _unit(self, text):
        text = text or self._default_unit
        return units.unit_name(text, self._domain.dns) if text else None

    def _fits(self, asked):
        """Refuses a code that is for another unit than the one that a host names."""
        def fits(decided):
            if asked is None:
                return  # where the operator has decided
            try:
                name = units.unit_name(asked, self._domain.dns)
            except ValueError as error:
                raise codes.Refused(str(error)) from None
            own = self._unit(decided)
            if own is None or name.casefold() != own.casefold():
                raise codes.Refused("the code is issued for another unit")
        return fits

    async def _in_thread(self, call, *arguments):
        loop = asyncio.get_running_loop()
        return await loop.run_in_executor(self._threads, call, *arguments)


class _place:
    def __init__(self, places):
        self._places = places

    async def __aenter__(self):
        await asyncio.wait_for(self._places.acquire(), PLACE_SECONDS)

    async def __aexit__(self, *_):
        self._places.release()
