"""What is installed is whole, and starts."""

import os
import pathlib
import select
import shutil
import subprocess
import tempfile
import unittest

import bus

FILES = [
    "bin/mirabel",
    "lib/systemd/user/mirabel.service",
    "share/bash-completion/completions/mirabel",
    "share/dbus-1/interfaces/com.norvane.Vessel1.xml",
    "share/dbus-1/services/com.norvane.Vessel1.service",
    "share/fish/vendor_completions.d/mirabel.fish",
    "share/man/man1/mirabel.1",
    "share/man/man5/com.norvane.Vessel1.5",
    "share/zsh/site-functions/_mirabel",
]
BUILD = os.environ["MIRABEL_BUILD"]


@unittest.skipUnless(os.access(BUILD, os.W_OK), "whoever installs writes a list into the build")
class Installation(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.folder = tempfile.TemporaryDirectory()
        cls.prefix = pathlib.Path(cls.folder.name)
        subprocess.run([os.environ["MIRABEL_CMAKE"], "--install", BUILD, "--prefix", cls.prefix],
                       check=True, stdout=subprocess.DEVNULL)

    @classmethod
    def tearDownClass(cls):
        cls.folder.cleanup()

    def test_every_file_is_in_its_place_and_holds_something(self):
        found = {str(path.relative_to(self.prefix)): path.stat().st_size
                 for path in self.prefix.rglob("*") if path.is_file()}
        self.assertEqual(sorted(found), FILES)
        self.assertEqual([name for name, size in found.items() if size == 0], [])

    def test_the_first_call_starts_the_service_that_was_installed(self):
        with bus.PrivateBus(data_folders=str(self.prefix / "share")) as private:
            home = ", ".join(f"0x{byte:02x}" for byte in bytes(private.home))
            self.assertIn(f"[byte {home}]", private.call("Manager.GetHome"))
            self.assertTrue(private.end_started_service())

    def test_a_client_does_not_start_a_service_that_was_ended_and_goes_on_when_it_is_back(self):
        with bus.PrivateBus(data_folders=str(self.prefix / "share")) as private:
            private.call("Manager.GetHome")
            watch = subprocess.Popen([self.prefix / "bin/mirabel", "--json", "watch"], text=True,
                                     env=private.environment, stdout=subprocess.PIPE,
                                     stderr=subprocess.PIPE)
            try:
                self.assertIn("anchor", watch.stdout.readline())
                self.assertTrue(private.end_started_service())
                said, _, _ = select.select([watch.stderr, watch.stdout], [], [], 60)
                self.assertEqual(said, [watch.stderr])
                self.assertIn("the service has left", watch.stderr.readline())
                self.assertFalse(private.has_service())
                (private.home / "Documents/letter.txt").write_text("Dear")
                private.call("Manager.GetHome")
                self.assertTrue(any("letter.txt" in line for line in watch.stdout))
                self.assertTrue(private.end_started_service())
            finally:
                watch.terminate()
                watch.communicate()

    @unittest.skipUnless(shutil.which("systemd-analyze"), "systemd is not installed")
    def test_systemd_takes_the_unit(self):
        unit = self.prefix / "lib/systemd/user/mirabel.service"
        self.assertIn(f"ExecStart={self.prefix}/bin/mirabel serve\n", unit.read_text())
        checked = subprocess.run(
            ["systemd-analyze", "--user", "--man=no", "verify", unit], text=True,
            env={**os.environ, "XDG_RUNTIME_DIR": self.folder.name},
            stdout=subprocess.PIPE, stderr=subprocess.STDOUT)
        said = [line for line in checked.stdout.splitlines() if "mirabel" in line]
        self.assertEqual((checked.returncode, said), (0, []), checked.stdout)


if __name__ == "__main__":
    unittest.main()
