#!/usr/bin/env python3
"""Prints the regulatory images without waiting for them: the same library from another language, in an event loop."""
import ctypes
import select
import sys

quorvel = ctypes.CDLL("libquorvel.so.1")
OK, NOT_YET = 0, 10


class Error(ctypes.Structure):
    _fields_ = [("code", ctypes.c_int32), ("service_code", ctypes.c_int32), ("sentence", ctypes.c_char * 504)]


for function in ("quorvel_client_new", "quorvel_call_start"):
    getattr(quorvel, function).restype = ctypes.c_void_p
quorvel.quorvel_dictionary_next.restype = ctypes.c_bool  # of which only one byte counts
client = ctypes.c_void_p(quorvel.quorvel_client_new())
operation = b"copyRegulatoryImagesWithCompletionBlock:"
error, images = Error(), ctypes.c_void_p()
call = ctypes.c_void_p(quorvel.quorvel_call_start(client, operation, None, ctypes.byref(error)))
if not call:
    sys.exit(error.sentence.decode())
poll = select.poll()
poll.register(quorvel.quorvel_call_descriptor(call), select.POLLIN)
while (code := quorvel.quorvel_call_step(call, ctypes.byref(images), ctypes.byref(error))) == NOT_YET:
    poll.poll()
if code != OK:
    sys.exit(error.sentence.decode())

position, key, value = ctypes.c_size_t(0), ctypes.c_void_p(), ctypes.c_void_p()
text = ctypes.create_string_buffer(200)
while quorvel.quorvel_dictionary_next(images, ctypes.byref(position), ctypes.byref(key), ctypes.byref(value)):
    quorvel.quorvel_string_copy(key, text, ctypes.c_size_t(200))
    name = text.value.decode()
    quorvel.quorvel_value_describe(value, text, ctypes.c_size_t(200))
    print(f"{name} = {text.value.decode()}")
quorvel.quorvel_value_free(images)
quorvel.quorvel_call_free(call)
quorvel.quorvel_client_free(client)
