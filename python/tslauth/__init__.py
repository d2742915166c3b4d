# SPDX-License-Identifier: Apache-2.0
"""Who may log in to this host? libtslauth for Python, through its C interface.

Stores and plans are functions; the domain is a `Directory`:

    import tslauth

    with tslauth.Directory(seconds=10) as directory:
        membership = directory.membership()
        if membership.domain is None:
            directory.join("corp.example", "joiner", password)

Every failure is an `Error`, of the class that says what can be done about it. Changes hold the
host's lock, need root, edit files without loss, and refuse where something would be lost. Any
thread may call; calls block, and let other threads run meanwhile. For an event loop there are
`start_...` calls, which return a `Job` with a descriptor to wait for.

Texts are `str`; bytes that are no UTF-8 come and go as `os.fsdecode` has them.
"""

from __future__ import annotations

import ctypes
import dataclasses
import os
from types import TracebackType
from typing import Callable, Dict, Generic, List, Optional, Type, TypeVar

__all__ = [
    "ConfigurationError", "CredentialsError", "Directory", "Domain", "DomainError", "Error",
    "HostError", "Job", "LockedError", "LossError", "Membership", "Plan", "PlannedFile", "TimedOut",
    "TrustState", "TrustedDomains", "UsageError", "activate", "plan", "recorded_store", "stores",
]


class Error(Exception):
    """A failure of libtslauth. `name` is the class of the C++ library's exception, such as
    "LogonFailureException"; `code` the provider's number, or 0."""

    def __init__(self, text: str, name: str = "", code: int = 0) -> None:
        super().__init__(text)
        self.name = name
        self.code = code


class UsageError(Error):
    """The call is wrong."""


class DomainError(Error):
    """The provider or a server says so; see `code`."""


class TimedOut(Error):
    """There is no answer in time. Ask again later."""


class CredentialsError(Error):
    """The domain does not take these credentials."""


class ConfigurationError(Error):
    """A configuration of the library's is to be repaired."""


class HostError(Error):
    """A file of the host cannot be read or written."""


class LossError(Error):
    """The change would lose what the text names; nothing was done."""


class LockedError(Error):
    """Another change of this host runs; nothing was done."""


_CLASSES: Dict[int, Type[Error]] = {
    1: UsageError, 2: DomainError, 3: TimedOut, 4: CredentialsError, 5: ConfigurationError,
    6: HostError, 7: LossError, 8: LockedError,
}
_NO_MEMORY = 9
_ACCEPT_LOSS = 1
_SKIP_HOSTNAME_CHECK = 2
_MEMBERSHIP, _TRUSTED_DOMAINS, _TRUST_STATE = range(3)


@dataclasses.dataclass(frozen=True)
class Domain:
    """The two names of a domain; either may be empty."""
    dns_name: str
    netbios_name: str


@dataclasses.dataclass(frozen=True)
class Membership:
    """What the provider knows of the host. `age` is in seconds: 0 where it has just said so."""
    domain: Optional[Domain]
    controllers: List[str]
    machine_account: str
    age: float


@dataclasses.dataclass(frozen=True)
class TrustedDomains:
    domains: List[Domain]
    age: float


@dataclasses.dataclass(frozen=True)
class TrustState:
    """`state` is 0 where the trust is in order; tslauth_provider.h has the others."""
    state: int
    age: float


@dataclasses.dataclass(frozen=True)
class PlannedFile:
    path: str
    before: str
    after: str


@dataclasses.dataclass(frozen=True)
class Plan:
    """What activating a store would do. `refusal` is what would fail after `files`, if anything."""
    files: List[PlannedFile]
    losses: List[str]
    refusal: Optional[Error]


# --- the C interface -----------------------------------------------------------------------------

_library = ctypes.CDLL("libtslauth-c.so.1")


def _declare(name: str, result: object, *arguments: object) -> Callable[..., object]:
    function = getattr(_library, name)
    function.restype = result
    function.argtypes = arguments
    return function  # type: ignore[no-any-return]


_handle = ctypes.c_void_p
_text = ctypes.c_char_p
_slot = ctypes.POINTER(ctypes.c_void_p)

