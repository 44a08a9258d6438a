"""What is measured, against whom, and the bar each ratio is held to.

A Measurement has one cell a peer, ours first: a program, its arguments and the
key of the result line to read. Bars compare our median with a peer's (the best
of several): `limit` is what the ratio ours/peer must not exceed when small is
good, or must reach when big is good. A bar without peers holds our median itself.
"""

from dataclasses import dataclass, field


@dataclass(frozen=True)
class Cell:
    program: str
    arguments: tuple
    key: str
    scale: float = 1.0
    folder: object = None  # of the program; None for where all others are


@dataclass(frozen=True)
class Bar:
    peers: tuple
    limit: float
    text: str


@dataclass(frozen=True)
class Measurement:
    suite: str
    title: str
    unit: str
    cells: dict  # peer -> Cell
    bars: tuple = ()
    big_is_good: bool = False
    notes: dict = field(default_factory=dict)
    most_rounds: int = 0  # where one round is enough; 0 for as many as asked


OURS = "Pelorin"
ASIO = "Asio strand"
TBB = "oneTBB"
GLIB = "GLib"
SWAP = "mutex + deque swapped"
CLOSURE = "allocate, link, call, free, one thread"
MEASURED = "ours, with statistics"
MUTEX = "std::mutex lock + unlock"
BLOCK = "a normal block's run"
HOP = "from its end to the highest"
EPOLL = "raw socket, epoll"
BLOCKING = "raw socket, blocking"
BATCHED = "raw socket, batched"
SDBUS = "sd-bus"
ZEROMQ = "ZeroMQ"
RELAY = "raw relay"
RELAY_BATCHED = "raw relay, batched"
MOSQUITTO = "mosquitto"
MOSQUITTO_RESIDENT = "mosquitto, resident"
DBUS = "D-Bus PropertiesChanged"
LIBUV = "libuv"
LIBEVENT = "libevent"
ASIO_TIMERS = "Asio steady_timer"
TIMER_SERVICE = "our timer service"
GHASHTABLE = "GHashTable of GVariant"
GVARIANT = "GVariant a{sv}"
SPDLOG = "spdlog"
BOOST_LOG = "Boost.Log"
LOG4CPLUS = "log4cplus"
REMOTE = "ours, into another process"
EMPTY_LOOP = "the loop alone"
SODIUM = "libsodium"
OPENSSL = "OpenSSL"
BOOST = "Boost.Algorithm"
TABLE = "a table, in a loop"
PAIRS = "a table of pairs, in a loop"
MEMCPY = "memcpy of the bytes"
CIRCULAR = "boost::circular_buffer"
SPSC = "boost::lockfree::spsc_queue"
SNPRINTF = "snprintf, in a loop"
READ = "read, in a loop"
ICU = "ICU"
ICONV = "glibc iconv"


def dispatch():
    peers = (ASIO, TBB, GLIB)
    programs = {OURS: "dispatch_pelorin", ASIO: "dispatch_asio", TBB: "dispatch_tbb", GLIB: "dispatch_glib",
                SWAP: "dispatch_mutex"}

    def row(title, case, bars=(), unit="ns", scale=1.0, without=()):
        cells = {peer: Cell(program, (case,), "ns", scale) for peer, program in programs.items()
                 if peer not in without}
        first = Bar(tuple(peer for peer in peers if peer not in without), 1.0, "first")
        return Measurement("dispatch", title, unit, cells, (first, *bars))

    def ours(title, case, unit, limit):
        return Measurement("dispatch", title, unit, {OURS: Cell("dispatch_pelorin", (case,), unit)},
                           (Bar((), limit, f"at most {limit}"),), most_rounds=2)

    post = row("post + drain, 1 producer", "post_drain_1",
               (Bar((ASIO,), 1 / 4, "4 times faster than the strand"), Bar((CLOSURE,), 3.0, "at most 3 times")))
    post.cells[CLOSURE] = Cell("dispatch_mutex", ("bound",), "ns")
    post.cells[MEASURED] = Cell("dispatch_pelorin", ("measured",), "ns")
    yield post
    yield row("post + drain, 2 producers", "post_drain_2", (Bar((ASIO,), 1 / 2, "2 times faster than the strand"),))
    yield row("hop between two queues", "hop")
    yield row("1,000 queues round robin", "round_robin")
    yield row("10,000 queues, 1,000 each in order", "many_queues")
    # GLib's queues share a context for each thread: there is nothing to create.
    yield row("create + destroy a queue", "create", without=(GLIB,))
    yield Measurement("dispatch", "idle sync", "ns",
                      {OURS: Cell("dispatch_pelorin", ("sync",), "ns"),
                       MUTEX: Cell("dispatch_mutex", ("mutex",), "ns")},
                      (Bar((MUTEX,), 4.0, "at most 4 times"),))
    yield row("post from outside and wait, one core", "outside", unit="us", scale=1e-3)
    yield ours("an idle queue", "idle_queue", "bytes", 256)
    yield ours("longest wait while 1,000 blocks block", "blocked", "ms", 50)
    highest = {OURS: "p99_us", BLOCK: "block_us", HOP: "hop_us"}
    yield Measurement("dispatch", "highest block behind 100,000 normal ones, p99", "us",
                      {peer: Cell("priority_pelorin", (), key) for peer, key in highest.items()},
                      (Bar((BLOCK,), 1.1, "one block's run and a hop"),))


