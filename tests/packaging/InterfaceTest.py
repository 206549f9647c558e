"""What clients' authors read is what the service answers to."""

import re
import subprocess
import sys
import tempfile
import unittest

import bus


class Interface(unittest.TestCase):
    maxDiff = None

    def test_the_description_is_what_the_service_has(self):
        with bus.PrivateBus() as private:
            private.serve()
            running = private.introspected()
        described = bus.interfaces(bus.INTERFACE.read_text())
        self.assertEqual(len(described), 3)
        self.assertEqual(described, running)

    def test_the_manual_page_has_every_member_with_its_arguments(self):
        page = (bus.SOURCE / "docs/man/com.norvane.Vessel1.5.scd").read_text()
        for interface, members in bus.interfaces(bus.INTERFACE.read_text()).items():
            self.assertIn(f"_{interface}_", page)
            for (kind, name), (arguments, *_) in members.items():
                taken = ", ".join(f"{type} {argument}" for argument, type, direction in arguments
                                  if direction == "in" or kind == "signal")
                self.assertIn(f"*{name}*" + ("" if kind == "property" else f"({taken})"), page)

    def test_the_program_in_the_documentation_keeps_up_with_a_container(self):
        try:
            import gi  # noqa: F401
        except ImportError:
            self.skipTest("python3-gi is not installed")
        text = (bus.SOURCE / "docs/service.md").read_text()
        program = re.search(r"```python\n(.*?)```", text, re.DOTALL)[1]
        with bus.PrivateBus() as private, tempfile.NamedTemporaryFile("w", suffix=".py") as file:
            file.write(program)
            file.flush()
            private.serve()
            client = subprocess.Popen([sys.executable, "-B", file.name], env=private.environment,
                                      stdout=subprocess.PIPE, text=True)
            try:
                self.assertEqual(client.stdout.readline(), "listed: 1 items\n")
                letter = private.home / "Documents/letter.txt"
                letter.write_text("Dear")
                self.assertTrue(any(line == "there: letter.txt\n" for line in client.stdout))
                letter.unlink()
                self.assertTrue(any(line == "gone: letter.txt\n" for line in client.stdout))
            finally:
                client.terminate()
                client.wait()
                client.stdout.close()


if __name__ == "__main__":
    unittest.main()
