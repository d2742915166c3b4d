# SPDX-License-Identifier: Apache-2.0
"""Where codes are kept, and what was done with them: SQLite, or PostgreSQL for several services.

A code counts once because every step is one transaction that looks at the state which it changes.
A host that shows its code *claims* it, under a name that nobody else has; until the lease of the
claim ends, or the one who holds it gives it up, nobody makes an account with that code. A claim
that ended without an answer to the host is open to the same host alone, with the same code, for a
while. No code is kept, nor what a host gets for it.
"""
import contextlib
import dataclasses
import hashlib
import os
import pathlib
import secrets
import sqlite3
import tempfile
import time

import sqlalchemy as sa

from . import codes, schema
from .codes import Refused

REVISION = "0001"

# Longer than the making of an account can take, also where the one who makes it was killed.
LEASE_SECONDS = 30
# For which a host may come back for an account that was made and did not reach it.
FOUND_SECONDS = 900
# So many hosts in one statement.
PART = 500
# Further steps of the same claim are tried again for so long where the database is away.
PATIENCE_SECONDS = 8


class BrokenState(Exception):
    """What is kept is not what this program leaves there. Nothing was changed."""


class InUse(Exception):
    """Somebody makes the account at this moment, for the same host."""


class NoStore(Exception):
    """The database does not answer. What it was asked for may be done or not."""


@dataclasses.dataclass(frozen=True)
class Attempt:
    """A host that shows a code. `key` is a text by which the service knows the host again."""
    host: str
    code: str
    key: str
    address: str
    unit: "str | None" = None
    claim: str = dataclasses.field(default_factory=lambda: secrets.token_hex(16))


@dataclasses.dataclass(frozen=True)
class Claim:
    """The right to make the account, for as long as the lease lasts."""
    name: str
    host: str
    address: str
    unit: "str | None"
    reuse: bool  # the code allows to take over an account
    is_again: bool  # an account that exists may be this code's own


def key_digest(attempt):
    return hashlib.sha256(b"\0".join((attempt.host.upper().encode(),
                                      attempt.key.encode()))).hexdigest()


def engine_of(url):
    is_file = url.startswith("sqlite")
    # One connection a thread at the most; each is one thread's at a time.
    engine = sa.create_engine(
        url, future=True, pool_pre_ping=not is_file, poolclass=sa.pool.QueuePool, pool_size=8,
        connect_args={"check_same_thread": False} if is_file else {"connect_timeout": 3})
    if engine.dialect.name == "sqlite":
        @sa.event.listens_for(engine, "connect")
        def connected(connection, _):
            connection.isolation_level = None  # transactions begin below, and not with a change
            connection.execute("PRAGMA journal_mode = WAL")
            connection.execute("PRAGMA synchronous = FULL")
            connection.execute("PRAGMA busy_timeout = 8000")

        @sa.event.listens_for(engine, "begin")
        def begun(connection):
            # Who only looks waits for nobody who writes.
            looks = connection.get_execution_options().get("looks", False)
            connection.exec_driver_sql("BEGIN" if looks else "BEGIN IMMEDIATE")
    return engine