_error_get_kind = _declare("tslauth_error_get_kind", ctypes.c_int, _handle)
_error_get_code = _declare("tslauth_error_get_code", ctypes.c_ulong, _handle)
_error_get_class = _declare("tslauth_error_get_class", _text, _handle)
_error_get_text = _declare("tslauth_error_get_text", _text, _handle)
_error_free = _declare("tslauth_error_free", None, _handle)
_texts_get = _declare("tslauth_texts_get", _text, _handle, ctypes.c_size_t)
_texts_free = _declare("tslauth_texts_free", None, _handle)
_stores = _declare("tslauth_stores", ctypes.c_int, _slot, _slot)
_recorded_store = _declare("tslauth_recorded_store", ctypes.c_int, _slot, _slot)
_plan_make = _declare("tslauth_plan_make", ctypes.c_int, _text, _slot, _slot)
_plan_file_count = _declare("tslauth_plan_file_count", ctypes.c_size_t, _handle)
_plan_file_path = _declare("tslauth_plan_file_path", _text, _handle, ctypes.c_size_t)
_plan_file_before = _declare("tslauth_plan_file_before", _text, _handle, ctypes.c_size_t)
_plan_file_after = _declare("tslauth_plan_file_after", _text, _handle, ctypes.c_size_t)
_plan_losses = _declare("tslauth_plan_losses", _handle, _handle)
_plan_refusal = _declare("tslauth_plan_refusal", _handle, _handle)
_plan_free = _declare("tslauth_plan_free", None, _handle)
_activate = _declare("tslauth_activate", ctypes.c_int, _text, ctypes.c_uint, ctypes.c_int, _slot)
_directory_open = _declare("tslauth_directory_open", ctypes.c_int, ctypes.c_int, _slot, _slot)
_directory_free = _declare("tslauth_directory_free", None, _handle)
_directory_join = _declare("tslauth_directory_join", ctypes.c_int, _handle, _text, _text, _text,
                           ctypes.c_uint, _slot)
_directory_join_through_cam = _declare("tslauth_directory_join_through_cam", ctypes.c_int, _handle,
                                       _text, _text, ctypes.c_uint, _slot)
_directory_part = _declare("tslauth_directory_part", ctypes.c_int, _handle, _text, _text, _slot)
_directory_ask = _declare("tslauth_directory_ask", ctypes.c_int, _handle, ctypes.c_int, _slot,
                          _slot)
_answer_get_age = _declare("tslauth_answer_get_age", ctypes.c_double, _handle)
_answer_domain_count = _declare("tslauth_answer_domain_count", ctypes.c_size_t, _handle)
_answer_dns_name = _declare("tslauth_answer_dns_name", _text, _handle, ctypes.c_size_t)
_answer_netbios_name = _declare("tslauth_answer_netbios_name", _text, _handle, ctypes.c_size_t)
_answer_controllers = _declare("tslauth_answer_controllers", _handle, _handle)
_answer_machine_account = _declare("tslauth_answer_machine_account", _text, _handle)
_answer_trust_state = _declare("tslauth_answer_trust_state", ctypes.c_int, _handle)
_answer_free = _declare("tslauth_answer_free", None, _handle)
_job_ask = _declare("tslauth_job_ask", ctypes.c_int, _handle, ctypes.c_int, _slot, _slot)
_job_join = _declare("tslauth_job_join", ctypes.c_int, _handle, _text, _text, _text, ctypes.c_uint,
                     _slot, _slot)
_job_part = _declare("tslauth_job_part", ctypes.c_int, _handle, _text, _text, _slot, _slot)
_job_descriptor = _declare("tslauth_job_descriptor", ctypes.c_int, _handle)
_job_finish = _declare("tslauth_job_finish", ctypes.c_int, _handle, _slot, _slot)
_job_abandon = _declare("tslauth_job_abandon", None, _handle)


def _str(text: object) -> str:
    assert isinstance(text, bytes)
    return os.fsdecode(text)


def _int(number: object) -> int:
    assert isinstance(number, int)
    return number


