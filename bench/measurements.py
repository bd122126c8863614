"""What is measured: each function makes tables. ALL names them in the order in which they are run."""
import json
import os
import statistics
import subprocess
import threading
import time

from systems import Floor, Library, Scratch, systems
from tables import as_figure, table

KINDS = {"id": "an identifier", "values": "two 64-bit values", "string": "a string of 32 bytes",
         "formatted": "a text of two integers", "data": "a block of 64 bytes"}
RECORD_BYTES = 52  # of the kind "values" in the library and the floor
MIB = 1 << 20


def in_turns(rounds, runs):
    """Calls every function of `runs` once in each round; the results of each by its key."""
    results = {key: [] for key in runs}
    for number in range(rounds):
        keys = list(runs)
        for key in keys[number % len(keys):] + keys[:number % len(keys)]:
            results[key].append(runs[key]())
    return results


def median(results, field):
    return statistics.median(result[field] for result in results)


def ratio(results, base, field):
    """Median of the ratios within the rounds."""
    return statistics.median(one[field] / other[field] for one, other in zip(results, base))


def closely(rounds, compared, *options):
    """The floor and the library, in many short turns: what the machine does meanwhile is in no ratio for long."""
    return in_turns(4 * rounds, {system.name: lambda system=system: system.measure(*options)
                                 for system in compared if system.name in ("floor", "libqn_tr")})


class Started:
    """The systems, ready for their producers."""

    def __init__(self, of, subbuffer=None):
        self.systems, self.subbuffer = of, subbuffer

    def __enter__(self):
        for system in self.systems:
            system.start(self.subbuffer)
        return self.systems

    def __exit__(self, *_):
        for system in self.systems:
            system.stop()


def one_thread(build, rounds):
    """What a record costs its writer."""
    costs, tails = [], []
    with Started(systems(build)) as compared:
        for kind, what in KINDS.items():
            timed = in_turns(rounds, {system.name: lambda system=system: system.measure("--kind", kind)
                                      for system in compared})
            single = in_turns(rounds, {system.name: lambda system=system: system.measure("--kind", kind, "--latency")
                                       for system in compared})
            own = closely(rounds, compared, "--kind", kind, "--seconds", 0.1)
            own_single = closely(rounds, compared, "--kind", kind, "--seconds", 0.1, "--latency")
            for name in timed:
                cost, tail = (own, own_single) if name in own else (timed, single)
                costs.append([what, name, median(cost[name], "ns"), ratio(cost[name], cost["floor"], "ns"),
                              ratio(timed[name], timed["libqn_tr"], "ns")])
                tails.append([what, name] + [median(tail[name], p) for p in ("p50", "p99", "p99.9", "p99.99")] +
                             [ratio(tail[name], tail["floor"], "p99.9")])
    yield table("one_thread", "One thread", ["record", "system", "ns", "of the floor", "of libqn_tr"], costs,
                "The process has a second thread, which does nothing: locks cost more then. The floor is a recursive "
                "mutex, the counter and a copy of as many bytes into a mapped ring; for the text, with its `snprintf`.")
    yield table("latency", "One record at a time",
                ["record", "system", "p50 ns", "p99 ns", "p99.9 ns", "p99.99 ns", "p99.9 of the floor's"], tails,
                "Two readings of the counter are part of each figure. The counter may advance in steps; see p50.")


def alone(build, rounds):
    """A process of one thread."""
    compared = [Floor(build), Library(build)]
    rows = []
    for kind, what in KINDS.items():
        timed = closely(rounds, compared, "--kind", kind, "--idle-threads", 0, "--records", 2_000_000)
        rows.append([what, median(timed["floor"], "ns"), median(timed["libqn_tr"], "ns"),
                     ratio(timed["libqn_tr"], timed["floor"], "ns")])
    yield table("alone", "A process of one thread", ["record", "floor ns", "libqn_tr ns", "of the floor"], rows)


