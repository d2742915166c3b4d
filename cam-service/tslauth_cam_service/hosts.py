# SPDX-License-Identifier: Apache-2.0
"""What hosts and load balancers ask, as HTTP: openapi.json describes it."""
import asyncio
import json
import pathlib

from aiohttp import web

from . import codes
from .joining import Answer
from .log import WARNING, log
from .store import Attempt

REQUEST_BYTES = 4096

STATUS = {"bad-request": 400, "code-refused": 403, "account-exists": 409, "no-such-unit": 422,
          "too-many-attempts": 429, "failed": 500, "busy": 503}

DESCRIPTION = pathlib.Path(__file__).parent / "openapi.json"


def refusal(error):
    headers = {"Retry-After": "10"} if error in ("busy", "too-many-attempts") else {}
    return web.json_response({"error": error}, status=STATUS[error], headers=headers)


def secured(response):
    response.headers["Cache-Control"] = "no-store"
    response.headers["X-Content-Type-Options"] = "nosniff"
    return response


def text(request, name, most, default=None):
    """A member of a request that is a text; Answer where it is anything else."""
    value = request.get(name, default)
    if value is not default and not (isinstance(value, str) and 0 < len(value) <= most):
        raise Answer("bad-request")
    return value


def attempt_of(request, address):
    host, code = text(request, "host", 15), text(request, "code", 256)
    key = text(request, "host_key", 128)
    if host is None or code is None or key is None or not codes.HOST.fullmatch(host) \
            or not code.isascii() or not key.isascii():
        raise Answer("bad-request")
    return Attempt(host, code, key, address, text(request, "unit", 1024))


async def body_of(request):
    try:
        body = json.loads(await request.read())
    except (ValueError, RecursionError):
        raise Answer("bad-request") from None
    if not isinstance(body, dict):
        raise Answer("bad-request")
    return body


class Hosts:
    def __init__(self, joining, store, metrics):
        self._joining = joining
        self._store = store
        self._metrics = metrics
        self.doors = None  # whose handler this becomes
        self.is_ending = False

    def application(self):
        application = web.Application(middlewares=[self._answered, self._bounded],
                                      client_max_size=REQUEST_BYTES)
        application.router.add_get("/v1/domain", self.domain)
        application.router.add_post("/v1/accounts", self.account)
        application.router.add_post("/v1/accounts/received", self.received)
        application.router.add_get("/openapi.json", self.description)
        application.router.add_get("/healthz", self.health)
        application.router.add_get("/readyz", self.ready)
        return application

    @web.middleware
    async def _bounded(self, request, handler):
        connection = self.doors.of(request.transport) if request.transport else None
        if connection is None:
            raise web.HTTPBadRequest()  # it has gone
        request["address"] = connection.address
        try:
            await request.read()
        finally:
            connection.heard()
        try:
            return await handler(request)
        finally:
            connection.answered()

    @web.middleware
    async def _answered(self, request, handler):
        try:
            response = await handler(request)
        except Answer as answer:
            response = refusal(answer.error)
            if answer.error == "bad-request":
                log(WARNING, f"{request['address']} sent a request that is none",
                    address=request["address"])
        except web.HTTPException as error:
            response = web.json_response({"error": "bad-request"}, status=error.status)
        known = request.match_info.route.resource
        self._metrics.answered(known.canonical if known else "other", response.status)
        return secured(response)

    async def domain(self, _):
        domain = self._joining.domain
        return web.json_response({"netbios": domain.netbios, "dns": domain.dns, "sid": domain.sid})

    async def account(self, request):
        with self._metrics.account_seconds.time():
            account = await self._joining.account(
                attempt_of(await body_of(request), request["address"]))
        return web.json_response({"controller": account.controller, "blob": account.blob,
                                  "claim": account.claim}, status=201)

    async def received(self, request):
        claim = text(await body_of(request), "claim", 64)
        if claim is None:
            raise Answer("bad-request")
        if not await self._joining.received(claim, request["address"]):
            raise web.HTTPNotFound()
        return web.Response(status=204)

    async def description(self, _):
        return web.Response(body=DESCRIPTION.read_bytes(), content_type="application/json")

    async def health(self, _):
        return web.json_response({"status": "alive"})

    async def ready(self, _):
        is_ready = not self.is_ending and await asyncio.get_running_loop().run_in_executor(
            None, self._store.is_ready)
        return web.json_response({"status": "ready" if is_ready else "not ready"},
                                 status=200 if is_ready else 503)