def vox():
    def cells(case, key, extra):
        programs = {OURS: ("vox_pelorin", case), EPOLL: ("vox_raw", case), **extra,
                    SDBUS: ("vox_sdbus", case), ZEROMQ: ("vox_zmq", case)}
        return {peer: Cell(program, (name,), key) for peer, (program, name) in programs.items()}

    raw = Bar((EPOLL,), 1.5, "at most 1.5 times")
    for size, name in (("small", "small dictionary"), ("large", "64 KiB echo")):
        for place, where in (("one_core", "one core"), ("two_cores", "two cores")):
            bars = (raw,) if place == "one_core" else ()
            if place == "one_core" and size == "small":
                bars += (Bar((SDBUS,), 1 / 2, "2 times faster"),)
            case = f"round_trip_{size}_{place}"
            yield Measurement("vox", f"round trip p50, {name}, {where}", "us",
                              cells(case, "p50_us", {BLOCKING: ("vox_raw", case + "_blocking")}), bars)
    yield Measurement("vox", "one way, small", "million/s",
                      cells("one_way_small", "million_per_s", {BATCHED: ("vox_raw", "one_way_small_batched")}),
                      (Bar((SDBUS,), 4.0, "at least 4 times"),), big_is_good=True)
    yield Measurement("vox", "one way, 64 KiB", "GB/s", cells("one_way_large", "gigabyte_per_s", {}),
                      big_is_good=True)


def fanout():
    programs = {OURS: "fanout_pelorin", RELAY: "fanout_raw", MOSQUITTO: "fanout_mosquitto",
                DBUS: "fanout_dbus"}
    for count in (1, 100, 1000):
        held = () if count == 1 else (Bar((RELAY,), 1.5, "at most 1.5 times"),
                                      Bar((MOSQUITTO,), 1.0, "ahead"), Bar((DBUS,), 1.0, "ahead"))
        yield Measurement("fanout", f"SET to the last of {count:,} watchers, p50", "us",
                          {peer: Cell(program, ("latency", str(count)), "p50_us")
                           for peer, program in programs.items()}, held)
    for count in (1, 100, 1000):
        held = () if count == 1 else (Bar((RELAY,), 1 / 1.5, "within 1.5 times"),
                                      Bar((MOSQUITTO,), 1.0, "ahead"), Bar((DBUS,), 1.0, "ahead"))
        yield Measurement("fanout", f"deliveries to {count:,} watchers", "million/s",
                          {**{peer: Cell(program, ("rate", str(count)), "million_per_s")
                              for peer, program in programs.items()},
                           RELAY_BATCHED: Cell("fanout_raw", ("rate", str(count), "batched"), "million_per_s")},
                          held, big_is_good=True)
    memory = {OURS: "rest_memory", MOSQUITTO_RESIDENT: "rest_memory_mosquitto"}
    for key, what in (("client", "a connected client"), ("property", "a property"),
                      ("watcher", "one more watcher of a property"), ("assertion", "an assertion and its first holder"),
                      ("holder", "one more holder of an assertion")):
        peers = memory if key in ("client", "property", "watcher") else {OURS: memory[OURS]}
        yield Measurement("fanout", f"memory of {what}", "bytes",
                          {peer: Cell(program, (), f"{key}_bytes") for peer, program in peers.items()})


