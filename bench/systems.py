"""The systems that are compared: how each one's producer is started, and how its records are counted afterwards."""
import json
import os
import pathlib
import re
import shutil
import signal
import subprocess
import tempfile
import time

TICKS = os.sysconf("SC_CLK_TCK")


class Scratch:
    """A folder for one run, gone at its end."""

    def __enter__(self):
        self.path = pathlib.Path(tempfile.mkdtemp(prefix="qn_tr_bench."))
        return self.path

    def __exit__(self, *_):
        shutil.rmtree(self.path, ignore_errors=True)


class System:
    """A producer, with the options that make it this system."""

    def __init__(self, build, name, producer, *options):
        self.name = name
        self.build = build
        self.command = [build / "bench" / f"producer_{producer}"]
        self.options = list(options)

    def there(self):
        return self.command[0].exists()

    environment = None  # of the producer: this program's

    def start(self, subbuffer=None):
        """What has to be there before the producer, daemons for instance."""

    def stop(self):
        pass

    def daemon_seconds(self):
        return 0.0

    def run(self, folder, *options, wrapper=()):
        """Runs the producer; its result."""
        command = [*map(str, wrapper), *map(str, self.command), str(folder), *self.options, *map(str, options)]
        ended = subprocess.run(command, env=self.environment, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL,
                               check=False)
        if ended.returncode not in (0, -signal.SIGKILL):
            raise RuntimeError(f"{' '.join(command)} ended with {ended.returncode}")
        return json.loads(ended.stdout)

    def measure(self, *options):
        with Scratch() as folder:
            return self.run(folder, *options)

    def survivors(self, folder):
        """How many of the records of `--kind values` can be read after the producer's death."""
        raise NotImplementedError


class Floor(System):
    def __init__(self, build):
        super().__init__(build, "floor", "floor")


class Library(System):
    def __init__(self, build):
        super().__init__(build, "libqn_tr", "library")

    def survivors(self, folder):
        command = [self.build / "tools/qntrace/qntrace", "stats", "--json", "--comp", "BNCH", folder]
        return json.loads(subprocess.check_output(command).splitlines()[0])["records"]


class TextLogger(System):
    def survivors(self, folder):
        pattern = re.compile(rb"\b7 \d+ 42$")
        return sum(1 for file in folder.iterdir() if not file.is_symlink()
                   for line in file.open("rb") if pattern.search(line.rstrip(b"\n")))


class Lttng(System):
    """LTTng-UST in overwrite mode: a ring in shared memory for each CPU; a snapshot of it is taken on demand."""
    events = ("qn_bench:id", "qn_bench:values", "qn_bench:string", "qn_bench:data", "lttng_ust_tracef:*")

    def __init__(self, build):
        super().__init__(build, "LTTng-UST", "lttng")

    def there(self):
        return super().there() and shutil.which("lttng-sessiond") is not None

    def start(self, subbuffer=None):
        self.home = tempfile.mkdtemp(prefix="qn_tr_bench.lttng.")
        self.environment = os.environ | {"LTTNG_HOME": self.home}
        self.session_daemon = subprocess.Popen(["lttng-sessiond", "--no-kernel"], env=self.environment,
                                               stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        deadline = time.monotonic() + 20
        while self.lttng("list", check=False) != 0:
            if time.monotonic() > deadline:
                raise RuntimeError("lttng-sessiond does not answer")
            time.sleep(0.1)
        self.lttng("create", "bench", "--snapshot", "--output", self.home + "/snapshot")
        self.lttng("enable-channel", "-u", "ring", "--overwrite", "--subbuf-size", subbuffer or "256K",
                   "--num-subbuf", "4")
        for event in self.events:
            self.lttng("enable-event", "-u", "-c", "ring", event)
        self.lttng("start")

    def lttng(self, *arguments, check=True):
        return subprocess.run(["lttng", *arguments], env=self.environment, check=check,
                              stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL).returncode

    def stop(self):
        self.lttng("destroy", "bench", check=False)
        self.session_daemon.terminate()
        self.session_daemon.wait()
        shutil.rmtree(self.home, ignore_errors=True)

    def daemon_seconds(self):
        """CPU time of the session daemon and of the consumer that it started."""
        seconds = 0.0
        for process in pathlib.Path("/proc").glob("[0-9]*/stat"):
            try:
                name, fields = re.match(r"\d+ \((.*)\) (.*)", process.read_text()).groups()
            except (OSError, AttributeError):
                continue
            fields = fields.split()
            if name.startswith("lttng-") and str(self.session_daemon.pid) in (process.parent.name, fields[1]):
                seconds += (int(fields[11]) + int(fields[12])) / TICKS
        return seconds

    def survivors(self, folder):
        self.lttng("snapshot", "record")
        printed = subprocess.run(["babeltrace2", self.home + "/snapshot"], stdout=subprocess.PIPE,
                                 stderr=subprocess.DEVNULL, check=False).stdout
        return printed.count(b"qn_bench:values:")


def systems(build):
    """All that are built and installed here, the floor and the library first."""
    all_of_them = [Floor(build), Library(build), Lttng(build),
                   TextLogger(build, "spdlog", "spdlog", "--sink", "file"),
                   TextLogger(build, "spdlog, flushing", "spdlog", "--sink", "flush"),
                   TextLogger(build, "spdlog, asynchronous", "spdlog", "--sink", "async"),
                   TextLogger(build, "glog", "glog")]
    return [each for each in all_of_them if each.there()]
