#!/usr/bin/env python3
"""Follows what a container of the service holds, and prints what comes and goes.

usage: follow.py [CONTAINER]      by default everything that is shown
"""

import sys

from gi.repository import Gio, GLib

NAME = "com.norvane.Vessel1"
OBJECT = "/com/norvane/Vessel1"
PROVIDER = "com.norvane.Vessel1.Provider"
EXPIRED = "com.norvane.Vessel1.Error.SyncAnchorExpired"
EVERYTHING = "VesselWorkingSetContainerItemIdentifier"
# Containers that are made of several folders; any other is one folder.
SETS = (EVERYTHING, "VesselAllDirectoriesContainerItemIdentifier")


class Follower:
    def __init__(self, bus, container):
        self.bus = bus
        self.container = container
        self.names = {}
        self.anchor = None  # a client that ends keeps both, and goes on from here

    def call(self, method, signature, *arguments):
        # No timeout: the first question after a start costs a look at each file.
        return self.bus.call_sync(NAME, OBJECT, PROVIDER, method,
                                  GLib.Variant(signature, arguments), None,
                                  Gio.DBusCallFlags.NO_AUTO_START, GLib.MAXINT32, None).unpack()

    def holds(self, item):
        # The changes of a folder tell of things that lie elsewhere too: of what has left it.
        return self.container in SETS or item["parentItemIdentifier"] == self.container

    def forget(self, identifier):
        if identifier in self.names:  # some it may never have known
            print("gone:", self.names.pop(identifier), flush=True)

    def list_all(self):
        # The anchor comes first, so that what happens during the listing is told afterwards.
        (anchor,) = self.call("GetCurrentSyncAnchor", "(s)", self.container)
        names, page = {}, None
        while page is None or page:  # an empty page begins, and an empty page ends
            items, page = self.call("ListItems", "(say)", self.container, page or [])
            names.update((item["itemIdentifier"], item["filename"]) for item in items)
        self.names, self.anchor = names, anchor
        print(f"listed: {len(names)} items", flush=True)

    def apply_changes(self):
        more = True
        while more:
            updated, deleted, self.anchor, more = self.call("EnumerateChanges", "(say)",
                                                            self.container, self.anchor)
            for identifier in deleted:
                self.forget(identifier)
            for item in updated:
                if not self.holds(item):
                    self.forget(item["itemIdentifier"])
                    continue
                self.names[item["itemIdentifier"]] = item["filename"]
                print("there:", item["filename"], flush=True)

    def bring_up_to_date(self, *_):
        while True:
            try:
                if self.anchor is None:
                    self.list_all()
                return self.apply_changes()
            except GLib.Error as error:
                if Gio.DBusError.get_remote_error(error) != EXPIRED:
                    raise
                self.anchor = None  # what has happened since can't be told exactly: start over

    def appeared(self, *_):
        # Also when the service was started anew: the anchor holds, the watch does not.
        self.call("Watch", "(s)", self.container)
        self.bring_up_to_date()


def main():
    bus = Gio.bus_get_sync(Gio.BusType.SESSION)
    follower = Follower(bus, sys.argv[1] if len(sys.argv) > 1 else EVERYTHING)
    bus.signal_subscribe(NAME, PROVIDER, "EnumeratorSignaled", OBJECT, follower.container,
                         Gio.DBusSignalFlags.NONE, follower.bring_up_to_date)
    Gio.bus_watch_name_on_connection(bus, NAME, Gio.BusNameWatcherFlags.AUTO_START,
                                     follower.appeared, None)
    GLib.MainLoop().run()


if __name__ == "__main__":
    try:
        main()
    except KeyboardInterrupt:
        sys.exit(130)  # as a shell has it of a program that SIGINT ended