class Store:
    """All of its calls may wait for the database, and may be made from several threads at once.

    They raise NoStore where it does not answer.
    """

    def __init__(self, url, folder, clock=None):
        self._engine = engine_of(url)
        self._looking = self._engine.execution_options(looks=True)
        self._file = pathlib.Path(folder) / "codes.json"
        self._clock = clock

    # --- opening ---

    def open(self):
        """Brings the tables up to this version, and takes in the codes of a former one."""
        with self._transaction() as connection:
            self._migrate(connection)
        self._take_in()

    def close(self):
        self._engine.dispose()

    def copy(self):
        """A SQLite database as it is at one moment, as the bytes of a file. BrokenState for any
        other, which has tools of its own."""
        if self._engine.dialect.name != "sqlite":
            raise BrokenState("pg_dump copies a PostgreSQL database")
        with tempfile.NamedTemporaryFile(dir=self._file.parent) as file:
            with self._look() as connection:
                copied = sqlite3.connect(file.name)
                connection.connection.driver_connection.backup(copied)
                copied.close()
            return file.read()

    def is_ready(self):
        """Whether the database answers and its tables are of this version."""
        try:
            with self._look() as connection:
                return self._revision(connection) == REVISION
        except (NoStore, sa.exc.SQLAlchemyError):
            return False

    @staticmethod
    def _revision(connection):
        if not sa.inspect(connection).has_table("alembic_version"):
            return None
        return connection.execute(sa.text("SELECT version_num FROM alembic_version")).scalar()

    def _migrate(self, connection):
        if connection.dialect.name == "postgresql":  # services that start at once
            connection.execute(sa.text("SELECT pg_advisory_xact_lock(8989)"))
        revision = self._revision(connection)
        if revision == REVISION:
            return
        if revision is not None and revision > REVISION:
            raise BrokenState(f"the database is of a later version ({revision})")
        import alembic.command
        import alembic.config
        configuration = alembic.config.Config()
        configuration.set_main_option("script_location",
                                      str(pathlib.Path(__file__).parent / "migrations"))
        configuration.attributes["connection"] = connection
        alembic.command.upgrade(configuration, "head")

    def _take_in(self):
        """The codes of a former version's file, which is then renamed: done twice, it is the same
        as done once."""
        try:
            descriptor = os.open(self._file, os.O_RDONLY | os.O_NOFOLLOW | os.O_NONBLOCK)
        except FileNotFoundError:
            return
        except OSError as error:
            raise BrokenState(f"{self._file}: {error.strerror}") from None
        try:
            with open(descriptor, encoding="utf-8") as file:
                former = codes.parsed_file(file.read())
        except (ValueError, RecursionError, OSError) as error:
            raise BrokenState(f"{self._file} is damaged and was left as it is: {error}; repair it, "
                              f"or move it away and issue the codes anew") from None
        with self._transaction() as connection:
            now = self._now(connection)
            for host, issued in former.items():
                if connection.execute(sa.select(schema.CODES.c.id).where(
                        schema.CODES.c.digest == issued["digest"])).first() is None:
                    self._replace(connection, [host.upper()], now)
                    connection.execute(schema.CODES.insert().values(
                        host=host.upper(), salt=issued["salt"], digest=issued["digest"],
                        unit=issued["unit"], reuse=issued["reuse"], issued_at=now,
                        expires_at=issued["expires"], issuer="a former version",
                        state=schema.ISSUED, changed_at=now))
                    self._note(connection, now, "service", "taken in", host, None, "done")
        os.rename(self._file, self._file.with_suffix(".json.taken-in"))

    # --- what operators do ---

    def issue(self, order, issuer):
        return self.issue_all([order], issuer)[0]

    def issue_all(self, orders, issuer):
        """The codes, in the same order: all are issued or none. A host's former code is replaced
        by its new one."""
        issued = [codes.new_code() for _ in orders]
        with self._transaction() as connection:
            now = self._now(connection)
            for first in range(0, len(orders), PART):
                part = slice(first, first + PART)
                self._issue(connection, now, orders[part], issued[part], issuer)
        return issued

    def _issue(self, connection, now, orders, issued, issuer):
        rows = []
        for order, code in zip(orders, issued):
            host, salt = order.host.upper(), secrets.token_bytes(16)
            rows.append({
                "host": host, "salt": salt.hex(), "digest": codes.digest(salt, host, code),
                "unit": order.unit, "networks": order.networks, "reuse": order.reuse,
                "issued_at": now, "expires_at": now + order.minutes * 60, "issuer": issuer,
                "state": schema.ISSUED, "changed_at": now})
        self._replace(connection, [row["host"] for row in rows], now)
        connection.execute(schema.CODES.insert(), rows)
        connection.execute(schema.AUDIT.insert(), [
            {"at": now, "actor": issuer, "action": "issued", "host": row["host"], "address": None,
             "outcome": "done"} for row in rows])

    def revoke(self, host, actor):
        """Whether the host had a code."""
        with self._transaction() as connection:
            now = self._now(connection)
            found = connection.execute(schema.CODES.update().where(
                schema.CODES.c.host == host.upper(), sa.text(schema.IS_OPEN)
            ).values(state=schema.REVOKED, changed_at=now)).rowcount
            self._note(connection, now, actor, "revoked", host.upper(), None,
                       "done" if found else "no code")
        return bool(found)

    def page(self, after=0, limit=100, states=schema.OPEN):
        """Codes in the order in which they were issued, those behind the number `after`."""
        table = schema.CODES
        columns = [table.c.id, table.c.host, table.c.unit, table.c.networks, table.c.reuse,
                   table.c.issued_at, table.c.expires_at, table.c.issuer, table.c.state,
                   table.c.changed_at, table.c.address]
        with self._look() as connection:
            now = self._now(connection)
            rows = connection.execute(sa.select(*columns).where(
                table.c.id > after, table.c.state.in_(states)
            ).order_by(table.c.id).limit(limit)).mappings()
            return [{**row, "seconds_left": row["expires_at"] - now} for row in rows]

    def audit(self, after=0, limit=1000):
        """What was done, the oldest first, from the entry behind the number `after`."""
        with self._look() as connection:
            return [dict(row) for row in connection.execute(
                sa.select(schema.AUDIT).where(schema.AUDIT.c.id > after)
                .order_by(schema.AUDIT.c.id).limit(limit)).mappings()]

    def refusals(self, limit):
        """Who was refused last, the newest first."""
        with self._look() as connection:
            rows = connection.execute(
                sa.select(schema.AUDIT).where(schema.AUDIT.c.action == "refused")
                .order_by(schema.AUDIT.c.id.desc()).limit(limit)).mappings()
            return [{**row, "when": time.strftime("%F %T", time.gmtime(row["at"]))}
                    for row in rows]

    def counts(self):
        """How many codes are in each state."""
        with self._look() as connection:
            return {state: number for state, number in connection.execute(
                sa.select(schema.CODES.c.state, sa.func.count()).group_by(schema.CODES.c.state))}

    def tidy(self, closed_seconds, audit_seconds):
        """Closes what is out of time, and removes what was closed, and noted, longer ago."""
        table = schema.CODES
        with self._transaction() as connection:
            now = self._now(connection)
            connection.execute(table.update().where(sa.or_(
                sa.and_(table.c.state == schema.ISSUED, table.c.expires_at <= now),
                sa.and_(table.c.state.in_((schema.CLAIMED, schema.MADE)),
                        table.c.found_until <= now))
            ).values(state=schema.LAPSED, changed_at=now))
            connection.execute(table.delete().where(
                table.c.state.not_in(schema.OPEN), table.c.changed_at < now - closed_seconds))
            connection.execute(schema.AUDIT.delete().where(
                schema.AUDIT.c.at < now - audit_seconds))

    # --- what hosts do ---

    def check(self, attempt, fits):
        """The claim that this attempt would get; nothing is changed.

        Refused where it would get none, or where fits(unit) raises it; InUse.
        """
        with self._look() as connection:
            row, now = self._open_code(connection, attempt, False)
            return self._claim(row, attempt, now, fits)

    def claim(self, attempt, fits):
        """The same, but the code is claimed then. Where the database has gone, it is asked again:
        what an attempt has claimed already is its own."""
        def step():
            with self._transaction() as connection:
                row, now = self._open_code(connection, attempt, True)
                claim = self._claim(row, attempt, now, fits)
                found_until = row.found_until if row.found_until else now + FOUND_SECONDS
                connection.execute(schema.CODES.update().where(schema.CODES.c.id == row.id).values(
                    state=schema.CLAIMED, changed_at=now, claim=attempt.claim,
                    claim_until=now + LEASE_SECONDS, found_until=found_until,
                    host_key=key_digest(attempt), address=attempt.address))
                self._note(connection, now, "host", "claimed", attempt.host, attempt.address,
                           "again" if claim.is_again else "done")
                return claim
        return self._patiently(step)

    def made(self, claim):
        """The account is there. Whether it may be told of: not where the claim is not the code's
        any more, which was revoked or replaced meanwhile."""
        return self._close(claim, {"state": schema.MADE, "claim_until": 0}, "made")

    def give_up(self, claim, outcome, made_nothing=False):
        """Ends the claim. The code is what it was where surely no account was made; otherwise it
        is the same host's alone."""
        values = {"claim_until": 0}
        if made_nothing and not claim.is_again:
            values = {"state": schema.ISSUED, "claim": None, "claim_until": None,
                      "found_until": None, "host_key": None, "address": None}
        return self._close(claim, values, "given up", outcome)

    def _close(self, claim, values, action, outcome="done"):
        def step():
            with self._transaction() as connection:
                now = self._now(connection)
                found = connection.execute(schema.CODES.update().where(
                    schema.CODES.c.claim == claim.name, schema.CODES.c.host == claim.host.upper(),
                    schema.CODES.c.state.in_((schema.CLAIMED, values.get("state", "")))
                ).values(changed_at=now, **values)).rowcount
                self._note(connection, now, "service", action, claim.host, claim.address,
                           outcome if found else "the claim is lost")
                return bool(found)
        return self._patiently(step)

    def received(self, name, address):
        """The host has what it was sent: its code is used up. Whether there was such a claim."""
        with self._transaction() as connection:
            now = self._now(connection)
            row = connection.execute(sa.select(schema.CODES.c.id, schema.CODES.c.host).where(
                schema.CODES.c.claim == name, schema.CODES.c.state == schema.MADE)).first()
            if row is None:
                return False
            connection.execute(schema.CODES.update().where(schema.CODES.c.id == row.id).values(
                state=schema.USED, changed_at=now))
            self._note(connection, now, "host", "received", row.host, address, "done")
            return True

    def refused(self, refusals):
        """Notes refusals, each a host, an address and a reason, in one transaction."""
        with self._transaction() as connection:
            now = self._now(connection)
            connection.execute(schema.AUDIT.insert(), [
                {"at": now, "actor": "host", "action": "refused", "host": host.upper(),
                 "address": address, "outcome": reason} for host, address, reason in refusals])

    # --- steps of the above ---

    def _open_code(self, connection, attempt, is_locked):
        """The host's code, and the database's time."""
        code = sa.select(schema.CODES).where(
            schema.CODES.c.host == attempt.host.upper(), sa.text(schema.IS_OPEN))
        row = connection.execute(code.with_for_update() if is_locked else code).first()
        return row, self._now(connection)

    @staticmethod
    def _claim(row, attempt, now, fits):
        right = codes.is_right(row.salt if row else "", row.digest if row else "0" * 64,
                               attempt.host, attempt.code)
        if row is None:
            raise Refused("no code is issued for this host")
        if not right:
            raise Refused("the code is wrong")
        if not codes.is_within(attempt.address, row.networks):
            raise Refused("the code is issued for another network")
        fits(row.unit)
        is_mine = row.claim == attempt.claim
        if row.state == schema.ISSUED:
            if row.expires_at <= now:
                raise Refused("the code has expired")
        elif row.host_key != key_digest(attempt):
            raise Refused("the code is used")
        elif row.found_until <= now:
            raise Refused("the code is used, and the time to come back is over")
        elif row.claim_until > now and not is_mine:
            raise InUse()
        return Claim(attempt.claim, attempt.host, attempt.address, row.unit, bool(row.reuse),
                     row.state != schema.ISSUED and not is_mine)

    @staticmethod
    def _replace(connection, hosts, now):
        connection.execute(schema.CODES.update().where(
            schema.CODES.c.host.in_(hosts), sa.text(schema.IS_OPEN)
        ).values(state=schema.REPLACED, changed_at=now))

    @staticmethod
    def _note(connection, now, actor, action, host, address, outcome):
        connection.execute(schema.AUDIT.insert().values(
            at=now, actor=actor, action=action, host=host and host.upper(), address=address,
            outcome=outcome))

    def _now(self, connection):
        """The database's time: the services of one need not agree on theirs."""
        if self._clock is not None:
            return self._clock()
        if connection.dialect.name == "postgresql":
            return float(connection.execute(
                sa.text("SELECT extract(epoch FROM clock_timestamp())")).scalar())
        return time.time()

    def _look(self):
        return self._transaction(self._looking)

    @contextlib.contextmanager
    def _transaction(self, engine=None):
        try:
            with (engine or self._engine).begin() as connection:
                yield connection
        except (sa.exc.OperationalError, sa.exc.InterfaceError, sa.exc.TimeoutError) as error:
            raise NoStore(str(getattr(error, "orig", None) or error).strip()) from None
        except sa.exc.DatabaseError as error:
            raise BrokenState(str(error.orig).strip()) from None

    @staticmethod
    def _patiently(step):
        end = time.monotonic() + PATIENCE_SECONDS
        while True:
            try:
                return step()
            except NoStore:
                if time.monotonic() >= end:
                    raise
                time.sleep(0.2)
