"""The C interface, bound without a compiler: every name of its header with its arguments.

TAV_INSPECT_LIBRARY is the path of libtav-inspect.
"""
import ctypes
import os
import pathlib
import re
import sys
import tempfile
import unittest
from ctypes import POINTER, byref, c_char, c_char_p, c_int, c_int32, c_int64, c_size_t, c_uint8, c_uint16, c_uint32, \
    c_uint64, c_void_p

HEADER = pathlib.Path(__file__).resolve().parents[3] / "include/tav/tav_c.h"
OK, NO_MORE_CHILDREN, NOT_FOUND, BAD_PARAM = 0, 0x90000596, 0x9000059B, 0x9000000C


class Form(ctypes.Structure):
    _fields_ = [("byte_order", c_uint8), ("root_bits", c_uint8), ("aligned", c_uint8)]


class Node(ctypes.Structure):
    _fields_ = [("offset", c_uint64), ("size", c_uint64), ("info", c_uint32), ("type", c_uint16), ("elm", c_uint16),
                ("header_bits", c_uint8), ("is_group", c_uint8), ("payload", POINTER(c_uint8)),
                ("payload_size", c_uint64), ("reserved", c_uint64 * 4)]


Visit = ctypes.CFUNCTYPE(c_int, POINTER(Node), c_void_p)
READER = WRITER = c_void_p

FUNCTIONS = {
    "tav_open_file": (c_uint32, c_char_p, POINTER(Form), POINTER(READER)),
    "tav_open_memory": (c_uint32, c_void_p, c_size_t, POINTER(Form), POINTER(READER)),
    "tav_close": (None, READER),
    "tav_form_of": (c_uint32, READER, POINTER(Form)),
    "tav_last_message": (c_char_p, READER),
    "tav_next_root": (c_uint32, READER, POINTER(Node), POINTER(Node)),
    "tav_first_child": (c_uint32, READER, POINTER(Node), POINTER(Node)),
    "tav_next_sibling": (c_uint32, READER, POINTER(Node), POINTER(Node)),
    "tav_find": (c_uint32, READER, POINTER(Node), c_char_p, POINTER(Node)),
    "tav_find_each": (c_uint32, READER, POINTER(Node), c_char_p, Visit, c_void_p),
    "tav_get_u64": (c_uint32, READER, POINTER(Node), POINTER(c_uint64)),
    "tav_get_i64": (c_uint32, READER, POINTER(Node), POINTER(c_int64)),
    "tav_get_u128": (c_uint32, READER, POINTER(Node), POINTER(c_uint64), POINTER(c_uint64)),
    "tav_get_time": (c_uint32, READER, POINTER(Node), POINTER(c_int64)),
    "tav_get_text": (c_uint32, READER, POINTER(Node), POINTER(POINTER(c_char)), POINTER(c_size_t)),
    "tav_get_bytes": (c_uint32, READER, POINTER(Node), POINTER(POINTER(c_char)), POINTER(c_size_t)),
    "tav_read": (c_uint32, READER, POINTER(Node), c_uint64, c_void_p, POINTER(c_size_t)),
    "tav_tag": (c_char_p, c_uint16),
    "tav_id": (c_uint32, c_char_p, POINTER(c_uint16)),
    "tav_reader_dictionary": (c_uint32, READER, c_char_p),
    "tav_reader_tag": (c_char_p, READER, c_uint16),
    "tav_reader_id": (c_uint32, READER, c_char_p, POINTER(c_uint16)),
    "tav_message": (c_char_p, c_uint32),
    "tav_create_file": (c_uint32, c_char_p, POINTER(Form), c_uint32, POINTER(WRITER)),
    "tav_create_memory": (c_uint32, POINTER(Form), POINTER(WRITER)),
    "tav_begin": (c_uint32, WRITER, c_uint16, c_uint32),
    "tav_end": (c_uint32, WRITER),
    "tav_abandon": (c_uint32, WRITER),
    "tav_add_u32": (c_uint32, WRITER, c_uint16, c_uint32),
    "tav_add_u64": (c_uint32, WRITER, c_uint16, c_uint64),
    "tav_add_i32": (c_uint32, WRITER, c_uint16, c_int32),
    "tav_add_i64": (c_uint32, WRITER, c_uint16, c_int64),
    "tav_add_u128": (c_uint32, WRITER, c_uint16, c_uint64, c_uint64),
    "tav_add_text": (c_uint32, WRITER, c_uint16, c_char_p, c_size_t),
    "tav_add_bytes": (c_uint32, WRITER, c_uint16, c_char_p, c_size_t),
    "tav_add_time": (c_uint32, WRITER, c_uint16, c_int64),
    "tav_flush": (c_uint32, WRITER),
    "tav_sync": (c_uint32, WRITER),
    "tav_writer_message": (c_char_p, WRITER),
    "tav_finish": (c_uint32, POINTER(WRITER), POINTER(c_void_p), POINTER(c_size_t)),
    "tav_free": (None, c_void_p),
    "tav_discard": (None, POINTER(WRITER)),
}


