#!/usr/bin/python3
"""Answers the questions of gnome-keyring on the session bus, in a user's place.

usage: prompter.py ok [PASSWORD] | refuse | silent

  ok      consents to everything and gives the password where one is wanted
  refuse  cancels every question
  silent  takes every question and never answers
Prints "ready" when it can be asked, and then one line for each question. Ends when it is terminated.
"""

import base64
import ctypes
import hashlib
import hmac
import os
import sys

from gi.repository import Gio, GLib

NAME, PATH = "org.gnome.keyring.SystemPrompter", "/org/gnome/keyring/Prompter"
CALLBACK = "org.gnome.keyring.internal.Prompter.Callback"
INTERFACE = """<node><interface name='org.gnome.keyring.internal.Prompter'>
<method name='BeginPrompting'><arg name='callback' type='o' direction='in'/></method>
<method name='PerformPrompt'><arg name='callback' type='o' direction='in'/><arg name='type' type='s' direction='in'/>
<arg name='properties' type='a{sv}' direction='in'/><arg name='exchange' type='s' direction='in'/></method>
<method name='StopPrompting'><arg name='callback' type='o' direction='in'/></method>
</interface></node>"""
# The 1536-bit group of RFC 3526's family that the exchange is defined over.
PRIME = int("FFFFFFFFFFFFFFFFC90FDAA22168C234C4C6628B80DC1CD129024E088A67CC74020BBEA63B139B22514A08798E3404DD"
            "EF9519B3CD3A431B302B0A6DF25F14374FE1356D6D51C245E485B576625E7EC6F44C42E9A637ED6B0BFF5CB6F406B7ED"
            "EE386BFB5A899FA5AE9F24117C4B1FE649286651ECE45B3DC2007CB8A163BF0598DA48361C55D39A69163FA8FD24CF5F"
            "83655D23DCA3AD961C62F356208552BB9ED529077096966D670C354E4ABC9804F1746C08CA237327FFFFFFFFFFFFFFFF", 16)
SIZE = 192


def aes_cbc(key, vector, text):
    """AES-128 in CBC mode, with the padding of PKCS 7, by the C library that the keyring uses too."""
    library = ctypes.CDLL("libgcrypt.so.20")
    library.gcry_check_version(None)
    handle = ctypes.c_void_p()
    assert library.gcry_cipher_open(ctypes.byref(handle), 7, 3, 0) == 0  # AES128, CBC
    padding = 16 - len(text) % 16
    text += bytes([padding]) * padding
    result = ctypes.create_string_buffer(len(text))
    library.gcry_cipher_setkey(handle, key, ctypes.c_size_t(16))
    library.gcry_cipher_setiv(handle, vector, ctypes.c_size_t(16))
    assert library.gcry_cipher_encrypt(handle, result, ctypes.c_size_t(len(text)), text,
                                       ctypes.c_size_t(len(text))) == 0
    library.gcry_cipher_close(handle)
    return result.raw


class Exchange:
    """The prompter's half of the secret exchange: agrees on a key and sends the password under it."""

    def __init__(self):
        self._private = int.from_bytes(os.urandom(SIZE), "big") % PRIME
        self._public = pow(2, self._private, PRIME).to_bytes(SIZE, "big")

    def _encode(self, fields):
        lines = [f"{name}={base64.b64encode(value).decode()}" for name, value in fields.items()]
        return "\n".join(["[sx-aes-1]", *lines, ""])

    def begin(self):
        return self._encode({"public": self._public})

    def send(self, received, password):
        theirs = next(line.split("=", 1)[1] for line in received.splitlines() if line.startswith("public="))
        shared = pow(int.from_bytes(base64.b64decode(theirs), "big"), self._private, PRIME)
        # The keyring derives the key from the number's own bytes, and one number in 256 is a byte shorter.
        shared = shared.to_bytes((shared.bit_length() + 7) // 8, "big")
        derived = hmac.new(bytes(32), shared, hashlib.sha256).digest()
        key = hmac.new(derived, b"\x01", hashlib.sha256).digest()[:16]
        vector = os.urandom(16)
        return self._encode({"public": self._public, "secret": aes_cbc(key, vector, password), "iv": vector})


class Prompter:
    def __init__(self, connection, answer, password):
        self._connection, self._answer, self._password = connection, answer, password
        self._exchanges = {}
        interface = Gio.DBusNodeInfo.new_for_xml(INTERFACE).interfaces[0]
        connection.register_object(PATH, interface, self._called, None, None)

    def _tell(self, client, callback, method, arguments):
        self._connection.call(client, callback, CALLBACK, method, arguments, None, Gio.DBusCallFlags.NONE, -1, None, None)

    def _ready(self, client, callback, reply, exchange):
        self._tell(client, callback, "PromptReady", GLib.Variant("(sa{sv}s)", (reply, {}, exchange)))

    def _called(self, _connection, client, _path, _interface, method, arguments, invocation):
        callback, *rest = arguments.unpack()
        invocation.return_value(None)
        if method == "StopPrompting":
            self._tell(client, callback, "PromptDone", None)
        elif self._answer == "silent":
            print(method, flush=True)
        elif method == "BeginPrompting":
            self._exchanges[callback] = Exchange()
            self._ready(client, callback, "", self._exchanges[callback].begin())
        else:
            kind, _properties, received = rest
            print(kind, flush=True)
            reply = "no" if self._answer == "refuse" else "yes"
            exchange = self._exchanges[callback]
            secret = exchange.send(received, self._password) if kind == "password" and reply == "yes" else exchange.begin()
            self._ready(client, callback, reply, secret)


def main():
    connection = Gio.bus_get_sync(Gio.BusType.SESSION)
    Prompter(connection, sys.argv[1], sys.argv[2].encode() if len(sys.argv) > 2 else b"")
    Gio.bus_own_name_on_connection(connection, NAME, Gio.BusNameOwnerFlags.REPLACE,
                                   lambda *_: print("ready", flush=True), None)
    GLib.MainLoop().run()


if __name__ == "__main__":
    main()