def all_in(build, rounds):
    """CPU time of everybody until a record survives SIGKILL, and what did survive."""
    records = 200_000

    def one(system, count):
        # Whatever an earlier run left in a ring or in a snapshot would be counted again: each run has daemons of its own.
        with Started([system], "16M"), Scratch() as folder:
            before = system.daemon_seconds()
            result = system.run(folder, "--records", count, "--warm-up", 0, "--idle-threads", 0, "--die",
                                "--ring", 64 * MIB)
            result["all_seconds"] = 1e-9 * count * result["cpu_ns"] + system.daemon_seconds() - before
            result["survived"] = system.survivors(folder)
            return result

    rows = []
    for system in systems(build)[1:]:
        results = in_turns(rounds, {"all": lambda: one(system, records), "none": lambda: one(system, 1)})
        started = median(results["none"], "all_seconds")
        rows.append([system.name, median(results["all"], "ns"),
                     1e9 * (median(results["all"], "all_seconds") - started) / records,
                     records - min(result["survived"] for result in results["all"])])
    yield table("all_in", "All in", ["system", "writer ns", "CPU ns, everybody's", "records lost"], rows,
                f"{as_figure(records)} records of two 64-bit values, then SIGKILL at once; what cannot be read then is "
                "lost. CPU time is that of all threads while records are written, and of daemons, less theirs in a run "
                "with one record.")


def contention(build, rounds):
    """Several threads on one file, and on one each."""
    handoff = statistics.median(float(subprocess.check_output([build / "bench/handoff"])) for _ in range(3))
    rows, tails = [], []
    with Started(systems(build)) as compared:
        for threads in (2, 4):
            # In one second the scheduler may give four threads on two processors rather different shares.
            timed = in_turns(rounds, {system.name: lambda system=system: fairness(system.measure(
                "--threads", threads, "--seconds", 3)) for system in compared})
            single = closely(rounds, compared, "--threads", threads, "--latency")
            for name in timed:
                rows.append([threads, name, median(timed[name], "throughput"),
                             ratio(timed[name], timed["floor"], "throughput"), median(timed[name], "fair")])
            for name in single:
                tails.append([threads, name] + [median(single[name], p) for p in ("p50", "p99", "p99.9")] +
                             [ratio(single[name], single["floor"], "p99.9")])
    yield table("contention", "Several threads, one file",
                ["threads", "system", "records/µs", "of the floor", "slowest thread of the fastest"], rows,
                f"Handing a cache line to the other CPU took {handoff:.0f} ns in this run.")
    yield table("contention_latency", "Several threads, one record at a time",
                ["threads", "system", "p50 ns", "p99 ns", "p99.9 ns", "p99.9 of the floor's"], tails)
    rows = []
    for pause in (100, 10_000):
        timed = in_turns(rounds, {system.name: lambda system=system: system.measure("--visit", pause, "--seconds", 0.5)
                                  for system in (Floor(build), Library(build))})
        rows += [[f"{pause / 1000:g} ms", name, median(timed[name], "ns"), ratio(timed[name], timed["floor"], "ns")]
                 for name in timed]
    yield table("visits", "A busy thread, and one that writes a record now and then",
                ["every", "system", "ns", "of the floor"], rows)
    timed = in_turns(4 * rounds, {(system.name, threads): lambda system=system, threads=threads: fairness(
        system.measure("--threads", threads, "--files", 2, "--seconds", 0.3))
        for system in (Floor(build), Library(build)) for threads in (1, 2)})
    rows = [[name, median(timed[name, 1], "throughput"), median(timed[name, 2], "throughput"),
             ratio(timed[name, 2], timed[name, 1], "throughput")] for name in ("floor", "libqn_tr")]
    yield table("two_files", "Two threads, a file each", ["system", "records/µs of one thread", "of two", "ratio"], rows,
                "What is missing of 2 with the floor, whose rings share nothing at all, is the machine's.")


def fairness(result):
    of_threads = result["records_of_threads"]
    return result | {"throughput": 1000 * len(of_threads) / result["ns"], "fair": min(of_threads) / max(of_threads)}


def disabled(build, rounds):
    """A trace point whose category is off."""
    with Started([each for each in systems(build) if each.name in ("floor", "libqn_tr", "LTTng-UST")]) as compared:
        timed = in_turns(rounds, {system.name: lambda system=system: system.measure("--kind", "disabled")
                                  for system in compared})
    loop = timed["floor"]
    rows = [[name, statistics.median(one["ns"] - empty["ns"] for one, empty in zip(timed[name], loop))]
            for name in timed if name != "floor"]
    yield table("disabled", "A trace point that is off", ["system", "ns more than the empty loop"], rows)


