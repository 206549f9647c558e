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
    *[f"include/mirabel/{header.name}" for header in (bus.SOURCE / "include/mirabel").iterdir()],
    "lib/cmake/mirabel/mirabel-config-version.cmake",
    "lib/cmake/mirabel/mirabel-config-{configuration}.cmake",
    "lib/cmake/mirabel/mirabel-config.cmake",
    "lib/libmirabel.so",
    "lib/libmirabel.so.{interface}",
    "lib/libmirabel.so.{version}",
    "lib/pkgconfig/mirabel.pc",
    "lib/systemd/user/mirabel.service",
    "share/bash-completion/completions/mirabel",
    "share/dbus-1/interfaces/com.norvane.Vessel1.xml",
    "share/dbus-1/services/com.norvane.Vessel1.service",
    *[f"share/doc/mirabel/{example.relative_to(bus.SOURCE / 'docs')}"
      for example in (bus.SOURCE / "docs/examples").rglob("*.*")],
    "share/fish/vendor_completions.d/mirabel.fish",
    "share/man/man1/mirabel.1.gz",
    "share/man/man5/com.norvane.Vessel1.5.gz",
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
        expected = [name.format(version=os.environ["MIRABEL_VERSION"],
                                interface=os.environ["MIRABEL_INTERFACE"],
                                configuration=os.environ["MIRABEL_CONFIGURATION"].lower())
                    for name in FILES]
        self.assertEqual(sorted(found), sorted(expected))
        self.assertEqual([name for name, size in found.items() if size == 0], [])

    def test_cmake_and_pkg_config_find_the_library_wherever_it_was_moved(self):
        with tempfile.TemporaryDirectory() as folder:
            moved = pathlib.Path(folder, "moved")
            shutil.copytree(self.prefix, moved, symlinks=True)
            configured = subprocess.run(
                [os.environ["MIRABEL_CMAKE"], "-S", bus.SOURCE / "docs/examples/cpp", "-B",
                 f"{folder}/build", f"-DCMAKE_PREFIX_PATH={moved}"], check=True, text=True,
                stdout=subprocess.PIPE)
            self.assertNotIn("Warning", configured.stdout)
            built = pathlib.Path(folder, "build/CMakeCache.txt").read_text()
            self.assertIn(f"mirabel_DIR:PATH={moved}/lib/cmake/mirabel\n", built)
            asked = subprocess.run(
                ["pkg-config", "--define-prefix", "--cflags", "--libs", "mirabel"], check=True,
                text=True, env={**os.environ, "PKG_CONFIG_PATH": f"{moved}/lib/pkgconfig"},
                stdout=subprocess.PIPE)
            self.assertEqual(asked.stdout.split(),
                             [f"-I{moved}/include", f"-L{moved}/lib", "-lmirabel"])

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