def _bytes(text: Optional[str]) -> Optional[bytes]:
    if text is not None and "\0" in text:
        raise UsageError("a text has a zero character in it")
    return None if text is None else os.fsencode(text)


def _error_from(error: object) -> Exception:
    kind = _int(_error_get_kind(error))
    text = _str(_error_get_text(error))
    if kind == _NO_MEMORY:
        return MemoryError(text)
    return _CLASSES.get(kind, Error)(text, _str(_error_get_class(error)),
                                     _int(_error_get_code(error)))


def _call(function: Callable[..., object], *arguments: object) -> None:
    error = ctypes.c_void_p()
    if function(*arguments, ctypes.byref(error)) != 0:
        try:
            raise _error_from(error)
        finally:
            _error_free(error)


def _make(function: Callable[..., object], *arguments: object) -> ctypes.c_void_p:
    """A handle that the function stores in its slot before that of the error."""
    handle = ctypes.c_void_p()
    _call(function, *arguments, ctypes.byref(handle))
    return handle


def _list(texts: object) -> List[str]:
    found: List[str] = []
    while (text := _texts_get(texts, len(found))) is not None:
        found.append(_str(text))
    return found


def _owned_list(function: Callable[..., object]) -> List[str]:
    texts = _make(function)
    try:
        return _list(texts)
    finally:
        _texts_free(texts)


# --- stores --------------------------------------------------------------------------------------

def stores() -> List[str]:
    """The names of all stores."""
    return _owned_list(_stores)


def recorded_store() -> str:
    """The name of the store that is recorded as active."""
    return _owned_list(_recorded_store)[0]


def plan(store: str) -> Plan:
    """What `activate` would do. Writes nothing."""
    handle = _make(_plan_make, _bytes(store))
    try:
        files = [PlannedFile(_str(_plan_file_path(handle, i)), _str(_plan_file_before(handle, i)),
                             _str(_plan_file_after(handle, i)))
                 for i in range(_int(_plan_file_count(handle)))]
        refusal = _plan_refusal(handle)
        error = None if refusal is None else _error_from(refusal)
        if error is not None and not isinstance(error, Error):
            raise error
        return Plan(files, _list(_plan_losses(handle)), error)
    finally:
        _plan_free(handle)


def activate(store: str, *, accept_loss: bool = False, seconds: int = 60) -> None:
    """Makes `store` the host's. `seconds`: to wait for another change that runs."""
    _call(_activate, _bytes(store), _ACCEPT_LOSS if accept_loss else 0, seconds)


# --- the domain ----------------------------------------------------------------------------------

def _domains(answer: ctypes.c_void_p) -> List[Domain]:
    return [Domain(_str(_answer_dns_name(answer, i)), _str(_answer_netbios_name(answer, i)))
            for i in range(_int(_answer_domain_count(answer)))]


def _age(answer: ctypes.c_void_p) -> float:
    age = _answer_get_age(answer)
    assert isinstance(age, float)
    return age


def _membership(answer: ctypes.c_void_p) -> Membership:
    domains = _domains(answer)
    return Membership(domains[0] if domains else None, _list(_answer_controllers(answer)),
                      _str(_answer_machine_account(answer)), _age(answer))


def _trusted_domains(answer: ctypes.c_void_p) -> TrustedDomains:
    return TrustedDomains(_domains(answer), _age(answer))


def _trust_state(answer: ctypes.c_void_p) -> TrustState:
    return TrustState(_int(_answer_trust_state(answer)), _age(answer))


def _nothing(_answer: ctypes.c_void_p) -> None:
    return None


_Result = TypeVar("_Result")


