"""What clients' authors read is what the service answers to."""

import re
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


if __name__ == "__main__":
    unittest.main()
