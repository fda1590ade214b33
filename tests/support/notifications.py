#!/usr/bin/python3
"""Takes notifications on the session bus, in a desktop's place: prints "ready", then the summary of each.

Ends when it is terminated, or with the bus.
"""

from gi.repository import Gio, GLib

NAME, PATH = "org.freedesktop.Notifications", "/org/freedesktop/Notifications"
INTERFACE = """<node><interface name='org.freedesktop.Notifications'>
<method name='Notify'><arg name='application' type='s' direction='in'/><arg name='replaces' type='u' direction='in'/>
<arg name='icon' type='s' direction='in'/><arg name='summary' type='s' direction='in'/>
<arg name='body' type='s' direction='in'/><arg name='actions' type='as' direction='in'/>
<arg name='hints' type='a{sv}' direction='in'/><arg name='expires' type='i' direction='in'/>
<arg name='id' type='u' direction='out'/></method>
</interface></node>"""


def called(_connection, _client, _path, _interface, _method, arguments, invocation):
    print(arguments.unpack()[3], flush=True)
    invocation.return_value(GLib.Variant("(u)", (1,)))


connection = Gio.bus_get_sync(Gio.BusType.SESSION)
connection.register_object(PATH, Gio.DBusNodeInfo.new_for_xml(INTERFACE).interfaces[0], called, None, None)
Gio.bus_own_name_on_connection(connection, NAME, Gio.BusNameOwnerFlags.NONE, lambda *_: print("ready", flush=True), None)
GLib.MainLoop().run()
