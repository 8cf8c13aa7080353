"""Several files at once, workers that die, the user who stops, readers who go away."""
import os
import pty
import select
import signal
import subprocess
import time
from pathlib import Path

from command_case import TAVO, Case, children_of, main, short_song, song, wav


def long_sound():
    """Ten minutes of the same value over and over: what counts is how long they take."""
    return wav(seconds=600, rate=48000, channels=2)


class Order(Case):
    def test_as_single_runs_in_input_order(self):
        names = []
        for i in range(10):
            source = song(seconds=40, loud_at=14, seed=i) if i % 4 == 0 else short_song(seed=i)
            self.put(f"{i}.wav", source=source)
            names.append(f"{i}.wav")
        single = b"".join(self.run_tavo("--format", "json", name).stdout for name in names)
        for jobs in ("1", "2", "4", "32"):
            with self.subTest(jobs=jobs):
                self.assertEqual(
                    self.run_tavo("--format", "json", "-j", jobs, *names).stdout, single)


def open_files(pid):
    """What each descriptor of a process leads to, of those that stay open while we look."""
    found = {}
    try:
        for number in os.listdir(f"/proc/{pid}/fd"):
            try:
                found[int(number)] = os.readlink(f"/proc/{pid}/fd/{number}")
            except OSError:
                pass
    except OSError:
        pass
    return found


class Running(Case):
    def start(self, *arguments, **options):
        options.setdefault("stdout", subprocess.PIPE)
        options.setdefault("stderr", subprocess.PIPE)
        process = subprocess.Popen([TAVO, *arguments], cwd=self.folder,
                                   start_new_session=True, **options)
        self.addCleanup(process.stdout.close if process.stdout else lambda: None)
        self.addCleanup(process.stderr.close if process.stderr else lambda: None)
        self.addCleanup(process.wait)
        self.addCleanup(process.kill)  # runs first
        return process

    def worker_with(self, process, name):
        """Waits until a worker has the file open. Returns its pid."""
        wanted = str(self.folder / name)
        end = time.monotonic() + 60
        while time.monotonic() < end:
            for child in children_of(process.pid):
                if wanted in open_files(child).values():
                    return child
            self.assertIsNone(process.poll(), "the command ended before its time")
        self.fail("no worker opened " + name)


class Deaths(Running):
    def test_a_killed_worker_costs_its_file_only(self):
        self.put("a.wav")
        self.put("long.wav", long_sound())
        for name in ("c.wav", "d.wav"):
            self.put(name)
        for jobs in ("1", "2"):
            with self.subTest(jobs=jobs):
                process = self.start("--format", "json", "-j", jobs, "a.wav", "long.wav", "c.wav",
                                     "d.wav")
                os.kill(self.worker_with(process, "long.wav"), signal.SIGKILL)
                out, err = process.communicate(timeout=120)
                results = self.objects(out)
                self.assertEqual(process.returncode, 1)
                self.assertEqual([r["file"] for r in results],
                                 ["a.wav", "long.wav", "c.wav", "d.wav"])
                self.assertEqual([r["status"] for r in results], ["ok", "failed", "ok", "ok"])
                self.assertIn("signal 9", results[1]["error"])
                self.assertIn(b"signal 9", err)

    def test_workers_share_no_pipes(self):
        # A pipe's end is a signal: it must not depend on another worker's life.
        self.put("long.wav", long_sound())
        self.put("other.wav", long_sound())
        process = self.start("--format", "json", "-j", "2", "long.wav", "other.wav")
        pipes = []
        for name in ("long.wav", "other.wav"):
            ends = open_files(self.worker_with(process, name))
            pipes.append({to for fd, to in ends.items() if fd > 2 and to.startswith("pipe:")})
        self.assertTrue(all(pipes))
        self.assertEqual(pipes[0] & pipes[1], set())

    def test_workers_end_with_the_command(self):
        self.put("long.wav", long_sound())
        process = self.start("--format", "json", "long.wav")
        worker = self.worker_with(process, "long.wav")
        process.kill()
        process.wait()
        end = time.monotonic() + 60
        while os.path.exists(f"/proc/{worker}") and time.monotonic() < end:
            state = Path(f"/proc/{worker}/stat").read_text().split()[2]
            if state == "Z":
                break  # ended, and nobody's to reap here
            time.sleep(0.05)
        else:
            self.assertLess(time.monotonic(), end, "the worker goes on")


