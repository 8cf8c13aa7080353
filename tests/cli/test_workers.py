"""Several files at once, workers that die, the user who stops, readers who go away."""
import contextlib
import os
import pty
import re
import select
import signal
import subprocess
import time
from pathlib import Path

from command_case import TAVO, Case, short_song, song, wav


def open_files(pid):
    """What the descriptors of a process lead to, of those that stay open while we look."""
    for entry in Path(f"/proc/{pid}/fd").glob("*"):
        with contextlib.suppress(OSError):
            yield int(entry.name), os.readlink(entry)


class Workers(Case):
    def setUp(self):
        super().setUp()
        self.put("a.wav")
        # Ten minutes of the same value over and over: what counts is how long they take.
        self.put("long.wav", wav(seconds=600, rate=48000, channels=2))
        os.link(self.folder / "long.wav", self.folder / "other.wav")

    def start(self, *arguments, form="json", **options):
        options = {"stdout": subprocess.PIPE, "stderr": subprocess.PIPE, **options}
        process = subprocess.Popen([TAVO, "--format", form, *arguments], cwd=self.folder,
                                   start_new_session=True, **options)
        for stream in (process.stdin, process.stdout, process.stderr):
            self.addCleanup(stream.close if stream else lambda: None)
        self.addCleanup(process.wait)
        self.addCleanup(process.kill)  # runs first
        return process

    def worker_with(self, process, name):
        """Waits until a worker has the file open. Returns its pid."""
        end = time.monotonic() + 60
        while time.monotonic() < end:
            self.assertIsNone(process.poll(), "the command ended before its time")
            children = Path(f"/proc/{process.pid}/task/{process.pid}/children").read_text()
            for child in map(int, children.split()):
                if str(self.folder / name) in dict(open_files(child)).values():
                    return child
        self.fail("no worker opened " + name)

    def assert_results(self, text, *expected):
        self.assertEqual([(r["file"], r["status"]) for r in self.objects(text)], [*expected])

    def test_as_single_runs_in_input_order(self):
        names = [f"{i}.wav" for i in range(10)]
        for i, name in enumerate(names):
            self.put(name, source=short_song(i) if i % 4 else song(seconds=40, seed=i))
        self.put("5.wav", b"RIFF")  # the others go on
        single = [self.run_json(name, status=int(name == "5.wav"))[0] for name in names]
        for jobs in ("2", "32"):
            self.assertEqual(self.run_json("-j", jobs, *names, status=1), single)

    def test_a_killed_worker_costs_its_file_only(self):
        for jobs in ("1", "2"):
            process = self.start("-j", jobs, "a.wav", "long.wav", "./a.wav", "././a.wav")
            os.kill(self.worker_with(process, "long.wav"), signal.SIGKILL)
            out, err = process.communicate(timeout=120)
            self.assertEqual(process.returncode, 1)
            self.assert_results(out, ("a.wav", "ok"), ("long.wav", "failed"), ("./a.wav", "ok"),
                                ("././a.wav", "ok"))
            self.assertIn("signal 9", self.objects(out)[1]["error"])
            self.assertIn(b"signal 9", err)

    def test_workers_end_with_the_command_and_share_no_pipes(self):
        # A pipe's end is a signal: it must not depend on another worker's life.
        process = self.start("-j", "2", "long.wav", "other.wav")
        workers = [self.worker_with(process, name) for name in ("long.wav", "other.wav")]
        pipes = [{to for fd, to in open_files(pid) if fd > 2 and to.startswith("pipe:")} for pid in workers]
        self.assertTrue(all(pipes))
        self.assertEqual(pipes[0] & pipes[1], set())
        process.kill()
        end = time.monotonic() + 60
        for worker in (Path(f"/proc/{pid}") for pid in workers):
            # Ended, a worker is nobody's to reap here.
            while worker.exists() and (worker / "stat").read_text().split()[2] != "Z":
                self.assertLess(time.monotonic(), end, "the worker goes on")
                time.sleep(0.05)

    def test_a_stop_keeps_what_is_finished(self):
        # As kill does, as the terminal does; results that wait behind the file that is stopped.
        for send, number, arguments, busy, finished in (
                (os.kill, signal.SIGTERM, ["a.wav", "long.wav", "./a.wav"], "long.wav", ["a.wav"]),
                (os.killpg, signal.SIGINT, ["a.wav", "long.wav", "./a.wav"], "long.wav", ["a.wav"]),
                (os.kill, signal.SIGINT, ["-j", "2", "long.wav", "a.wav", "./a.wav", "other.wav"],
                 "other.wav", ["a.wav", "./a.wav"])):
            with self.subTest(send=send, number=number, arguments=arguments):
                process = self.start(*arguments)
                worker = self.worker_with(process, busy)
                send(process.pid, number)
                out, err = process.communicate(timeout=120)
                self.assertFalse(os.path.exists(f"/proc/{worker}"))
                self.assertEqual(process.returncode, 128 + number, err)
                self.assert_results(out, *((name, "ok") for name in finished))
                self.assertRegex(err, rb"stopped; %d of [34] files done" % len(finished))
        process = self.start("-", stdin=subprocess.PIPE)  # a list that is being read
        time.sleep(0.5)
        process.send_signal(signal.SIGINT)
        self.assertEqual(process.wait(timeout=60), 130)

    def test_a_reader_gone(self):
        """The work ends, without a word, with the status of a broken pipe."""
        process = self.start(*["long.wav"] * 400)
        self.worker_with(process, "long.wav")
        process.stdout.close()
        # One of these takes seconds, all of them minutes.
        self.assertEqual(process.wait(timeout=60), 128 + signal.SIGPIPE)
        self.assertEqual(process.stderr.read(), b"")
        reader, writer = os.pipe()  # gone before the first byte
        os.close(reader)
        process = self.start("a.wav", form="csv", stdout=writer)  # which has a head
        os.close(writer)
        _, err = process.communicate(timeout=120)
        self.assertEqual((process.returncode, err), (128 + signal.SIGPIPE, b""))

    def on_terminal(self, *arguments, enough):
        """What standard error shows on a terminal: until it is enough, then after Ctrl-C."""
        try:
            control, terminal = pty.openpty()
        except OSError:
            self.skipTest("this system has no terminals")
        process = self.start("-m", "highlight", *arguments, *["long.wav"] * 400,
                             stdout=subprocess.DEVNULL, stderr=terminal)
        os.close(terminal)
        started = time.monotonic()
        shown = b""
        while not enough(shown, time.monotonic() - started):
            if select.select([control], [], [], 0.1)[0]:
                shown += os.read(control, 65536)
        process.send_signal(signal.SIGINT)
        with contextlib.suppress(OSError):  # the terminal's other side is closed
            while part := os.read(control, 65536):
                shown += part
        os.close(control)
        return shown

    def test_progress_on_a_terminal_only(self):
        bar = rb"\r\[[#-]+\] (\d+)/400 files, \d+\.\d a minute, \d+:\d\d left"
        shown = self.on_terminal(enough=lambda text, _: len(set(re.findall(bar, text))) > 1)
        self.assertRegex(shown, rb"left.*\r\x1b\[Ktavo: stopped; \d+ of 400 files done\.\r\n$")
        shown = self.on_terminal("--quiet", enough=lambda _, seconds: seconds > 2)
        self.assertRegex(shown, rb"^tavo: stopped[^\r]*\r\n$")
        self.assertEqual(self.run_tavo("-m", "highlight", *["long.wav"] * 8).stderr, b"")
