"""Record statistics from Python with libbrimhold.

    import brimhold

    starts = brimhold.Scalar("com.example.starts")         # once, when the program starts
    seconds = brimhold.Distribution("com.example.seconds")

    starts.add()
    seconds.record(2.5)
    with seconds.timer():
        work()

A scalar is a number per UTC day: add to it, or set it. A distribution is a series of measurements.
Recording never fails, whatever the device lacks: `status()` says whether values are kept. Only
mistakes of the program raise: an invalid key, a number out of range.

The module needs the shared library libbrimhold.so.1 and nothing else. BRIMHOLD_LIBRARY in the
environment names another file.

After `os.fork` the child records for itself. Calls may come from any thread.
"""

from __future__ import annotations

import ctypes
import enum
import functools
import math
import operator
import os
import typing
from types import TracebackType

__all__ = ["Distribution", "Scalar", "Status", "Timer", "status"]

_LONGEST_KEY = 1024  # bytes


class _Timer(ctypes.Structure):
    _fields_ = [("nanoseconds", ctypes.c_uint64)]


def _load() -> ctypes.CDLL:
    library = ctypes.CDLL(os.environ.get("BRIMHOLD_LIBRARY", "libbrimhold.so.1"))
    handle, timer = ctypes.c_void_p, _Timer
    for name, result, arguments in (
        ("BHClientScalarForKey", handle, [ctypes.c_char_p]),
        ("BHClientDistributionForKey", handle, [ctypes.c_char_p]),
        ("BHClientScalarAdd", None, [handle, ctypes.c_int64]),
        ("BHClientScalarSet", None, [handle, ctypes.c_int64]),
        ("BHClientDistributionRecord", None, [handle, ctypes.c_double]),
        ("BHClientTimerStart", timer, []),
        ("BHClientTimerStopSeconds", None, [timer, handle]),
        ("BHClientTimerStopMilliseconds", None, [timer, handle]),
        ("BHClientGetStatus", ctypes.c_int, [ctypes.POINTER(ctypes.c_char_p)]),
    ):
        function = getattr(library, name)
        function.restype, function.argtypes = result, arguments
    return library


_library = _load()


class Status(enum.IntEnum):
    """Whether values recorded now are kept, and if not, why."""

    RECORDING = 0
    NO_KEY = 1
    NO_FOLDER = 2
    NOT_ALLOWED = 3
    NOT_IN_MEMORY = 4
    NO_SPACE = 5
    UNSUPPORTED = 6
    FAILED = 7
    FULL = 8
    KEY_REFUSED = 9
    REMOVED = 10
    CANNOT_ASK = 11


def status() -> tuple[Status, str]:
    """The status, and a sentence about it. Starts recording if necessary."""
    text = ctypes.c_char_p()
    number = _library.BHClientGetStatus(ctypes.byref(text))
    # A newer library may have more.
    known = Status(number) if number in list(Status) else Status.FAILED
    return known, (text.value or b"").decode()


def _key(key: str) -> bytes:
    if not isinstance(key, str):
        raise TypeError("a key is a str")
    encoded = key.encode()
    if not encoded:
        raise ValueError("a key is empty")
    if len(encoded) > _LONGEST_KEY:
        raise ValueError(f"a key of {len(encoded)} bytes: at most {_LONGEST_KEY}")
    if any(byte < 32 or byte == 127 for byte in encoded):
        raise ValueError(f"a key with control characters: {key!r}")
    return encoded


def _integer(number: typing.SupportsIndex) -> int:
    value = operator.index(number)
    if not -(2**63) <= value < 2**63:
        raise OverflowError("a number beyond 64 bits")
    return value


