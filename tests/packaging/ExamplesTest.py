"""The examples of the documentation do what they say."""

import os
import pathlib
import shutil
import signal
import subprocess
import sys
import tempfile
import unittest

import bus

EXAMPLES = bus.SOURCE / "docs/examples"
CMAKE = os.environ["MIRABEL_CMAKE"]
PACKAGE = os.environ["MIRABEL_PACKAGE"]
SANITIZE = os.environ.get("MIRABEL_SANITIZE")


class Client:
    """A program that prints lines as things happen; to be used in a with statement."""

    def __init__(self, command, environment):
        self._process = subprocess.Popen(command, env=environment, stdout=subprocess.PIPE, text=True)

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self._process.terminate()
        self._process.communicate()

    def interrupt(self):
        """Ends it like Ctrl-C, and hands back its exit code."""
        self._process.send_signal(signal.SIGINT)
        return self._process.wait()

    def next_line(self):
        """The next thing that it says; an empty text where it has ended."""
        return self._process.stdout.readline()

    def says(self, wanted):
        """Whether it says so, now or after other things."""
        while line := self.next_line():
            if line == wanted + "\n":
                return True
        return False


def keeps_up(case, client, documents):
    """Has the client told of a file that comes, is renamed and goes."""
    case.assertEqual(client.next_line(), "listed: 1 items\n")
    (documents / "letter.txt").write_text("Dear")
    case.assertTrue(client.says("there: letter.txt"))
    (documents / "letter.txt").rename(documents / "thanks.txt")
    case.assertTrue(client.says("there: thanks.txt"))
    (documents / "thanks.txt").unlink()
    case.assertTrue(client.says("gone: thanks.txt"))


def starts_over(case, client, private):
    """Has the client told of a service that has forgotten everything."""
    (private.home / "Documents/while-away.txt").write_text("")
    private.end_service()
    shutil.rmtree(private.home / ".local/state/mirabel")
    private.serve()
    case.assertTrue(client.says("listed: 2 items"))
    (private.home / "Documents/later.txt").write_text("")
    case.assertTrue(client.says("there: later.txt"))


class ExamplesInCpp(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.TemporaryDirectory()
        cls.build = pathlib.Path(cls.folder.name)
        flags = f"-fsanitize={SANITIZE}" if SANITIZE else ""
        subprocess.run([CMAKE, "-S", EXAMPLES / "cpp", "-B", cls.build, f"-Dmirabel_DIR={PACKAGE}",
                        f"-DCMAKE_CXX_FLAGS=-Wall -Wextra -Werror {flags}"],
                       check=True, stdout=subprocess.DEVNULL)
        subprocess.run([CMAKE, "--build", cls.build], check=True, stdout=subprocess.DEVNULL)

    @classmethod
    def tearDownClass(cls):
        cls.folder.cleanup()

    def test_list_prints_a_folder(self):
        with bus.PrivateBus() as private:
            documents = private.home / "Documents"
            (documents / "Letters/letter.txt").write_text("Dear")
            listed = private.run(self.build / "list", private.home)
            self.assertRegex(listed, r"\Afid=\d+\tLetters\n\Z")
            listed = private.run(self.build / "list", private.home, documents / "Letters")
            self.assertRegex(listed, r"\Adid=\d+\tletter\.txt\n\Z")

    def test_mirror_keeps_up_in_its_own_process(self):
        with bus.PrivateBus() as private, \
             Client([self.build / "mirror", private.home], private.environment) as mirror:
            keeps_up(self, mirror, private.home / "Documents")

    def test_mirror_keeps_up_through_the_service_and_starts_over(self):
        with bus.PrivateBus() as private:
            private.serve()
            with Client([self.build / "mirror", private.home], private.environment) as mirror:
                keeps_up(self, mirror, private.home / "Documents")
                starts_over(self, mirror, private)


class OtherExamples(unittest.TestCase):
    def test_follow_keeps_up_and_starts_over(self):
        try:
            import gi  # noqa: F401
        except ImportError:
            self.skipTest("python3-gi is not installed")
        with bus.PrivateBus() as private:
            private.serve()
            with Client([sys.executable, "-B", EXAMPLES / "python/follow.py"],
                        private.environment) as follow:
                keeps_up(self, follow, private.home / "Documents")
                starts_over(self, follow, private)

            self.follows_a_folder(private)

    def follows_a_folder(self, private):
        documents = private.home / "Documents"
        (documents / "Letters/kept.txt").write_text("")
        folder = private.run(bus.PROGRAM, "id", documents / "Letters").strip()
        with Client([sys.executable, "-B", EXAMPLES / "python/follow.py", folder],
                    private.environment) as follow:
            self.assertEqual(follow.next_line(), "listed: 1 items\n")
            (documents / "Letters/kept.txt").rename(documents / "left.txt")
            self.assertEqual(follow.next_line(), "gone: kept.txt\n")
            (documents / "left.txt").write_text("elsewhere")
            (documents / "Letters/new.txt").write_text("")
            self.assertEqual(follow.next_line(), "there: new.txt\n")
            self.assertEqual(follow.interrupt(), 130)

    @unittest.skipUnless(shutil.which("jq"), "jq is not installed")
    def test_recent_changes_prints_what_happened_since_the_last_call(self):
        with bus.PrivateBus() as private:
            program = pathlib.Path(bus.PROGRAM).parent
            private.environment["PATH"] = f"{program}:{os.environ['PATH']}"
            documents, anchor = private.home / "Documents", private.home / "anchor"

            def changes():
                return private.run(EXAMPLES / "shell/recent-changes.sh", anchor).splitlines()

            letter, thanks = documents / "letter.txt", documents / "Letters/thanks.txt"
            letter.write_text("Dear")
            self.assertEqual(sorted(changes()),
                             [f"there {documents / 'Letters'}", f"there {letter}"])
            self.assertEqual(changes(), [])
            letter.rename(thanks)
            self.assertIn(f"there {thanks}", changes())
            thanks.unlink()
            self.assertTrue(any(line.startswith("gone did=") for line in changes()))
            # Without its memory nothing can be told of the past: everything, then.
            shutil.rmtree(private.home / ".local/state/mirabel")
            self.assertEqual(changes(), [f"there {documents / 'Letters'}"])


if __name__ == "__main__":
    unittest.main()
