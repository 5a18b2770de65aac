"""A stand-in for BlueZ on a test's own bus: serves the objects that a file describes, until it is ended.

usage: stand_in_bluez.py ADDRESS FILE

The file: {path: {interface: {property: [D-Bus type, value]}}} as JSON; null: never answers. Prints a line when it is
there, and one for each question.
"""

import json
import pathlib
import sys

import dbus
import dbus.mainloop.glib
import dbus.service
from gi.repository import GLib

TYPES = {"s": dbus.String, "b": dbus.Boolean, "u": dbus.UInt32, "y": dbus.Byte, "i": dbus.Int32,
         "as": lambda texts: dbus.Array(texts, signature="s"),
         "ay": lambda text: dbus.Array(list(text.encode()), signature="y")}


class Root(dbus.service.Object):
    def __init__(self, bus, objects):
        super().__init__(bus, "/")
        self.objects = objects

    @dbus.service.method("org.freedesktop.DBus.ObjectManager", out_signature="a{oa{sa{sv}}}",
                         async_callbacks=("answer", "fail"))
    def GetManagedObjects(self, answer, fail):
        print("asked", flush=True)
        if self.objects is not None:
            answer({path: {interface: {name: TYPES[kind](value) for name, (kind, value) in properties.items()}
                           for interface, properties in interfaces.items()}
                    for path, interfaces in self.objects.items()})


dbus.mainloop.glib.DBusGMainLoop(set_as_default=True)
connection = dbus.bus.BusConnection(sys.argv[1])
root = Root(connection, json.loads(pathlib.Path(sys.argv[2]).read_text()))
name = dbus.service.BusName("org.bluez", connection)
print("ready", flush=True)
GLib.MainLoop().run()
