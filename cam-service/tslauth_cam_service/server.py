# SPDX-License-Identifier: Apache-2.0
"""The process that serves: sockets, signals, what is done now and then."""
import asyncio
import concurrent.futures
import contextlib
import os
import signal
import socket
import ssl
import sys
import time

from aiohttp import web

from . import log as logs
from .configuration import require_protected
from .domain import Domain
from .doors import REQUEST_SECONDS, Doors
from .hosts import Hosts
from .joining import Joining
from .limits import Refusals
from .log import ERROR, NOTICE, log
from .metrics import Metrics
from .operators import Operators, certificate_name, user_of
from .operators import certificate_context as operator_context
from .store import BrokenState, NoStore, Store

# What an answer may take when the service is told to end; a host gives up after 30 s.
ENDING_SECONDS = 28
TIDY_SECONDS = 600
DAY = 86400
BACKLOG = 1024


def certificate_context(server):
    context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
    context.minimum_version = ssl.TLSVersion.TLSv1_2
    require_protected(server["key"])
    context.load_cert_chain(server["certificate"], server["key"])
    return context


def expiry(certificate):
    """When the certificate expires, in seconds since 1970."""
    return ssl.cert_time_to_seconds(
        ssl._ssl._test_decode_cert(certificate)["notAfter"])  # there is no public name for it


class Server:
    def __init__(self, configuration):
        self._configuration = configuration
        self._store = Store(configuration.database, configuration.state)
        # Each waits for the database or for the disk, not for the processor.
        self._threads = concurrent.futures.ThreadPoolExecutor(8)
        self._metrics = Metrics()
        self._doors = self._hosts = None
        self._ending = asyncio.Event()

    async def serve(self):
        server, domain = self._configuration["server"], self._configuration["domain"]
        context = certificate_context(server)
        require_protected(domain["credentials"])
        await asyncio.get_running_loop().run_in_executor(self._threads, self._store.open)
        accounts = Domain(domain["net_program"], domain["controller"], domain["credentials"])
        await accounts.discover()
        limits = self._configuration["limits"]
        joining = Joining(self._store, accounts, domain["default_unit"],
                          Refusals(limits["refusals_a_minute"]), limits["accounts_at_once"],
                          self._threads)
        self._hosts = Hosts(joining, self._store, self._metrics)
        self._metrics.certificate_expires(expiry(server["certificate"]))
        async with contextlib.AsyncExitStack() as stack:
            handler = await self._handler(stack, self._hosts.application())
            self._doors = self._hosts.doors = Doors(handler, context, limits, server["proxies"])
            self._metrics.watch(self._doors)
            await self._listen_for_metrics(stack)
            await self._listen_for_operators(stack)
            loop = asyncio.get_running_loop()
            listener = await loop.create_server(
                self._doors, server["address"], server["port"], backlog=BACKLOG,
                family=socket.AF_INET)
            for number in (signal.SIGTERM, signal.SIGINT):
                loop.add_signal_handler(number, self._ending.set)
            loop.add_signal_handler(signal.SIGHUP, self._reload)
            tidying = asyncio.create_task(self._tidy())
            log(NOTICE, f"serving {accounts.dns} ({accounts.netbios}, {accounts.sid}) of "
                        f"{accounts.controller} on {server['address']}:"
                        f"{listener.sockets[0].getsockname()[1]}")
            await self._ending.wait()
            tidying.cancel()
            await self._end(listener, server["drain_seconds"])
        self._store.close()
        log(NOTICE, "ended")

    @staticmethod
    async def _handler(stack, application):
        runner = web.AppRunner(application, access_log=None, handle_signals=False,
                               keepalive_timeout=30)
        await runner.setup()
        stack.push_async_callback(runner.cleanup)
        return runner.server

    async def _listen_for_metrics(self, stack):
        where = self._configuration["metrics"]
        if where["port"] is None:
            return
        application = web.Application()
        application.router.add_get("/metrics", self.metrics)
        handler = await self._handler(stack, application)
        listener = await asyncio.get_running_loop().create_server(
            handler, where["address"], where["port"])
        stack.callback(listener.close)

    async def _listen_for_operators(self, stack):
        operators = self._configuration["operators"]
        loop = asyncio.get_running_loop()

        def application(roles, identify):
            return Operators(self._store, self._metrics, roles, identify,
                             lambda *call: loop.run_in_executor(self._threads, *call)).application()
        if operators["socket"] is not None:
            handler = await self._handler(stack, application(operators["users"], user_of))
            with contextlib.suppress(FileNotFoundError):
                os.unlink(operators["socket"])  # of a service that was killed
            listener = await loop.create_unix_server(handler, operators["socket"])
            os.chmod(operators["socket"], 0o666)  # the roles decide
            stack.callback(listener.close)
        if operators["port"] is not None:
            handler = await self._handler(
                stack, application(operators["certificates"], certificate_name))
            listener = await loop.create_server(
                handler, operators["address"], operators["port"],
                ssl=operator_context(self._configuration["server"], operators),
                ssl_handshake_timeout=REQUEST_SECONDS)
            stack.callback(listener.close)

    async def metrics(self, _):
        try:
            counts = await asyncio.get_running_loop().run_in_executor(
                self._threads, self._store.counts)
        except (NoStore, BrokenState):
            counts = {}
        return web.Response(body=self._metrics.text(counts), content_type="text/plain")

    def _reload(self):
        """A new certificate, for who connects from now on."""
        server = self._configuration["server"]
        try:
            self._doors.context = certificate_context(server)
            self._metrics.certificate_expires(expiry(server["certificate"]))
            log(NOTICE, "the certificate was read again")
        except Exception as error:  # whatever it is, the old one serves
            log(ERROR, f"the certificate stays as it was: {error}")

    async def _tidy(self):
        kept = self._configuration["retention"]
        while True:
            try:
                await asyncio.get_running_loop().run_in_executor(
                    self._threads, self._store.tidy, kept["closed_codes_days"] * DAY,
                    kept["audit_days"] * DAY)
            except (NoStore, BrokenState) as error:
                log(ERROR, f"nothing was tidied: {error}")
            await asyncio.sleep(TIDY_SECONDS)

    async def _end(self, listener, drain_seconds):
        """Readiness ends first, so that a load balancer looks elsewhere; then nobody new comes,
        and who has asked is answered."""
        self._hosts.is_ending = True
        await asyncio.sleep(drain_seconds)
        listener.close()
        end = time.monotonic() + ENDING_SECONDS
        while self._doors.asking and time.monotonic() < end:
            await asyncio.sleep(0.02)
        await asyncio.sleep(0.05)  # for the last bytes of the last answer
        self._doors.end_all()


def serve(configuration):
    logs.form = configuration[""]["log"]
    if sys.version_info < (3, 12):  # from then on it is what asyncio does by itself
        asyncio.set_child_watcher(asyncio.PidfdChildWatcher())  # and no thread for each child
    asyncio.run(_served(configuration))


async def _served(configuration):
    await Server(configuration).serve()
