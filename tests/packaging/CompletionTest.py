"""Shells and the manual know what the program's help says."""

import re
import shutil
import subprocess
import tempfile
import unittest

import bus


def output(*command):
    return subprocess.run(command, check=True, text=True, stdout=subprocess.PIPE).stdout


def completion(shell):
    return output(bus.PROGRAM, "completion", shell)


def help_of(*command):
    return output(bus.PROGRAM, *command, "--help")


def commands():
    return re.findall(r"^  ([a-z]+) ", help_of().partition("Subcommands:")[2], re.MULTILINE)


def options_of(*command):
    return set(re.findall(r"--[a-z][a-z-]*", help_of(*command).partition("Options:")[2]))


# Asks for what bash offers at the end of a line: its words are the arguments.
ASK_BASH = """
source /dev/stdin
compopt() { :; }
COMP_WORDS=("$@") COMP_CWORD=$(($# - 1))
_mirabel
printf '%s\\n' "${COMPREPLY[@]}"
"""


def offered_by_bash(*words):
    asked = subprocess.run(["bash", "-c", ASK_BASH, "bash", "mirabel", *words], check=True,
                           text=True, input=completion("bash"), stdout=subprocess.PIPE)
    return set(asked.stdout.split())


class Completion(unittest.TestCase):
    def test_bash_offers_commands_options_and_words_where_they_belong(self):
        self.assertEqual(offered_by_bash("ser"), {"serve"})
        self.assertEqual(offered_by_bash(""), set(commands()))
        self.assertEqual(offered_by_bash("--json", "completion", "z"), {"zsh"})
        self.assertIn("root", offered_by_bash("ls", "r"))
        for command in commands():
            offered = offered_by_bash(command, "--")
            self.assertLessEqual(options_of(command) | options_of(), offered | {"--"}, command)

    def test_each_shell_is_told_every_command_and_option(self):
        for shell in ("bash", "zsh", "fish"):
            # As words: fish has "-l pages" for "--pages".
            words = set(re.findall(r"[a-z][a-z-]*", completion(shell)))
            for command in commands():
                named = {option[2:] for option in options_of(command)} | {command}
                self.assertLessEqual(named, words, f"{shell}: {command}")

    def test_each_shell_that_is_here_can_read_its_script(self):
        for shell in ("bash", "zsh", "fish"):
            if shutil.which(shell):
                with tempfile.NamedTemporaryFile("w") as script:
                    script.write(completion(shell))
                    script.flush()
                    subprocess.run([shell, "-n", script.name], check=True)
        if shutil.which("fish"):
            asked = subprocess.run(["fish", "--no-config", "-c",
                                    "source -; complete -C 'mirabel ser'"], check=True, text=True,
                                   input=completion("fish"), stdout=subprocess.PIPE)
            self.assertRegex(asked.stdout, r"^serve\t")

    def test_the_manual_names_every_command_and_option(self):
        manual = (bus.SOURCE / "docs/man/mirabel.1.scd").read_text()
        self.assertGreater(len(commands()), 25)
        for command in commands():
            missing = [word for word in {command} | options_of(command) | options_of()
                       if f"*{word}*" not in manual]
            self.assertEqual(missing, [], command)


if __name__ == "__main__":
    unittest.main()