class Scalar:
    """A number per UTC day."""

    __slots__ = ("_handle", "key")

    def __init__(self, key: str) -> None:
        self.key = key
        self._handle = _library.BHClientScalarForKey(_key(key))

    def __reduce__(self) -> tuple[typing.Any, ...]:
        return type(self), (self.key,)  # the handle is an address in this process

    def add(self, amount: typing.SupportsIndex = 1) -> None:
        """Adds to today's value, which starts at 0."""
        _library.BHClientScalarAdd(self._handle, _integer(amount))

    def set(self, value: typing.SupportsIndex) -> None:
        """Replaces today's value.

        What other processes have added since the last fold without setting it comes on top.
        """
        _library.BHClientScalarSet(self._handle, _integer(value))


class Distribution:
    """A series of measurements."""

    __slots__ = ("_handle", "key")

    def __init__(self, key: str) -> None:
        self.key = key
        self._handle = _library.BHClientDistributionForKey(_key(key))

    def __reduce__(self) -> tuple[typing.Any, ...]:
        return type(self), (self.key,)  # the handle is an address in this process

    def record(self, value: float) -> None:
        """Appends a measurement."""
        try:
            _library.BHClientDistributionRecord(self._handle, value)
            return
        except ctypes.ArgumentError:
            pass
        math.ldexp(value, 0)  # raises the TypeError or OverflowError that ctypes hid

    def timer(self, *, milliseconds: bool = False) -> Timer:
        """A timer that records into this distribution."""
        return Timer(self, milliseconds=milliseconds)


class Timer:
    """Measures how long a block or a function takes, on the monotonic clock, in seconds or
    milliseconds. A block that raises is recorded too.

        with distribution.timer():
            ...

        @distribution.timer()
        def work(): ...

    A timer measures one block at a time: make one for each block. It measures any number of calls
    of a function, or of a coroutine until it returns. It refuses generator functions. Of a function
    that returns a generator, or another object that works later, it measures only the call.
    """

    __slots__ = ("_distribution", "_milliseconds", "_started")

    def __init__(self, distribution: Distribution, *, milliseconds: bool = False) -> None:
        self._distribution = distribution
        self._milliseconds = milliseconds
        self._started: typing.Any = None

    def __enter__(self) -> Timer:
        if self._started is not None:
            raise RuntimeError("a timer measures one block at a time: make one for each block")
        self._started = _library.BHClientTimerStart()
        return self

    def __exit__(
        self,
        kind: type[BaseException] | None,
        error: BaseException | None,
        traceback: TracebackType | None,
    ) -> None:
        started, self._started = self._started, None
        self._record(started)

    def __reduce__(self) -> tuple[typing.Any, ...]:
        if self._started is not None:
            raise TypeError("a timer cannot be pickled or copied while it measures")
        make = functools.partial(type(self), milliseconds=self._milliseconds)
        return make, (self._distribution,)

    def __call__(self, function: typing.Callable[..., typing.Any]) -> typing.Callable[..., typing.Any]:
        import inspect  # only here, since it takes milliseconds

        if inspect.isgeneratorfunction(function) or inspect.isasyncgenfunction(function):
            raise TypeError("a timer measures no generator: use it in a with statement")

        async def result_of(coroutine: typing.Awaitable[typing.Any]) -> typing.Any:
            with Timer(self._distribution, milliseconds=self._milliseconds):
                return await coroutine

        @functools.wraps(function)
        async def timed_coroutine(*arguments: typing.Any, **named: typing.Any) -> typing.Any:
            return await result_of(function(*arguments, **named))

        @functools.wraps(function)
        def timed(*arguments: typing.Any, **named: typing.Any) -> typing.Any:
            started = _library.BHClientTimerStart()
            try:
                result = function(*arguments, **named)
            except BaseException:
                self._record(started)
                raise
            # A decorator or an object with __call__ hides what kind of function is called. Other
            # objects that can be awaited stay as they are, since they may be more than that.
            if inspect.iscoroutine(result):
                return result_of(result)
            self._record(started)
            return result

        return timed_coroutine if inspect.iscoroutinefunction(function) else timed

    def _record(self, started: _Timer) -> None:
        stop = (
            _library.BHClientTimerStopMilliseconds
            if self._milliseconds
            else _library.BHClientTimerStopSeconds
        )
        stop(started, self._distribution._handle)