def log():
    programs = {OURS: "log_pelorin", SPDLOG: "log_spdlog", BOOST_LOG: "log_boost", LOG4CPLUS: "log_log4cplus",
                REMOTE: "log_remote"}

    def cells(key, *arguments):
        return {peer: Cell(program, arguments, key) for peer, program in programs.items()}

    def threads(count):
        return "1 thread" if count == 1 else f"{count} threads"

    held = {"p50": (Bar((SPDLOG,), 1 / 2, "at most half"),), "mean": (Bar((SPDLOG,), 1 / 3, "at most a third"),)}
    for pace, count in (("paced", 1), ("paced", 2), ("brisk", 1), ("flooded", 1), ("flooded", 2)):
        bars = held if pace != "flooded" and count == 1 else {}
        for figure in ("p50", "p99", "mean"):
            yield Measurement("log", f"log call {figure}, {threads(count)}, {pace}", "ns",
                              cells(f"{figure}_ns", pace, str(count)), bars.get(figure, ()))
    for count, factor in ((1, 1.5), (2, 3.0)):
        yield Measurement("log", f"to a file, {threads(count)}", "million/s",
                          cells("million_per_s", "flooded", str(count)),
                          (Bar((SPDLOG,), factor, f"at least {factor:g} times"),), big_is_good=True)
    yield Measurement("log", "disabled message", "ns",
                      {**cells("ns", "disabled"), EMPTY_LOOP: Cell("log_pelorin", ("empty",), "ns")},
                      (Bar((), 0.6, "under 0.6"),))
    yield Measurement("log", "memory of a waiting message", "bytes", cells("bytes", "memory"))


def timers():
    programs = {OURS: "timers_pelorin", LIBUV: "timers_libuv", LIBEVENT: "timers_libevent", ASIO_TIMERS: "timers_asio",
                GLIB: "timers_glib"}

    def cells(key, *arguments):
        return {peer: Cell(program, arguments, key) for peer, program in programs.items()}

    first = (Bar((LIBUV, LIBEVENT, ASIO_TIMERS, GLIB), 1.0, "first"),)
    for count in ("0", "100000"):
        others = f"{int(count):,} waiting"
        service = {TIMER_SERVICE: Cell("timers_pelorin", ("service", count), "ns")}
        yield Measurement("timers", f"create + cancel, {others}", "ns", {**cells("ns", "life", count), **service}, first)
        yield Measurement("timers", f"arm + disarm, {others}", "ns", cells("ns", "arm_disarm", count), first)
    yield Measurement("timers", "fire 100,000", "ns", cells("ns", "fire"), first)
    yield Measurement("timers", "drift of 10 ms in 60 s", "us", cells("us", "drift"),
                      (Bar((), 1000.0, "under 1 ms"),), most_rounds=1)