def cliffs(build, rounds):
    """What must not make a record dearer."""
    compared = [Floor(build), Library(build)]

    def passes(ring):
        return 2 * ring // RECORD_BYTES

    rows = []
    for ring in (64 << 10, MIB, 16 * MIB, 256 * MIB, 1024 * MIB):
        timed = in_turns(rounds, {system.name: lambda system=system: system.measure(
            "--ring", ring, "--warm-up", max(passes(ring), 100_000), "--records", max(passes(ring), 4_000_000))
            for system in compared})
        rows.append([f"file of {ring // 1024} KiB", median(timed["floor"], "ns"), median(timed["libqn_tr"], "ns"),
                     ratio(timed["libqn_tr"], timed["floor"], "ns")])
    library = compared[1]
    for what, plural in (("--anchors", "other trace files"), ("--components", "other components"),
                         ("--specifications", "level specifications")):
        counts = (1, 30, 1000)
        timed = in_turns(rounds, {count: lambda count=count: library.measure(what, count) for count in counts})
        for count in counts:
            rows.append([f"{count} {plural}", None, median(timed[count], "ns"), None])
    yield table("cliffs", "What else there is", ["with", "floor ns", "libqn_tr ns", "of the floor"], rows)

    ring = 64 * MIB
    timed = in_turns(4 * rounds, {(name, system.name): lambda system=system, warm_up=warm_up: system.measure(
        "--ring", ring, "--warm-up", warm_up, "--records", ring // (RECORD_BYTES + 8), "--latency")
        for system in compared for name, warm_up in (("first", 0), ("later", passes(ring)))})
    rows = [[name, system] + [median(results, p) for p in ("p50", "p99", "p99.9", "p99.99")] +
            [ratio(results, timed["later", system], "p99.9")] for (name, system), results in timed.items()]
    yield table("first_pass", "The first pass over a file of 64 MiB, and later ones",
                ["pass", "system", "p50 ns", "p99 ns", "p99.9 ns", "p99.99 ns", "p99.9 of later ones'"], rows)


def write_back(build, rounds):
    """A slow writer while the kernel writes its file to the disk."""
    compared = [Floor(build), Library(build)]

    def measured(system, synced):
        with Scratch() as folder:
            over = threading.Event()

            def sync():
                while not over.wait(0.05):
                    for file in folder.iterdir():
                        descriptor = os.open(file, os.O_RDONLY)
                        os.fsync(descriptor)
                        os.close(descriptor)

            thread = threading.Thread(target=sync) if synced else None
            if thread:
                thread.start()
            # Not the first pass over the file: what that costs is another question.
            result = system.run(folder, "--ring", 16 * MIB, "--warm-up", 16 * MIB // RECORD_BYTES, "--burst", 10,
                                "--pause", 100, "--latency", "--seconds", 2)
            over.set()
            if thread:
                thread.join()
            return result

    results = in_turns(rounds, {(system.name, synced): lambda system=system, synced=synced: measured(system, synced)
                                for system in compared for synced in (False, True)})
    rows = [["written back" if synced else "left alone", name] +
            [median(results[name, synced], p) for p in ("p50", "p99", "p99.9", "p99.99")]
            for name, synced in results]
    yield table("write_back", "A slow writer while its file is written back",
                ["the file is", "system", "p50 ns", "p99 ns", "p99.9 ns", "p99.99 ns"], rows,
                "Ten records of two 64-bit values every 100 µs; the file is synced every 50 ms.")


def page_sets(build, rounds):
    """Page sets whose pages are copied while records are written."""
    library = Library(build)
    page_bytes, pages, warm_up = 256 * 1024, 32, 20_000
    burst = page_bytes // RECORD_BYTES // 4

    def run(pause, seconds, *options):
        with Scratch() as folder:
            result = library.run(folder, "--ring", pages * page_bytes, "--warm-up", warm_up, "--burst", burst,
                                 "--pause", pause, "--seconds", seconds, *options)
            if "--pages" in options:
                result["lost"] = result["records"] + warm_up - library.survivors(folder)
            return result

    rows = []
    for pause, seconds in ((500, 0.5), (5_000, 2)):  # a longer pause, longer until as many pages are full
        timed = in_turns(4 * rounds, {"single file": lambda: run(pause, seconds),
                                      "page set": lambda: run(pause, seconds, "--pages", pages)})
        single = in_turns(rounds, {"single file": lambda: run(pause, 2, "--latency"),
                                   "page set": lambda: run(pause, 2, "--pages", pages, "--latency")})
        for name in timed:
            lost = max((result["lost"] for result in timed[name] + single[name] if "lost" in result), default=None)
            rows.append([f"a quarter of a page, {pause / 1000:g} ms", name, median(timed[name], "ns"),
                         ratio(timed[name], timed["single file"], "ns"), median(single[name], "p99.9"),
                         median(single[name], "p99.99"), median(single[name], "longest") / 1000, lost])
    with Scratch() as folder:
        page_us = statistics.median(write_page(folder / f"page{i}", page_bytes) for i in range(20))
    yield table("page_sets", "Page sets",
                ["records, pause", "trace", "ns", "of the single file", "p99.9 ns", "p99.99 ns", "longest µs", "lost"],
                rows, f"{pages} pages of {page_bytes // 1024} KiB, copied while records are written. One record in "
                f"{page_bytes // RECORD_BYTES} goes on to the next page. Writing one page to a file of the same file "
                f"system takes {page_us:.0f} µs. Nothing is lost when the live pages and the copies hold all records.")


def write_page(name, size):
    page = bytes(size)
    begin = time.perf_counter()
    with open(name, "wb", buffering=0) as file:
        file.write(page)
    return 1e6 * (time.perf_counter() - begin)


def steps_of(command, rounds):
    """The medians of a program that prints a line of JSON for each step."""
    steps = {}
    for _ in range(rounds):
        with Scratch() as folder:
            for line in subprocess.check_output([*map(str, command), str(folder)]).splitlines():
                step = json.loads(line)
                steps.setdefault(step.pop("step"), []).append(step)
    return {name: {field: median(results, field) for field in results[0]} for name, results in steps.items()}


def beside_work(name, title, steps, work):
    """A table of steps; those that tell their "work_ms" are set beside it."""
    rows = [[step, of["ms"], of.get("work_ms"), of["ms"] / of["work_ms"] if "work_ms" in of else None]
            for step, of in steps.items()]
    return table(name, title, ["step", "ms", "the work itself ms", "ratio"], rows, f"The work itself: {work}")


def control_path(build, rounds):
    """Registering and specifying."""
    yield beside_work("control_path", "Control", steps_of([build / "bench/control_path"], min(rounds, 3)),
                      "in each call, each pattern that may concern it is compiled once and matched with the names.")


def start_stop(build, rounds):
    """A trace of 1 GiB."""
    steps = steps_of([build / "bench/start_stop"], min(rounds, 3))
    steps["start a new trace"]["work_ms"] = steps["write the bytes"]["ms"]
    steps["start the full trace again"]["work_ms"] = steps["map and read the bytes"]["ms"]
    yield beside_work("start_stop", "Starting and stopping a trace of 1 GiB", steps,
                      "1 GiB is written to a new file and synced, or mapped and read, a word of each cache line.")


def instructions(build, _rounds):
    """Instructions of a record: the same on every machine with the same compiler and C library."""
    rows = []
    for kind, what in KINDS.items():
        counted = {system.name: counted_instructions(system, kind) for system in (Floor(build), Library(build))}
        rows.append([what, counted["floor"], counted["libqn_tr"]])
    yield table("instructions", "Instructions of a record", ["record", "floor", "libqn_tr"], rows,
                "Counted by callgrind, in a process with two threads: the difference of two runs.")


def counted_instructions(system, kind):
    few, many = 10_000, 110_000

    def count(records):
        with Scratch() as folder:
            log = folder / "callgrind.log"
            system.run(folder, "--kind", kind, "--records", records, "--warm-up", 5000, "--ring", 65536, wrapper=(
                "valgrind", "--tool=callgrind", "--callgrind-out-file=/dev/null", f"--log-file={log}"))
            collected = [line for line in log.read_text().splitlines() if "Collected" in line]
            return int(collected[-1].split(":")[1])

    return (count(many) - count(few)) / (many - few)


ALL = {function.__name__: function for function in (
    one_thread, alone, all_in, contention, disabled, cliffs, write_back, page_sets, control_path, start_stop,
    instructions)}


def run(name, build, rounds):
    return ALL[name](build.resolve(), rounds)
