"""A client of the documents' service that knows D-Bus and nothing else. It lists, follows, reads and
imports in the folder of documents that it is given, and prints what it got."""

import os
import sys
import tempfile

from gi.repository import Gio, GLib

NAME = "com.norvane.Vessel1"
PATH = "/com/norvane/Vessel1"
ROOT = "VesselRootContainerItemIdentifier"


class Service:
    def __init__(self):
        self.bus = Gio.bus_get_sync(Gio.BusType.SESSION)

    def call(self, interface, method, arguments, files=None):
        reply, received = self.bus.call_with_unix_fd_list_sync(
            NAME, PATH, f"{NAME}.{interface}", method, arguments, None, 0, 30_000, files)
        return reply.unpack(), received

    def provider(self, method, signature, *arguments):
        return self.call("Provider", method, GLib.Variant(signature, arguments))[0]

    def items(self, container):
        items, page = [], b""
        while True:
            some, page = self.provider("ListItems", "(say)", container, bytes(page))
            items += some
            if not page:
                return items

    def changes(self, container, anchor):
        names, more = [], True
        while more:
            updated, deleted, anchor, more = self.provider(
                "EnumerateChanges", "(say)", container, bytes(anchor))
            names += [item["filename"] for item in updated] + deleted
        return names

    def wait_for_signal(self, act):
        loop, containers = GLib.MainLoop(), []

        def signalled(_bus, _sender, _path, _interface, _signal, arguments):
            containers.append(arguments.unpack()[0])
            loop.quit()

        self.bus.signal_subscribe(NAME, f"{NAME}.Provider", "EnumeratorSignaled", PATH, None,
                                  Gio.DBusSignalFlags.NONE, signalled)
        GLib.timeout_add_seconds(30, loop.quit)
        act()
        loop.run()
        return containers


def write(path, text):
    with open(path, "w", encoding="utf-8") as file:
        file.write(text)


def main(documents):
    service = Service()
    items = {item["filename"]: item for item in service.items(ROOT)}
    print("listed", sorted(items))
    letter, folder = items["letter.txt"], items["folder"]["itemIdentifier"]
    print("size", letter["documentSize"], "path", bytes(letter["path"]).decode() ==
          f"{documents}/letter.txt", "date", letter["creationDate"][0] > 0)

    anchor, = service.provider("GetCurrentSyncAnchor", "(s)", ROOT)
    service.provider("Watch", "(s)", ROOT)
    print("signalled", service.wait_for_signal(lambda: write(f"{documents}/new.txt", "new")))
    print("changed", sorted(set(service.changes(ROOT, anchor))))

    (index,), files = service.call(
        "Provider", "OpenItem", GLib.Variant("(ss)", (letter["itemIdentifier"], "r")))
    with os.fdopen(files.get(index)) as file:
        print("read", file.read())

    with tempfile.TemporaryFile() as file:
        file.write(b"imported text")
        file.flush()
        handed = Gio.UnixFDList.new()
        index = handed.append(file.fileno())
        (item,), _ = service.call("Operations", "ImportDocument", GLib.Variant(
            "(hssa{sv})", (index, "imported.txt", folder, {})), handed)
        print("imported", item["filename"], item["documentSize"], item["typeIdentifier"])

    try:
        service.provider("GetItem", "(s)", "did=99999")
    except GLib.Error as error:
        print("refused", Gio.DBusError.get_remote_error(error))


main(sys.argv[1])
