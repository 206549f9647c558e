"""A bus of a test's own, and a home that is served on it. Nothing reaches the session's bus."""

import os
import pathlib
import re
import select
import signal
import subprocess
import tempfile
import xml.etree.ElementTree

SOURCE = pathlib.Path(__file__).parents[2]
PROGRAM = os.environ["MIRABEL_PROGRAM"]
INTERFACE = SOURCE / "packaging/dbus/com.norvane.Vessel1.xml"
NAME = "com.norvane.Vessel1"
OBJECT = "/com/norvane/Vessel1"


class PrivateBus:
    """To be used in a with statement; at its end, whoever had the service's name has left too."""

    def __init__(self, data_folders="/usr/share"):
        self._folder = tempfile.TemporaryDirectory(dir=os.environ.get("MIRABEL_TEST_DIR"))
        self.home = pathlib.Path(self._folder.name, "home")
        (self.home / "Documents/Letters").mkdir(parents=True)
        # Short: an address has 107 bytes.
        self._sockets = tempfile.TemporaryDirectory(dir="/tmp")
        address = f"unix:path={self._sockets.name}/bus"
        self.environment = {
            "PATH": os.environ["PATH"], "LANG": "C.UTF-8", "HOME": str(self.home),
            "XDG_RUNTIME_DIR": self._sockets.name, "XDG_DATA_DIRS": data_folders,
            "DBUS_SESSION_BUS_ADDRESS": address}
        self._daemon = subprocess.Popen(
            ["dbus-daemon", "--session", "--nofork", "--nopidfile", "--nosyslog",
             f"--address={address}", "--print-address=1"],
            env=self.environment, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL, text=True)
        self._daemon.stdout.readline()  # it listens
        self._service = None

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.end_service()
        self._daemon.terminate()
        self._daemon.wait()
        self._daemon.stdout.close()
        self._folder.cleanup()
        self._sockets.cleanup()

    def serve(self):
        self._service = subprocess.Popen([PROGRAM, "--home", str(self.home), "serve"],
                                         env=self.environment, stderr=subprocess.DEVNULL)
        self.run("gdbus", "wait", "--session", "--timeout", "60", NAME)

    def end_service(self):
        if self._service:
            self._service.terminate()
            self._service.wait()
            self._service = None

    def run(self, *command):
        """The output of a command that succeeds."""
        return subprocess.run(command, env=self.environment, check=True, text=True,
                              stdout=subprocess.PIPE).stdout

    def call(self, method, *arguments):
        return self.run("gdbus", "call", "--session", "--dest", NAME, "--object-path", OBJECT,
                        "--method", f"{NAME}.{method}", *arguments)

    def introspected(self):
        return interfaces(self.run("gdbus", "introspect", "--session", "--dest", NAME,
                                   "--object-path", OBJECT, "--xml"))

    def ask_bus(self, method, *arguments):
        return self.run("gdbus", "call", "--session", "--dest", "org.freedesktop.DBus",
                        "--object-path", "/", "--method", f"org.freedesktop.DBus.{method}",
                        *arguments)

    def has_service(self):
        return "true" in self.ask_bus("NameHasOwner", NAME)

    def end_started_service(self):
        """Ends a service that the bus started, and waits until it has."""
        process = int(re.search(r"uint32 (\d+)", self.ask_bus("GetConnectionUnixProcessID", NAME))[1])
        end = os.pidfd_open(process)
        signal.pidfd_send_signal(end, signal.SIGTERM)
        ended, _, _ = select.select([end], [], [], 60)
        os.close(end)
        return bool(ended)


def interfaces(text):
    """The service's interfaces in an introspection text: members with all that is said of them."""
    found = {}
    for interface in xml.etree.ElementTree.fromstring(text).iter("interface"):
        if not interface.get("name").startswith(NAME):
            continue
        members = found[interface.get("name")] = {}
        for member in interface:
            arguments = [(argument.get("name"), argument.get("type"),
                          argument.get("direction", "out")) for argument in member.iter("arg")]
            annotations = {note.get("name"): note.get("value")
                           for note in member.iter("annotation")}
            members[member.tag, member.get("name")] = (
                arguments, annotations, member.get("type"), member.get("access"))
    return found