def bind():
    library = ctypes.CDLL(os.environ["TAV_INSPECT_LIBRARY"])
    for name, (result, *arguments) in FUNCTIONS.items():
        function = getattr(library, name)
        function.restype, function.argtypes = result, arguments
    return library


class CInterface(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.tav = bind()

    def fine(self, rc):
        self.assertEqual(rc, OK, self.tav.tav_message(rc))

    def id_of(self, name):
        elm = c_uint16()
        self.fine(self.tav.tav_id(name, byref(elm)))
        return elm.value

    def fill(self, writer):
        tav = self.tav
        self.fine(tav.tav_begin(writer, self.id_of(b"system"), 0))
        self.fine(tav.tav_add_text(writer, self.id_of(b"hostName"), b"ada", 3))
        self.fine(tav.tav_add_u32(writer, self.id_of(b"cpuOnline"), 8))
        self.fine(tav.tav_begin(writer, self.id_of(b"host"), 0))
        self.fine(tav.tav_abandon(writer))
        self.fine(tav.tav_add_u64(writer, 40001, 2**64 - 1))
        self.fine(tav.tav_add_i32(writer, 40002, -1))
        self.fine(tav.tav_add_i64(writer, 40003, -2**63))
        self.fine(tav.tav_add_u128(writer, 40004, 1, 2))
        self.fine(tav.tav_add_bytes(writer, 40005, b"\0\1\2", 3))
        self.fine(tav.tav_add_time(writer, 40006, 1709202600123456000))
        self.fine(tav.tav_end(writer))

    def made(self, form=None):
        writer, data, size = WRITER(), c_void_p(), c_size_t()
        self.fine(self.tav.tav_create_memory(form, byref(writer)))
        self.fill(writer)
        self.fine(self.tav.tav_flush(writer))
        self.fine(self.tav.tav_sync(writer))
        self.assertEqual(self.tav.tav_writer_message(writer), b"")
        self.fine(self.tav.tav_finish(byref(writer), byref(data), byref(size)))
        self.assertIsNone(writer.value)
        stream = ctypes.string_at(data, size.value)
        self.tav.tav_free(data)
        return stream

    def test_every_function_of_the_header_is_bound(self):
        declared = re.findall(r"^TAV_C_API .*?(tav_\w+)\(", HEADER.read_text(encoding="utf-8"), re.M)
        self.assertEqual(sorted(declared), sorted(FUNCTIONS))
        self.assertEqual(ctypes.sizeof(Node), 80)

    def test_reads_what_it_has_recorded_into_memory(self):
        for order in (1, 2):
            for aligned in (1, 2):
                stream = self.made(byref(Form(order, 64, aligned)))
                self.look(stream, (order, 64, aligned))

    def test_reads_what_it_has_recorded_into_a_file(self):
        with tempfile.TemporaryDirectory() as folder:
            path = os.path.join(folder, "gr\u00fc\u00dfe.tav").encode()
            writer = WRITER()
            self.fine(self.tav.tav_create_file(path, None, 0, byref(writer)))
            self.fill(writer)
            self.fine(self.tav.tav_finish(byref(writer), None, None))
            self.assertNotEqual(self.tav.tav_create_file(path, None, 0, byref(writer)), OK)
            reader = READER()
            self.fine(self.tav.tav_open_file(path, None, byref(reader)))
            self.values(reader)
            self.tav.tav_close(reader)
            self.fine(self.tav.tav_create_file(path, None, 2, byref(writer)))
            self.tav.tav_discard(byref(writer))
            self.assertEqual(os.listdir(os.fsencode(folder)), [os.path.basename(path)])

    def look(self, stream, form):
        tav, reader, told = self.tav, READER(), Form()
        kept = ctypes.create_string_buffer(stream, len(stream))
        self.fine(tav.tav_open_memory(kept, len(stream), None, byref(reader)))
        self.fine(tav.tav_form_of(reader, byref(told)))
        self.assertEqual((told.byte_order, told.root_bits, told.aligned), form)
        self.values(reader)
        tav.tav_close(reader)

    def values(self, reader):
        tav, root, node = self.tav, Node(), Node()
        self.fine(tav.tav_next_root(reader, None, byref(root)))
        number, whole, high, low = c_uint64(), c_int64(), c_uint64(), c_uint64()
        text, size = POINTER(c_char)(), c_size_t()
        self.fine(tav.tav_find(reader, byref(root), b"hostName", byref(node)))
        self.assertEqual(tav.tav_tag(node.elm), b"hostName")
        self.fine(tav.tav_get_text(reader, byref(node), byref(text), byref(size)))
        self.assertEqual(text[:size.value], b"ada")
        self.assertEqual(bytes(node.payload[:node.payload_size]), b"ada")
        self.fine(tav.tav_find(reader, byref(root), b"#40001", byref(node)))
        self.fine(tav.tav_get_u64(reader, byref(node), byref(number)))
        self.assertEqual(number.value, 2**64 - 1)
        self.fine(tav.tav_next_sibling(reader, byref(node), byref(node)))
        self.fine(tav.tav_get_i64(reader, byref(node), byref(whole)))
        self.assertEqual(whole.value, -1)
        self.fine(tav.tav_find(reader, byref(root), b"#40004", byref(node)))
        self.fine(tav.tav_get_u128(reader, byref(node), byref(high), byref(low)))
        self.assertEqual((high.value, low.value), (1, 2))
        self.fine(tav.tav_find(reader, byref(root), b"#40005", byref(node)))
        self.fine(tav.tav_get_bytes(reader, byref(node), byref(text), byref(size)))
        self.assertEqual(text[:size.value], b"\0\1\2")
        room = ctypes.create_string_buffer(2)
        size.value = 2
        self.fine(tav.tav_read(reader, byref(node), 1, room, byref(size)))
        self.assertEqual(room.raw, b"\1\2")
        self.fine(tav.tav_find(reader, byref(root), b"#40006", byref(node)))
        self.fine(tav.tav_get_time(reader, byref(node), byref(whole)))
        self.assertEqual(whole.value, 1709202600123456000)
        elements = []
        visit = Visit(lambda found, _: elements.append(found.contents.elm) or 0)
        self.fine(tav.tav_find_each(reader, None, b"/system/*", visit, None))
        steps = []
        rc = tav.tav_first_child(reader, byref(root), byref(node))
        while rc == OK:
            steps.append(node.elm)
            rc = tav.tav_next_sibling(reader, byref(node), byref(node))
        self.assertEqual(rc, NO_MORE_CHILDREN)
        self.assertEqual(steps, elements)
        self.assertEqual(len(steps), 8)
        self.assertEqual(tav.tav_next_root(reader, byref(root), byref(root)), NO_MORE_CHILDREN)

    def test_names_of_own_elements(self):
        tav, reader, node, elm, number = self.tav, READER(), Node(), c_uint16(), c_uint64()
        stream = self.made()
        kept = ctypes.create_string_buffer(stream, len(stream))
        self.fine(tav.tav_open_memory(kept, len(stream), None, byref(reader)))
        self.assertIsNone(tav.tav_reader_tag(reader, 40001))
        self.assertEqual(tav.tav_reader_tag(reader, self.id_of(b"hostName")), b"hostName")
        self.assertEqual(tav.tav_reader_id(reader, b"largest", byref(elm)), NOT_FOUND)
        with tempfile.TemporaryDirectory() as folder:
            path = []
            for name, text in (("gr\u00fc\u00dfe.json", '{"40001": {"tag": "largest"}}'),
                               ("b.json", '{"40002": {"tag": "less"}}'), ("bad.json", '{"40001": {"tag": "other"}}')):
                path.append(os.fsencode(os.path.join(folder, name)))
                pathlib.Path(folder, name).write_text(text, encoding="utf-8")
            self.fine(tav.tav_reader_dictionary(reader, path[0]))
            self.fine(tav.tav_reader_dictionary(reader, path[1]))
            self.assertEqual(tav.tav_reader_dictionary(reader, path[2]), BAD_PARAM)
            says = b"%s: line 1, column 2: the id 40001 is given otherwise at %s: line 1, column 2"
            self.assertEqual(tav.tav_last_message(reader), says % (path[2], path[0]))
            self.assertNotIn(tav.tav_reader_dictionary(reader, path[0] + b"x"), (OK, BAD_PARAM))
        self.assertEqual([tav.tav_reader_tag(reader, id) for id in (40001, 40002, 40003)], [b"largest", b"less", None])
        self.fine(tav.tav_reader_id(reader, b"largest", byref(elm)))
        self.assertEqual(elm.value, 40001)
        self.fine(tav.tav_find(reader, None, b"/system/largest[../less < 0]", byref(node)))
        self.fine(tav.tav_get_u64(reader, byref(node), byref(number)))
        self.assertEqual(number.value, 2**64 - 1)
        self.assertEqual(tav.tav_find(reader, None, b"/system/largst", byref(node)), BAD_PARAM)
        self.assertIn(b"did you mean largest?", tav.tav_last_message(reader))
        self.assertEqual(tav.tav_reader_dictionary(None, b""), BAD_PARAM)
        self.assertEqual(tav.tav_reader_dictionary(reader, None), BAD_PARAM)
        self.assertEqual(tav.tav_reader_id(None, b"system", byref(elm)), BAD_PARAM)
        self.assertEqual(tav.tav_reader_id(reader, b"system", None), BAD_PARAM)
        self.assertIsNone(tav.tav_reader_tag(None, 40001))
        tav.tav_close(reader)

    def test_tells_what_is_wrong(self):
        tav, reader, node = self.tav, READER(), Node()
        self.assertEqual(tav.tav_open_memory(b"\0", 1, None, byref(reader)), NOT_FOUND)
        self.assertIsNone(reader.value)
        stream = self.made()
        kept = ctypes.create_string_buffer(stream, len(stream))
        self.fine(tav.tav_open_memory(kept, len(stream), None, byref(reader)))
        self.assertEqual(tav.tav_find(reader, None, b"/system/host", byref(node)), NOT_FOUND)
        self.assertEqual(tav.tav_last_message(reader), b"")
        self.assertEqual(tav.tav_find(reader, None, b"/system/hosst", byref(node)), BAD_PARAM)
        self.assertIn(b"hosst", tav.tav_last_message(reader))
        self.assertEqual(tav.tav_next_sibling(reader, None, byref(node)), BAD_PARAM)
        self.fine(tav.tav_find(reader, None, b"/system/hostName", byref(node)))
        self.assertNotEqual(tav.tav_get_u64(reader, byref(node), byref(c_uint64())), OK)
        self.assertRegex(tav.tav_last_message(reader), rb"^memory: 0x[0-9a-f]+ /system/hostName: .*\(TAV_RC_NOT_SUPPORTED\)$")
        tav.tav_close(reader)


if __name__ == "__main__":
    sys.exit(unittest.main())