class Stops(Running):
    def interrupted(self, send, *arguments):
        self.put("a.wav")
        self.put("long.wav", long_sound())
        self.put("z.wav")
        process = self.start("--format", "json", *arguments)
        worker = self.worker_with(process, "long.wav")
        send(process)
        out, err = process.communicate(timeout=120)
        self.assertFalse(os.path.exists(f"/proc/{worker}"))
        return process.returncode, self.objects(out), err

    def test_what_is_finished_is_kept(self):
        for number, status in ((signal.SIGINT, 130), (signal.SIGTERM, 143)):
            for whole_group in (False, True):  # as kill does, as the terminal does
                with self.subTest(number=number, whole_group=whole_group):
                    send = ((lambda p: os.killpg(p.pid, number)) if whole_group
                            else (lambda p: p.send_signal(number)))
                    code, results, err = self.interrupted(send, "a.wav", "long.wav", "z.wav")
                    self.assertEqual(code, status, err)
                    self.assertEqual([r["file"] for r in results], ["a.wav"])
                    self.assertEqual(results[0]["status"], "ok")
                    self.assertIn(b"stopped; 1 of 3 files are done", err)

    def test_finished_files_behind_the_stopped_one_are_kept(self):
        self.put("b.wav")
        self.put("c.wav", long_sound())

        def send(process):
            self.worker_with(process, "c.wav")  # so the other worker's files are done
            process.send_signal(signal.SIGINT)

        code, results, err = self.interrupted(send, "-j", "2", "long.wav", "a.wav", "b.wav", "c.wav")
        self.assertEqual(code, 130, err)
        self.assertEqual([r["file"] for r in results], ["a.wav", "b.wav"])

    def test_while_a_list_is_read(self):
        process = self.start("-", stdin=subprocess.PIPE)
        time.sleep(0.5)
        process.send_signal(signal.SIGINT)
        self.assertEqual(process.wait(timeout=60), 130)
        process.stdin.close()


class Readers(Running):
    def test_head(self):
        for i in range(6):
            self.put(f"{i}.wav", source=short_song(seed=i))
        script = f"set -o pipefail; '{TAVO}' --format json -j 2 . | head -1; echo ${{PIPESTATUS[0]}}"
        done = subprocess.run(["bash", "-c", script], cwd=self.folder, capture_output=True,
                              timeout=120)
        first, status = done.stdout.splitlines()
        self.assertEqual(self.objects(first + b"\n")[0]["file"], "./0.wav")
        self.assertEqual((status, done.stderr), (b"0", b""))

    def test_a_reader_gone_during_an_analysis_ends_it(self):
        self.put("long.wav", long_sound())
        process = self.start("--format", "json", *["long.wav"] * 400)
        self.worker_with(process, "long.wav")
        process.stdout.close()
        # One of these takes seconds, all of them minutes.
        self.assertEqual(process.wait(timeout=60), 0)
        self.assertEqual(process.stderr.read(), b"")

    def test_a_reader_gone_before_the_first_byte(self):
        self.put("a.wav")
        reader, writer = os.pipe()
        os.close(reader)
        process = self.start("--format", "csv", "a.wav", stdout=writer)
        os.close(writer)
        _, err = process.communicate(timeout=120)
        self.assertEqual((process.returncode, err), (0, b""))

    def test_results_that_cannot_be_written(self):
        self.put("a.wav")
        with open("/dev/full", "wb") as full:
            process = self.start("--format", "json", "a.wav", stdout=full)
            _, err = process.communicate(timeout=120)
        self.assertEqual(process.returncode, 1)
        self.assertIn(b"The results cannot be written", err)

    def test_no_standard_output_at_all(self):
        self.put("a.wav")
        done = subprocess.run(["bash", "-c", f"'{TAVO}' --format json -j 2 a.wav >&-"],
                              cwd=self.folder, capture_output=True, timeout=120)
        self.assertEqual(done.returncode, 1)
        self.assertIn(b"The results cannot be written", done.stderr)


class Progress(Running):
    def on_terminal(self, *arguments):
        """What standard error shows on a terminal."""
        control, terminal = pty.openpty()
        process = self.start("--format", "json", "-m", "highlight", *arguments,
                             stdout=subprocess.DEVNULL, stderr=terminal)
        os.close(terminal)
        shown = b""
        while True:
            ready, _, _ = select.select([control], [], [], 120)
            self.assertTrue(ready)
            try:
                part = os.read(control, 65536)
            except OSError:  # the terminal's other side is closed
                break
            if not part:
                break
            shown += part
        os.close(control)
        self.assertEqual(process.wait(timeout=120), 0)
        return shown

    def test_bar_on_a_terminal_only(self):
        self.put("0.wav", long_sound())
        started = time.monotonic()
        self.run_tavo("-m", "highlight", "0.wav")
        # Work for about four seconds, however fast this machine and this build are.
        count = max(5, round(4 / (time.monotonic() - started)))
        for i in range(1, count):
            os.symlink("0.wav", self.folder / f"{i}.wav")
        shown = self.on_terminal(".")
        self.assertRegex(shown, rb"\r\[[#-]+\] \d+/%d files, \d+\.\d a minute, " % count)
        counts = {line.split(b"] ")[1].split(b"/")[0] for line in shown.split(b"\r") if b"] " in line}
        self.assertGreater(len(counts), 1, shown)  # it moves
        self.assertRegex(shown, rb"\d:\d\d left")
        self.assertTrue(shown.endswith(b"\r\x1b[K"), shown)  # and leaves the line empty
        self.assertEqual(self.on_terminal("--quiet", "."), b"")
        self.assertEqual(self.run_tavo("-m", "highlight", "--format", "json", ".").stderr, b"")


if __name__ == "__main__":
    main()
