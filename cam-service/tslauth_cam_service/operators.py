# SPDX-License-Identifier: Apache-2.0
"""What operators ask, over a unix socket or with a certificate of their own: the same in JSON, for
programs, and as a page, for people. Who may do what stands in the configuration."""
import functools
import pathlib
import socket
import ssl
import struct

import jinja2
from aiohttp import web

from . import orders, schema
from .configuration import require_protected
from .hosts import secured
from .log import NOTICE, WARNING, log
from .store import BrokenState, NoStore

REQUEST_BYTES = 16 * 1024 * 1024
PAGE = 100

# What the page calls the states, and which it shows together.
VIEWS = {"waiting": (schema.ISSUED,), "joining": (schema.CLAIMED, schema.MADE),
         "joined": (schema.USED,),
         "ended": (schema.LAPSED, schema.REVOKED, schema.REPLACED)}

TEMPLATES = jinja2.Environment(
    loader=jinja2.FileSystemLoader(pathlib.Path(__file__).parent / "templates"),
    autoescape=True, trim_blocks=True, lstrip_blocks=True)

POLICY = ("default-src 'none'; style-src 'self'; form-action 'self'; base-uri 'none'; "
          "frame-ancestors 'none'")


class Refusal(Exception):
    """A request that an operator may not make, or that is none."""

    def __init__(self, status, text):
        super().__init__(text)
        self.status = status


def user_of(transport):
    """The name of the user at the other end of a unix socket; a number where it has none."""
    import pwd
    credentials = transport.get_extra_info("socket").getsockopt(
        socket.SOL_SOCKET, socket.SO_PEERCRED, struct.calcsize("3i"))
    number = struct.unpack("3i", credentials)[1]
    try:
        return pwd.getpwuid(number).pw_name
    except KeyError:
        return str(number)


def certificate_name(transport):
    """The common name of the certificate that the other end has shown."""
    certificate = transport.get_extra_info("peercert") or {}
    names = [value for part in certificate.get("subject", ()) for key, value in part
             if key == "commonName"]
    return names[0] if len(names) == 1 else None


def certificate_context(server, operators):
    context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
    context.minimum_version = ssl.TLSVersion.TLSv1_2
    require_protected(server["key"])
    context.load_cert_chain(server["certificate"], server["key"])
    context.verify_mode = ssl.CERT_REQUIRED
    context.load_verify_locations(operators["authorities"])
    return context


def needs(role):
    """Marks a handler: only who has the role gets to it."""
    def marked(handler):
        @functools.wraps(handler)
        async def guarded(self, request):
            if role not in request["roles"]:
                log(WARNING, f"operator {request['who']}: '{role}' is not among the roles")
                raise Refusal(403, f"'{role}' is not among your roles")
            return await handler(self, request)
        return guarded
    return marked


def number(request, name, default, most):
    text = request.query.get(name, str(default))
    if not text.isascii() or not text.isdigit() or int(text) > most:
        raise Refusal(400, f"'{name}' is a number up to {most}")
    return int(text)


