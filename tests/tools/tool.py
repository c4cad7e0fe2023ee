"""What the tests of the tool share: running it and the handset it simulates, and a folder for files."""
import contextlib
import json
import os
import subprocess
import sys
import tempfile
import time
import unittest

KRAL = None  # the tool; set before any test runs
PATIENCE = 30  # seconds; far more than anything here takes
EXTRA_ENVIRONMENT = {}  # of every process that a test starts


def clean_environment(ports):
    """An environment in which exactly these COM numbers have devices of ours."""
    env = {name: value for name, value in os.environ.items() if not name.startswith("KRAL_")}
    env["KRAL_PORT_DIR"] = "/nonexistent"
    env["XDG_CONFIG_HOME"] = "/nonexistent"  # no settings of whoever runs the tests
    env.update(EXTRA_ENVIRONMENT)
    env.update({f"KRAL_COM{number}": device for number, device in ports.items()})
    return env


def start(*words, ports=None, before=(), stdin=subprocess.DEVNULL):
    return subprocess.Popen([*before, KRAL, *words], env=clean_environment(ports or {}), stdin=stdin,
                            stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)


def run(*words, ports=None, before=()):
    process = start(*words, ports=ports, before=before)
    process.out, process.err = process.communicate(timeout=PATIENCE)
    return process


def wait_until(condition):
    deadline = time.monotonic() + PATIENCE
    while time.monotonic() < deadline and not condition():
        time.sleep(0.01)


def holds(file, text):
    """Whether a log that is being written holds a text by now."""
    with contextlib.suppress(FileNotFoundError), open(file, encoding="latin-1") as log:
        return text in log.read()
    return False


@contextlib.contextmanager
def handset(*options):
    """A simulated handset; gives its process, whose `device` is where it answers."""
    sim = start("sim", *options)
    try:
        sim.device = sim.stdout.readline().strip()
        if not os.path.exists(sim.device):
            raise AssertionError(f"kral sim {options}: no device: {sim.communicate()[1]}")
        yield sim
    finally:
        if sim.poll() is None:
            sim.terminate()
        sim.communicate(timeout=PATIENCE)


@contextlib.contextmanager
def fixture(count, folder, *options):
    """So many simulated handsets, on COM1 and up; gives the process, which takes commands, and the ports."""
    sim = start("sim", "--json", "--count", str(count), "--ports", folder, "--script", "-", *options,
                stdin=subprocess.PIPE)
    try:
        sim.handsets = json.loads(sim.stdout.readline())["handsets"]
        yield sim, {number: os.path.join(folder, f"com{number}") for number in range(1, count + 1)}
    finally:
        sim.terminate()
        sim.communicate(timeout=PATIENCE)


def command(sim, line):
    """Has a fixture do something, and waits until it has."""
    sim.stdin.write(line + "\n")
    sim.stdin.flush()
    done = json.loads(sim.stdout.readline())
    if done["command"] != line:
        raise AssertionError(f"{line}: {done}")


class ToolTest(unittest.TestCase):
    """A folder for files, and COM ports: one handset is on COM7 as long as a test is inside of `handset`."""

    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.folder = folder.name
        self.ports = {}

    def path(self, *names):
        return os.path.join(self.folder, *names)

    def add(self, name, content):
        os.makedirs(os.path.dirname(self.path(name)), exist_ok=True)
        with open(self.path(name), "wb") as file:
            file.write(content)
        return self.path(name)

    def content(self, *names):
        with open(self.path(*names), "rb") as file:
            return file.read()

    @contextlib.contextmanager
    def handset(self, *options):
        with handset(*options) as sim:
            self.ports = {7: sim.device}
            yield sim

    @contextlib.contextmanager
    def plugged_handset(self, *options):
        """One that can be unplugged, under a name that goes with it: the device's own is given to the next terminal."""
        link = self.path("plug")
        with handset(*options, "--link", link) as sim:
            self.ports = {7: link}
            yield sim

    def unplug(self, sim):
        os.remove(self.path("plug"))
        sim.kill()

    def expect(self, code, *words):
        """Runs the tool and checks its exit code."""
        done = run(*words, ports=self.ports)
        self.assertEqual(done.returncode, code, f"kral {' '.join(words)}\n{done.out}{done.err}")
        return done

    def expect_json(self, code, *words):
        """The same with --json: one object, nothing else, whose error agrees with the exit code."""
        done = self.expect(code, *words, "--json")
        answer = json.loads(done.out)
        self.assertEqual(done.out.count("\n"), 1)
        self.assertNotRegex(done.out, "[\x00-\x09\x0b-\x1f\x7f-\x9f]", "a terminal may obey it")
        self.assertEqual((answer["ok"], answer["schema"]), (code == 0, 1))
        if code != 0:
            self.assertEqual(answer["error"]["code"], code)
            for member in ("name", "text", "hint"):
                self.assertTrue(answer["error"][member], member)
        return answer

    def text(self, *words):
        """What the tool prints for a person of the handset on COM7."""
        return self.expect(0, "-p", "7", *words).out

    def ask(self, code, *words):
        """The object that it prints of the handset on COM7."""
        return self.expect_json(code, "-p", "7", *words)


class Counting(unittest.TextTestResult):
    passed = 0

    def addSuccess(self, test):
        super().addSuccess(test)
        self.passed += 1


def run_tests(name, arguments, module="__main__"):
    """Those of the module, or those that the arguments name. The last line is "NAME: N passed, M failed"; a run that
    executed nothing fails."""
    suite = unittest.main(module=module, argv=[sys.argv[0], *arguments], exit=False,
                          testRunner=unittest.TextTestRunner(resultclass=Counting, verbosity=1))
    bad = len(suite.result.failures) + len(suite.result.errors)
    print(f"{name}: {suite.result.passed} passed, {bad} failed")
    sys.exit(0 if suite.result.passed > 0 and bad == 0 else 1)
