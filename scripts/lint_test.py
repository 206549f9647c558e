"""The checks find what they are there to find: each case is a small tree with one thing wrong."""

import importlib.machinery
import importlib.util
import pathlib
import tempfile
import unittest


def load(name):
    path = str(pathlib.Path(__file__).with_name(name))
    loader = importlib.machinery.SourceFileLoader(name.replace("-", "_"), path)
    module = importlib.util.module_from_spec(importlib.util.spec_from_loader(loader.name, loader))
    loader.exec_module(module)
    return module


LAYERS = load("lint-layers")
SOURCES = load("lint-sources")


def problems(check, files):
    with tempfile.TemporaryDirectory() as folder:
        root = pathlib.Path(folder)
        for name, text in files.items():
            path = root / name
            path.parent.mkdir(parents=True, exist_ok=True)
            path.write_text(text, encoding="utf-8")
        return check(root)


class Layers(unittest.TestCase):
    LEAVES = {f"src/{name}/Leaf.h": "" for name in
              ["foundation", "platform", "identity", "fs", "linux/kernel", "linux/files", "host",
               "cli"]}

    def found(self, **files):
        named = {name.replace("__", "/") + ".h": text for name, text in files.items()}
        return problems(LAYERS.check, {**self.LEAVES, **named})

    def test_includes_down_the_list_are_fine(self):
        self.assertEqual([], self.found(
            src__fs__A='#include <vector>\n#include "foundation/Leaf.h"\n#include "fs/Leaf.h"\n',
            src__linux__volume__A='#include <sys/stat.h>\n#include "linux/kernel/Leaf.h"\n',
            src__host__A='#include "linux/files/Leaf.h"\n#include "fs/Leaf.h"\n',
            src__cli__A='#include "host/Leaf.h"\n#include <CLI/CLI.hpp>\n'))

    def test_each_wrong_include_is_found(self):
        table = {
            "src__identity__A": '#include "fs/Leaf.h"',
            "src__linux__volume__A": '#include "identity/Leaf.h"',
            "src__host__A": '#include "cli/Leaf.h"',
            "src__fs__A": '#include "linux/kernel/Leaf.h"',
            "src__foundation__A": "#  include <sys/stat.h>",
            "src__platform__A": "#include <unistd.h>",
            "src__foundation__B": '#include "foundation/Missing.h"',
            "src__foundation__C": "#include HEADER",
            "src__elsewhere__A": "",
        }
        for name, text in table.items():
            with self.subTest(name=name, text=text):
                self.assertEqual(1, len(self.found(**{name: text})))

    def test_a_public_header_counts_as_one_of_its_folder(self):
        public = {"include/mirabel/Error.h": "#include <expected>\n",
                  "include/mirabel/UniqueFd.h": '#include <unistd.h>\n#include "mirabel/Error.h"\n'}
        fine = {"src/linux/files/A.h": '#include "mirabel/UniqueFd.h"\n',
                "src/fs/A.h": '#include "mirabel/Error.h"\n'}
        self.assertEqual([], problems(LAYERS.check, {**self.LEAVES, **public, **fine}))
        table = {
            "src/fs/A.h": '#include "mirabel/UniqueFd.h"',
            "src/fs/B.h": '#include "mirabel/Missing.h"',
            "include/mirabel/Error.h": '#include "foundation/Leaf.h"',
            "include/mirabel/Values.h": "#include <unistd.h>",
            "include/mirabel/UniqueFd.h": "#include <sqlite3.h>",
            "include/mirabel/Unknown.h": "",
        }
        for name, text in table.items():
            with self.subTest(name=name):
                self.assertEqual(1, len(problems(LAYERS.check,
                                                 {**self.LEAVES, **public, name: text})))

    def test_a_cycle_of_three_folders_is_found_once(self):
        found = self.found(src__linux__a__A='#include "linux/b/A.h"',
                           src__linux__b__A='#include "linux/c/A.h"',
                           src__linux__c__A='#include "linux/a/A.h"')
        self.assertEqual(
            ["folders include each other: linux/a -> linux/b -> linux/c -> linux/a"], found)

    def test_a_library_in_the_build_file_of_the_core_is_found(self):
        build = "# SYSTEM is for others\nmirabel_layer(fs SOURCES A.cpp SYSTEM PkgConfig::SQLITE)\n"
        found = problems(LAYERS.check, {"src/fs/CMakeLists.txt": build, "src/fs/Leaf.h": ""})
        self.assertEqual(1, len(found))


class Sources(unittest.TestCase):
    def found(self, **files):
        return problems(SOURCES.check, {"tests/fs/CMakeLists.txt": "", **files})

    def test_what_is_built_and_finished_is_fine(self):
        self.assertEqual([], self.found(**{
            "tests/fs/WalkTest.cpp": "TEST(Walk, EndsAtTheEnd) {}",
            "tests/fs/deep/CutTest.cpp": "",
            "docs/a.md": "[up](../README.md#top), [out](https://example.org/x)", "README.md": "",
            "tests/fs/CMakeLists.txt": "mirabel_tests(fs_tests SOURCES WalkTest.cpp\n"
                                       "  deep/CutTest.cpp)"}))

    def test_each_unbuilt_or_unfinished_source_is_found(self):
        table = {
            "tests/fs/WalkTest.cpp": ("", "# SOURCES WalkTest.cpp"),
            "bench/WalkBench.cpp": ("", ""),
            "fuzz/TokenFuzz.cpp": ("", ""),
            "src/fs/Walk.h": ("int a;  // TO" "DO", ""),
            "src/fs/Cut.h": ("int a;  // NO" "LINT", ""),
            "docs/a.md": ("see [it](gone.md)", ""),
            "tests/fs/Walk.h": ("TEST(Walk, DISABLED" "_Ends)", ""),
        }
        for name, (text, build) in table.items():
            with self.subTest(name=name):
                self.assertEqual(1, len(self.found(**{name: text,
                                                      "tests/fs/CMakeLists.txt": build})))


if __name__ == "__main__":
    unittest.main()
