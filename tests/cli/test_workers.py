"""Tests parallel workers that are killed or stopped, and readers that close the output."""
import contextlib
import math
import os
import re
import resource
import select
import signal
import subprocess
import time
from pathlib import Path

from command_case import TAVO, Case, children, send, short_song, song, wav


def open_files(pid):
    """Yields the descriptor and the target of each file that a process has open."""
    for entry in Path(f"/proc/{pid}/fd").glob("*"):
        with contextlib.suppress(OSError):
            yield int(entry.name), os.readlink(entry)


class Workers(Case):
    def setUp(self):
        super().setUp()
        self.put("a.wav")
        # The samples are constant, because only the analysis time matters.
        self.put("long.wav", wav(seconds=600, rate=48000, channels=2))
        os.link(self.folder / "long.wav", self.folder / "other.wav")

    def start(self, *arguments, form="json", **options):
        return super().start("--format", form, *arguments, **options)

    def worker_with(self, process, name):
        """Waits until a worker has opened the file. Returns the worker's pid."""
        def find():
            self.assertIsNone(process.poll(), "the command ended before its time")
            return [pid for pid in children(process.pid) if str(self.folder / name) in dict(open_files(pid)).values()]
        return self.wait_until(find)[0]

    def assert_results(self, text, *expected):
        self.assertEqual([(r["file"], r["status"]) for r in self.objects(text)], [*expected])

    def test_results_are_those_of_single_runs_in_input_order(self):
        names = [f"{i}.wav" for i in range(10)]
        for i, name in enumerate(names):
            self.put(name, source=short_song(i) if i % 4 else song(seconds=40, seed=i))
        self.put("5.wav", b"RIFF")  # the only one that fails
        single = [self.run_json(name, status=int(name == "5.wav"))[0] for name in names]
        limits = resource.getrlimit(resource.RLIMIT_NOFILE)
        self.addCleanup(resource.setrlimit, resource.RLIMIT_NOFILE, limits)
        resource.setrlimit(resource.RLIMIT_NOFILE, (200, limits[1]))
        for jobs in ("2", "256"):  # the second is more than there may be open files
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
        process = self.start("-")  # no file fails if an idle worker is killed
        send(process, b"a.wav\n")
        self.assert_results(process.stdout.readline(), ("a.wav", "ok"))
        os.kill(*children(process.pid), signal.SIGKILL)
        self.assertIn(b"without a file was ended by signal 9", process.stderr.readline())
        out, _ = process.communicate(b"./a.wav\n")
        self.assert_results(out, ("./a.wav", "ok"))
        self.assertEqual(process.returncode, 1)

    def test_workers_end_with_the_command_and_share_no_sockets(self):
        # When the command ends, its sockets close, which ends the workers. No worker may keep another's socket open.
        process = self.start("-j", "2", "long.wav", "other.wav")
        workers = [self.worker_with(process, name) for name in ("long.wav", "other.wav")]
        sockets = [[to for fd, to in open_files(pid) if fd > 2 and to.startswith("socket:")] for pid in workers]
        self.assertEqual([*map(len, sockets)], [1, 1])
        ends = [os.fdopen(os.pidfd_open(pid)) for pid in workers]
        process.kill()
        for end in ends:
            with end:
                self.assertTrue(select.select([end], [], [], 60)[0], "the worker goes on")

    def test_a_stop_keeps_what_is_finished(self):
        # A terminal signals all processes, but `kill` signals one. Results that wait for an earlier file are printed.
        for send, number, words, busy, finished in (
                (os.kill, signal.SIGTERM, "a.wav long.wav ./a.wav", "long.wav", ["a.wav"]),
                (os.killpg, signal.SIGINT, "a.wav long.wav ./a.wav", "long.wav", ["a.wav"]),
                (os.kill, signal.SIGINT, "-j 2 long.wav a.wav ./a.wav other.wav", "other.wav", ["a.wav", "./a.wav"]),
                (os.kill, signal.SIGINT, "--report p.html long.wav", "long.wav", [])):
            with self.subTest(words=words, send=send):
                process = self.start(*words.split())
                worker = first = self.worker_with(process, "long.wav")
                if busy != "long.wav":  # suspend this worker, so that the other one does the rest
                    os.kill(first, signal.SIGSTOP)
                    worker = self.worker_with(process, busy)
                send(process.pid, number)
                if worker != first:
                    os.kill(first, signal.SIGCONT)
                out, err = process.communicate(timeout=120)
                self.assertFalse(os.path.exists(f"/proc/{worker}"))
                self.assertEqual(process.returncode, 128 + number, err)
                self.assert_results(out, *((name, "ok") for name in finished))
                self.assertRegex(err, rb"stopped; %d of [134] files? done" % len(finished))
        self.assert_only("a.wav", "long.wav", "other.wav")

    def test_hanging_worker_is_killed(self):
        """A worker that hangs is killed one second after a stop, or after --timeout. Its temporary file is removed."""
        for words, number, sentence in (("", signal.SIGTERM, b"stopped; 0 of 1 file"),
                                        ("--timeout 1", None, b"long.wav: The analysis took more than 1 s")):
            process = self.start("--click", "c.wav", *words.split(), "long.wav")
            worker = self.worker_with(process, "long.wav")
            os.kill(worker, signal.SIGSTOP)
            self.assertTrue(list(self.folder.glob(".tavo-*")))
            if number:
                process.send_signal(number)
            _, err = process.communicate(timeout=20)
            self.assertEqual(process.returncode, 128 + number if number else 1)
            self.assertIn(sentence, err)
            self.assertFalse(os.path.exists(f"/proc/{worker}"))
            self.assert_only("a.wav", "long.wav", "other.wav")

    def test_waiting_for_a_list_can_be_ended(self):
        """A stop and a closed output both end the wait for the next name."""
        for end, status in ((lambda process: process.send_signal(signal.SIGINT), 128 + signal.SIGINT),
                            (lambda process: process.stdout.close(), 128 + signal.SIGPIPE)):
            process = self.start("-")
            send(process, b"a.wav\n")
            self.assert_results(process.stdout.readline(), ("a.wav", "ok"))
            end(process)
            self.assertEqual(process.wait(timeout=60), status)

    def test_closed_output_ends_the_command(self):
        """If the output is closed, the command ends without a message and with the status of a broken pipe."""
        for words, form in ((["long.wav"] * 400, "json"), (["a.wav"], "csv")):  # CSV starts with a header
            process = self.start(*words, form=form)
            process.stdout.close()
            _, err = process.communicate(timeout=60)  # long before all files are analysed
            self.assertEqual((process.returncode, err), (128 + signal.SIGPIPE, b""))

    def test_progress_on_a_terminal_only(self):
        start = time.monotonic()
        self.assertEqual(self.run_tavo("-m", "highlight", *["long.wav"] * 8).stderr, b"")
        count = 8 * math.ceil(4 / (time.monotonic() - start))  # enough files for about 4 s
        shown = {}
        for option in ("", "--quiet"):
            words = f"'{TAVO}' {option} -m highlight {count * 'long.wav '} >/dev/null"
            shown[option] = subprocess.run(["script", "-qec", words, "/dev/null"], cwd=self.folder, capture_output=True,
                                           stdin=subprocess.DEVNULL, check=True).stdout
        bars = re.findall(rb"\r\[[#-]+\] (\d+)/%d files, \d+\.\d a minute, \d+:\d\d left" % count, shown[""])
        self.assertGreater(len(set(bars)), 1, shown[""])
        self.assertTrue(shown[""].endswith(b"left\x1b[K\r\x1b[K"), shown[""])
        self.assertEqual(shown["--quiet"], b"")
