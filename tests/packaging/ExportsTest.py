"""The shared library shows what the public headers declare, and nothing else."""

import os
import re
import subprocess
import unittest

import bus

LIBRARY = os.environ["MIRABEL_LIBRARY"]
CLASS = re.compile(r"\b(?:class|struct) MIRABEL_EXPORT (\w+)")
FUNCTION = re.compile(r"MIRABEL_EXPORT [^;{]*?(\w+|operator==)\(")
ABOUT_CLASS = re.compile(r"(?:vtable|typeinfo|typeinfo name) for mirabel::(\w+)$")


def declared(pattern):
    return {name for header in (bus.SOURCE / "include/mirabel").glob("*.h")
            for name in pattern.findall(header.read_text())} - {"__attribute__"}


def exported():
    """The names that a program can be linked to, as a reader of the headers knows them."""
    listed = subprocess.run(["nm", "--dynamic", "--defined-only", "--demangle", LIBRARY],
                            check=True, text=True, stdout=subprocess.PIPE).stdout
    return {line.split(maxsplit=2)[2] for line in listed.splitlines()}


class Exports(unittest.TestCase):
    def test_every_exported_name_is_declared_for_export(self):
        classes, functions = declared(CLASS), declared(FUNCTION)
        for symbol in exported():
            about = ABOUT_CLASS.match(symbol)
            # "mirabel::Date::rfc3339[abi:cxx11]() const": the class or the function.
            name = about[1] if about else re.match(r"mirabel::(\w+(?:==)?)|", symbol)[1]
            self.assertIn(name, classes | functions, symbol)

    def test_every_declared_function_can_be_linked_to(self):
        symbols = exported()
        functions = declared(FUNCTION)
        self.assertIn("openDocuments", functions)
        for function in functions:
            self.assertTrue(any(symbol.startswith((f"mirabel::{function}(",
                                                   f"mirabel::{function}[abi"))
                                for symbol in symbols), function)
        for of_a_class in ("Error::description", "Date::now", "Number::asDouble", "UUID::random"):
            self.assertTrue(any(symbol.startswith(f"mirabel::{of_a_class}")
                                for symbol in symbols), of_a_class)

    def test_the_name_that_programs_are_linked_to_has_the_version_of_the_interface(self):
        headers = subprocess.run(["objdump", "--private-headers", LIBRARY], check=True, text=True,
                                 stdout=subprocess.PIPE).stdout
        soname = re.search(r"SONAME\s+(\S+)", headers)[1]
        version = re.search(r"project\(mirabel VERSION (\d+)\.(\d+)",
                            (bus.SOURCE / "CMakeLists.txt").read_text())
        interface = f"0.{version[2]}" if version[1] == "0" else version[1]
        self.assertEqual(soname, f"libmirabel.so.{interface}")


if __name__ == "__main__":
    unittest.main()