def bytes_():
    def cells(key, size, programs):
        return {peer: Cell(f"bytes_{program}", (case, str(size)), key) for peer, (program, case) in programs.items()}

    for case, what in (("to_hex", "bin to hex"), ("from_hex", "hex to bin")):
        programs = {OURS: ("pelorin", case), SODIUM: ("sodium", case), OPENSSL: ("openssl", case),
                    BOOST: ("boost", case), TABLE: ("loops", case)}
        if case == "to_hex":
            programs[PAIRS] = ("loops", "to_hex_pairs")
        rivals = tuple(programs)[1:]
        for size, named in ((64, "64 B"), (4096, "4 KiB"), (1 << 20, "1 MiB")):
            bars = (Bar(rivals, 1.0, "ahead of each"),)
            if size == 4096:
                bars += (Bar((PAIRS,), 2.0, "at least 2 times") if case == "to_hex" else
                         Bar((TABLE,), 3.0, "at least 3 times"),)
            yield Measurement("bytes", f"{what}, {named}", "GB/s",
                              cells("gigabyte_per_s", size, {**programs, MEMCPY: ("loops", "copy")}), bars,
                              big_is_good=True)
    for size, named in ((16, "16 B"), (256, "256 B"), (4096, "4 KiB")):
        yield Measurement("bytes", f"ring buffer, insert + extract {named}", "ns",
                          cells("ns", size, {OURS: ("pelorin", "ring"), CIRCULAR: ("boost", "ring"),
                                             SPSC: ("boost", "ring_queue")}),
                          (Bar((CIRCULAR, SPSC), 1.0, "ahead of each"),))
    yield Measurement("bytes", "dump, a line of 32 bytes", "ns",
                      cells("ns", 0, {OURS: ("pelorin", "dump"), SNPRINTF: ("loops", "dump")}),
                      (Bar((SNPRINTF,), 1.0, "ahead"),))
    for case, what in ((0, "timed transport, bursts of 128 KiB"), (1, "timed transport, its reader checks each byte")):
        yield Measurement("bytes", what, "MB/s",
                          cells("megabyte_per_s", case, {OURS: ("pelorin", "line"), READ: ("loops", "line")}),
                          (Bar((READ,), 1.0, "ahead"),), big_is_good=True)


def text():
    def cells(case, letters, size, *peers):
        programs = {OURS: "text_pelorin", ICU: "text_icu", ICONV: "text_iconv", TABLE: "text_loops"}
        return {peer: Cell(programs[peer], (case, letters, size), "ns") for peer in (OURS, *peers)}

    def measurement(what, letters, size, measured, bars=()):
        named = {"message": "a message of 160", "mebibyte": "1 MiB"}[size]
        return Measurement("text", f"{what}, {letters}, {named}", "ns a character", measured, bars)

    for case, what, times in (("to_septets", "UTF-8 to septets", 3.0), ("from_septets", "septets to UTF-8", 2.0)):
        for letters in ("ascii", "european", "extension"):
            for size in ("message", "mebibyte"):
                yield measurement(what, letters, size, cells(case, letters, size, ICU, TABLE),
                                  (Bar((ICU,), times, f"at most {times:g} times"),))
        yield measurement(f"{what}, a converter each", "european", "message",
                          cells(f"{case}_built", "european", "message"))
    for case, what in (("to_ucs2", "UTF-8 to UCS-2"), ("from_ucs2", "UCS-2 to UTF-8")):
        for letters in ("ascii", "european", "korean", "emoji"):
            for size, bar in (("message", Bar((ICONV,), 1.0, "ahead")),
                              ("mebibyte", Bar((ICONV,), 1 / 3, "3 times faster"))):
                yield measurement(what, letters, size, cells(case, letters, size, ICU, ICONV, TABLE), (bar,))
    for size in ("message", "mebibyte"):
        yield measurement("EUC-KR to UCS-2", "korean", size, cells("from_euc_kr", "korean", size, ICU, ICONV, TABLE),
                          (Bar((ICU, ICONV), 1.0, "ahead of each"),))


def values():
    def measurement(case, size, what, variant=True):
        cells = {OURS: Cell("values_pelorin", (case, str(size)), "ns"),
                 GHASHTABLE: Cell("values_glib", ("table", case, str(size)), "ns")}
        if variant:
            cells[GVARIANT] = Cell("values_glib", ("variant", case, str(size)), "ns")
        return Measurement("values", what, "ns each", cells, (Bar(tuple(cells)[1:], 1.0, "ahead"),))

    for size, named in ((10, "10 entries"), (1000, "1,000 entries")):
        yield measurement("build", size, f"dictionary of {named}, made and freed")
        # A look-up in a GVariant walks, which takes for ever in a large one.
        yield measurement("find", size, f"dictionary of {named}, found by text and read", variant=size == 10)
        yield measurement("find_kept", size, f"dictionary of {named}, found by a kept key and read",
                          variant=size == 10)
        yield measurement("walk", size, f"dictionary of {named}, walked")
    yield measurement("number", 1, "number made, read and freed")
    yield measurement("read", 1000, "number read")


SUITES = {"dispatch": dispatch, "vox": vox, "fanout": fanout, "log": log, "timers": timers, "bytes": bytes_,
          "text": text, "values": values}