class Job(Generic[_Result]):
    """A call that runs on a thread of the library's. `fileno()` becomes readable when it has
    ended, for `select` and event loops. As a context manager it abandons at the end what was not
    asked for its result."""

    def __init__(self, handle: ctypes.c_void_p,
                 read: Callable[[ctypes.c_void_p], _Result]) -> None:
        self._handle: Optional[ctypes.c_void_p] = handle
        self._read = read

    def _take(self) -> ctypes.c_void_p:
        handle, self._handle = self._handle, None
        if handle is None:
            raise UsageError("the job is over")
        return handle

    def fileno(self) -> int:
        if self._handle is None:
            raise UsageError("the job is over")
        return _int(_job_descriptor(self._handle))

    def result(self) -> _Result:
        """Waits for the call, and returns or raises what it does. Once."""
        answer = _make(_job_finish, self._take())
        try:
            return self._read(answer)
        finally:
            _answer_free(answer)

    def abandon(self) -> None:
        """The call goes on, and nobody hears of it."""
        if self._handle is not None:
            _job_abandon(self._take())

    def __enter__(self) -> Job[_Result]:
        return self

    def __exit__(self, kind: Optional[Type[BaseException]], error: Optional[BaseException],
                 trace: Optional[TracebackType]) -> None:
        self.abandon()

    def __del__(self) -> None:
        self.abandon()


class Directory:
    """The Active Directory store of this host, with the provider that is configured.
    `seconds`: to wait for an answer, or for another change that runs."""

    def __init__(self, seconds: int = 60) -> None:
        self._handle: Optional[ctypes.c_void_p] = None
        self._handle = _make(_directory_open, seconds)

    def close(self) -> None:
        handle, self._handle = self._handle, None
        if handle is not None:
            _directory_free(handle)

    def __enter__(self) -> Directory:
        return self

    def __exit__(self, kind: Optional[Type[BaseException]], error: Optional[BaseException],
                 trace: Optional[TracebackType]) -> None:
        self.close()

    def __del__(self) -> None:
        self.close()

    def _get(self) -> ctypes.c_void_p:
        if self._handle is None:
            raise UsageError("the directory is closed")
        return self._handle

    def _ask(self, question: int, read: Callable[[ctypes.c_void_p], _Result]) -> _Result:
        answer = _make(_directory_ask, self._get(), question)
        try:
            return read(answer)
        finally:
            _answer_free(answer)

    def membership(self) -> Membership:
        """Where no answer comes in time, the last one that this object was given, with its age."""
        return self._ask(_MEMBERSHIP, _membership)

    def trusted_domains(self) -> TrustedDomains:
        return self._ask(_TRUSTED_DOMAINS, _trusted_domains)

    def trust_state(self) -> TrustState:
        return self._ask(_TRUST_STATE, _trust_state)

    def join(self, domain: str, user: str, password: str, *,
             skip_hostname_check: bool = False) -> None:
        """Joins the host. An organisational unit may stand behind a "/" of `domain`."""
        _call(_directory_join, self._get(), _bytes(domain), _bytes(user), _bytes(password),
              _SKIP_HOSTNAME_CHECK if skip_hostname_check else 0)

    def join_through_cam(self, server: str, unit: Optional[str] = None, *,
                         skip_hostname_check: bool = False) -> None:
        """Joins the host with an account that the CAM server makes."""
        _call(_directory_join_through_cam, self._get(), _bytes(server), _bytes(unit),
              _SKIP_HOSTNAME_CHECK if skip_hostname_check else 0)

    def part(self, user: Optional[str] = None, password: Optional[str] = None) -> None:
        """Parts the host, with an account that may remove it or without."""
        _call(_directory_part, self._get(), _bytes(user), _bytes(password))

    def start_membership(self) -> Job[Membership]:
        return Job(_make(_job_ask, self._get(), _MEMBERSHIP), _membership)

    def start_trusted_domains(self) -> Job[TrustedDomains]:
        return Job(_make(_job_ask, self._get(), _TRUSTED_DOMAINS), _trusted_domains)

    def start_trust_state(self) -> Job[TrustState]:
        return Job(_make(_job_ask, self._get(), _TRUST_STATE), _trust_state)

    def start_join(self, domain: str, user: str, password: str, *,
                   skip_hostname_check: bool = False) -> Job[None]:
        return Job(_make(_job_join, self._get(), _bytes(domain), _bytes(user), _bytes(password),
                         _SKIP_HOSTNAME_CHECK if skip_hostname_check else 0), _nothing)

    def start_part(self, user: Optional[str] = None,
                   password: Optional[str] = None) -> Job[None]:
        return Job(_make(_job_part, self._get(), _bytes(user), _bytes(password)), _nothing)