class Operators:
    def __init__(self, store, metrics, roles, identify, in_thread):
        self._store = store
        self._metrics = metrics
        self._roles = roles  # by name
        self._identify = identify  # the name behind a transport
        self._in_thread = in_thread

    def application(self):
        application = web.Application(middlewares=[self._guarded], client_max_size=REQUEST_BYTES)
        for method, path, handler in (
                ("GET", "/operators/v1/codes", self.codes),
                ("POST", "/operators/v1/codes", self.issue),
                ("DELETE", "/operators/v1/codes/{host}", self.revoke),
                ("GET", "/operators/v1/audit", self.audit),
                ("GET", "/metrics", self.metrics),
                ("GET", "/", self.page), ("GET", "/refused", self.refused_page),
                ("GET", "/style.css", self.style),
                ("POST", "/issue", self.issue_form), ("POST", "/revoke", self.revoke_form)):
            application.router.add_route(method, path, handler)
        return application

    @web.middleware
    async def _guarded(self, request, handler):
        is_page = not request.path.startswith("/operators/")
        try:
            request["who"] = self._identify(request.transport) or "nobody"
            request["roles"] = self._roles.get(request["who"], ())
            if not request["roles"]:
                log(WARNING, f"{request['who']} is no operator")
                raise Refusal(403, "you are no operator")
            self._require_own_page(request)
            response = await handler(request)
        except Refusal as refusal:
            response = self._refused(is_page, refusal.status, str(refusal))
        except (NoStore, BrokenState):
            response = self._refused(is_page, 503, "the database does not answer")
        except web.HTTPException as error:
            response = self._refused(is_page, error.status, error.reason)
        response.headers["Content-Security-Policy"] = POLICY
        response.headers["Referrer-Policy"] = "no-referrer"
        return secured(response)

    @staticmethod
    def _require_own_page(request):
        """A browser shows the operator's certificate whoever's page sends the form."""
        if request.method == "GET":
            return
        site = request.headers.get("Sec-Fetch-Site", "none")
        origin = request.headers.get("Origin")
        if site not in ("same-origin", "none") \
                or origin not in (None, f"https://{request.host}"):
            raise Refusal(403, "that form is of another page")

    def _refused(self, is_page, status, text):
        if is_page:
            return self._rendered("refusal.html", status, text=text)
        return web.json_response({"error": text}, status=status)

    @staticmethod
    def _rendered(name, status=200, **values):
        return web.Response(text=TEMPLATES.get_template(name).render(**values), status=status,
                            content_type="text/html")

    # --- for programs ---

    @needs("read")
    async def codes(self, request):
        view = request.query.get("view", "waiting")
        if view not in VIEWS:
            raise Refusal(400, f"'view' is one of {', '.join(VIEWS)}")
        rows = await self._in_thread(self._store.page, number(request, "after", 0, 2 ** 62),
                                     number(request, "limit", PAGE, 1000), VIEWS[view])
        return web.json_response({"codes": rows})

    @needs("issue")
    async def issue(self, request):
        try:
            wanted = orders.parsed(await request.text(), "json")
        except (orders.Wrong, UnicodeDecodeError) as error:
            raise Refusal(400, str(error)) from None
        issued = await self._issue(request, wanted)
        return web.json_response(
            {"codes": [{"host": order.host, "code": code}
                       for order, code in zip(wanted, issued)]}, status=201)

    @needs("issue")
    async def revoke(self, request):
        if not await self._revoke(request, request.match_info["host"]):
            raise Refusal(404, "that host has no code")
        return web.Response(status=204)

    @needs("audit")
    async def audit(self, request):
        rows = await self._in_thread(self._store.audit, number(request, "after", 0, 2 ** 62),
                                     number(request, "limit", 1000, 10000))
        return web.json_response({"audit": rows})

    @needs("read")
    async def metrics(self, _):
        return web.Response(body=self._metrics.text(await self._in_thread(self._store.counts)),
                            content_type="text/plain")

    async def _issue(self, request, wanted):
        issued = await self._in_thread(self._store.issue_all, wanted, request["who"])
        log(NOTICE, f"{request['who']} issued {len(issued)} codes"
                    f"{' for ' + wanted[0].host if len(wanted) == 1 else ''}")
        return issued

    async def _revoke(self, request, host):
        found = await self._in_thread(self._store.revoke, host[:15], request["who"])
        log(NOTICE, f"{request['who']} revoked the code of {host[:15]}")
        return found

    # --- for people ---

    @needs("read")
    async def page(self, request):
        return await self._page(request)

    async def _page(self, request, issued=None, said=None):
        view = request.query.get("view", "waiting")
        if view not in VIEWS:
            raise Refusal(404, "there is no such view")
        after = number(request, "after", 0, 2 ** 62)
        counts = await self._in_thread(self._store.counts)
        rows = await self._in_thread(self._store.page, after, PAGE + 1, VIEWS[view])
        return self._rendered(
            "codes.html", view=view, rows=rows[:PAGE], issued=issued, said=said,
            more=rows[PAGE - 1]["id"] if len(rows) > PAGE else None, who=request["who"],
            may_issue="issue" in request["roles"], may_audit="audit" in request["roles"],
            counts={name: sum(counts.get(state, 0) for state in states)
                    for name, states in VIEWS.items()})

    @needs("audit")
    async def refused_page(self, request):
        rows = await self._in_thread(self._store.refusals, PAGE)
        return self._rendered("refused.html", rows=rows, who=request["who"])

    async def style(self, _):
        return web.Response(text=(pathlib.Path(__file__).parent / "templates" / "style.css")
                            .read_text(), content_type="text/css")

    @needs("issue")
    async def issue_form(self, request):
        form = await request.post()
        entry = {name: str(form.get(name, "")).strip() for name in ("host", "unit", "networks")}
        minutes = str(form.get("minutes", "60"))
        try:
            if not minutes.isascii() or not minutes.isdigit():
                raise ValueError("'minutes' is a number")
            order = orders.order_of({**entry, "minutes": int(minutes),
                                     "reuse": form.get("reuse") == "yes"})
        except ValueError as error:
            raise Refusal(400, str(error)) from None
        code = (await self._issue(request, [order]))[0]
        return await self._page(request, issued={"host": order.host, "code": code})

    @needs("issue")
    async def revoke_form(self, request):
        host = str((await request.post()).get("host", ""))
        found = await self._revoke(request, host)
        return await self._page(request, said=f"The code of {host} was revoked." if found
                                else f"{host} has no code.")
