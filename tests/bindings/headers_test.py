#!/usr/bin/env python3
"""headers_test.py LIBRARY: what the description of the public headers holds, what it refuses to describe, and that
another reader of C (cffi) reads the same headers."""
import contextlib
import io
import pathlib
import subprocess
import sys
import tempfile
import unittest

import cffi

TREE = pathlib.Path(__file__).resolve().parents[2]
HEADERS = TREE / "include" / "kral"
sys.path.insert(0, str(TREE / "bindings"))

import exports  # noqa: E402
import headers  # noqa: E402
import make_labview  # noqa: E402

LIBRARY = None  # the shared library; set before any test runs

HEAD = '''/** @file kral.h A header. */
#define KRAL_VERSION_MAJOR 6
#define KRAL_VERSION_MINOR 0
#define KRAL_VERSION_PATCH 0
typedef uint32_t KRAL_HANDLE;
'''


def read(text):
    """The description of one header with a text of the test's."""
    with tempfile.TemporaryDirectory() as folder:
        pathlib.Path(folder, "kral.h").write_text(HEAD + text, encoding="utf-8")
        return headers.read(pathlib.Path(folder))


class Refusals(unittest.TestCase):
    def test_what_a_header_leaves_open_is_named(self):
        f = "KRAL_API uint8_t KRAL_CALL KRAL_F"
        cases = [
            ("a direction", f"/** F. @param value  it */ {f}(uint32_t* value);",
             "value: a pointer without a direction"),
            ("an unknown parameter", f"/** F. @param[out] other  it */ {f}(uint32_t* value);", "without a direction"),
            ("the size of bytes", f"/** F. @param[out] data  it */ {f}(uint8_t* data, uint32_t n);",
             "data: a buffer without its size"),
            ("the size of words", f"/** F. */ {f}(const uint16_t* items, uint32_t count);",
             "items: a buffer without its size"),
            ("a size that is nobody's", f"/** F. @param[out] words  them */ {f}(uint32_t* words, uint32_t count);",
             "no buffer has the size count; words?"),
            ("a size that is not there", f"/** F. @param[out] data  [length] it */ {f}(uint8_t* data, uint32_t size);",
             "its size length is no number"),
            ("an output to const", f"/** F. @param[out] data  [4] it */ {f}(const uint8_t* data);",
             "a pointer to const is an input"),
            ("a comment", f"{f}(KRAL_HANDLE handle);", "KRAL_F has no comment"),
            ("a type", f"/** F. */ {f}(long value);", "the type long cannot be described"),
            ("padding", "/** R. */ typedef struct KRAL_R { uint8_t a; uint32_t b; } KRAL_R;", "padding before b"),
            ("padding at the end", "/** R. */ typedef struct KRAL_R { uint32_t a; uint8_t b; } KRAL_R;",
             "padding at its end"),
            ("another thing", "/** R. */ typedef char KRAL_R[4];", "no handle, no record and no callback"),
            ("a number", '#define KRAL_X "text"', "KRAL_X is no number"),
            ("a macro's parameters", "#define KRAL_X(x) (x)", "KRAL_X is a macro with parameters"),
            ("the convention", "/** F. */ KRAL_API uint8_t KRAL_F(KRAL_HANDLE handle);", "no calling convention"),
            ("a callback's convention", "/** F. */ typedef void (*KRAL_F)(uint32_t value);", "no calling convention"),
            ("the export", f"/** F. */ {f}(KRAL_HANDLE handle); /** G. */ uint8_t KRAL_CALL KRAL_G(uint32_t value);",
             "kral.h:9: KRAL_G is not exported"),
            ("a later comment", f"/** F. */ {f}(uint32_t value); {f}2(uint32_t value);\n\n{f}3(uint32_t value);",
             "KRAL_F3 has no comment"),
            ("another parameter", f"/** F. @param other  it */ {f}(uint32_t value);", "no parameter other"),
            ("a direction that is none", f"/** F. @param[into] value  it */ {f}(uint32_t* value);",
             "into is no direction"),
            ("more parameters", f"/** F. */ {f}(uint32_t value, ...);", "takes ..., which"),
            ("any parameters", f"/** F. */ {f}();", "(void) has none"),
            ("a foreign type", f"/** F. */ {f}(size_t value);", "the type size_t cannot be described"),
            ("bits", "/** R. */ typedef struct KRAL_R { uint32_t a : 3; uint32_t b : 29; } KRAL_R;", "fields of bits"),
            ("no fields", "/** R. */ typedef struct KRAL_R KRAL_R;", "no handle, no record"),
            ("a constant's comment", "#define KRAL_X 1", "KRAL_X has no comment"),
            ("a field's comment", "/** R. */ typedef struct KRAL_R {\n  uint32_t a;\n} KRAL_R;", "KRAL_R, a has no"),
            ("a counted enumerator", "enum { KRAL_A };", "KRAL_A has no number"),
            ("no C", f"/** F. */ {f}(uint32_t value;", "kral.h:7: no C that can be read"),
            ("half of C", f"/** F. */ {f}(", "no C that can be read"),
            ("32 bits", "/** X. */\n#define KRAL_X 0x100000000", "has more than 32 bits"),
            ("an int", "/** X. */\n#define KRAL_X (-3000000000)", "is more than an int"),
            ("a shifted int", "/** X. */\n#define KRAL_X (1 << 31)", "is more than an int"),
            ("a fraction", "/** X. */\n#define KRAL_X 1.5", "KRAL_X is no number"),
            ("no C number", "/** X. */\n#define KRAL_X True", "KRAL_X is no number"),
            ("a second number", "/** X. */\n#define KRAL_X 1\n#define KRAL_X 2", "KRAL_X is declared twice"),
            ("a number's end", "/** X. */\n#define KRAL_X 1\n#undef KRAL_X", "kral.h:8: what only some"),
            ("a platform's number", "#ifdef _WIN32\n/** X. */\n#define KRAL_X 1\n#endif", "kral.h:8: what only some"),
            ("a platform's function", f"#if 0\n/** F. */ {f}(uint32_t value);\n#endif", "kral.h:8: what only some"),
            ("a second record", "/** R. */ typedef struct KRAL_R {\n  uint8_t a; /**< A. */\n} KRAL_R;\n" * 2,
             "KRAL_R is declared twice"),
            ("a second parameter", f"/** F. */ {f}(uint32_t value, uint32_t value);", "has two parameters value"),
            ("a size that does not count", f"/** F. @param[out] data  [n] it */ {f}(uint8_t* data, int32_t n);",
             "its size n is no number"),
            ("a pointer's owner", "/** F. */ KRAL_API const char* KRAL_CALL KRAL_F(uint32_t value);",
             "a pointer as a result"),
            ("a function's prefix", "/** F. */ KRAL_API uint8_t KRAL_CALL Odd(uint32_t value);", "begin with KRAL_"),
            ("a number's prefix", "/** X. */\n#define ODD 3", "ODD does not begin with KRAL_"),
            ("a header", '#include "kral/none.h"', "kral.h:6: there is no none.h"),
        ]
        for name, text, complaint in cases:
            with self.subTest(name):
                # Comments stand in a line of their own.
                complaints = read(text.replace("*/ ", "*/\n").replace("; /*", ";\n/*"))[1]
                self.assertTrue(any(complaint in said for said in complaints), complaints)

    def test_a_break_of_the_interface_is_seen_and_not_updated(self):
        present = ["constant KRAL_A 1", "function void KRAL_B(void)"]
        for name, listed, code, mended in [
                ("as it is", present, 0, True), ("something new", present[:1], 1, True), ("no list", [], 1, True),
                ("something that is gone", [*present, "function void KRAL_C(void)"], 1, False),
                ("another value", ["constant KRAL_A 2", present[1]], 1, False)]:
            with self.subTest(name), tempfile.TemporaryDirectory() as folder, \
                    contextlib.redirect_stdout(io.StringIO()) as said:
                path = pathlib.Path(folder, "list")
                path.write_text("".join(f"{line}\n" for line in listed), encoding="utf-8")
                self.assertEqual(exports.compare(present, path, False), code, said.getvalue())
                self.assertEqual(exports.compare(present, path, True), 0 if mended else 1, said.getvalue())
                self.assertEqual(path.read_text(encoding="utf-8").splitlines(), present if mended else listed)


class Numbers(unittest.TestCase):
    def test_constants_are_calculated_as_c_does(self):
        for expression, value in [
                ("~0u", 0xFFFFFFFF), ("(0u - 1u)", 0xFFFFFFFF), ("(-7 % 3)", -1), ("(-7 / 2)", -3), ("~0", -1),
                ("(KRAL_VERSION_MAJOR * 65536u - 7)", 393209), ("(-1 / 2u)", 0x7FFFFFFF),
                ("(1u << 31 | 1)", 0x80000001), ("0x80000000", 0x80000000), ("(-2147483647 - 1)", -2147483648)]:
            with self.subTest(expression):
                description, complaints = read(f"/** X. */\n#define KRAL_X {expression}\n")
                self.assertEqual(complaints, [])
                self.assertEqual(description.constants[-1].value, value)


class Description(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.description, cls.complaints = headers.read(HEADERS)
        cls.functions = {function.name: function for function in cls.description.functions}

    def test_the_headers_can_be_described(self):
        self.assertEqual(self.complaints, [])

    def test_directions_and_sizes(self):
        for function, name, direction, size in [
                ("KRAL_DIAG_GET_DIPSW_F", "switches", "out", ""), ("KRAL_SendSync", "response", "out", "response_size"),
                ("KRAL_SendSync", "response_size", "inout", ""), ("KRAL_SendSync", "request", "in", "request_size"),
                ("KRAL_FTM_DA_CAL", "response", "out", "response_size"), ("KRAL_EfsDelete", "efs_file", "in", "text"),
                ("KRAL_EfsDelete", "error_number", "out", ""), ("KRAL_DIAG_STATUS_F", "size", "inout", ""),
                ("KRAL_DIAG_MEMORY_POKE_WORD_F", "data", "in", "count"),
                ("KRAL_DIAG_NV_WRITE_EXT_F", "data", "in", "length"),
                ("KRAL_NV_GetNVValueStringByEfsFilename", "text", "out", "size"),
                ("KRAL_GetLibraryVersion", "text", "out", "KRAL_LIBRARY_VERSION_SIZE")]:
            argument = next(item for item in self.functions[function].arguments if item.name == name)
            self.assertEqual((function, name, argument.direction, argument.size), (function, name, direction, size))

    def test_the_compiler_agrees_about_records_and_constants(self):
        rows = []
        for record in self.description.records:
            rows.append(f"_Static_assert(sizeof({record.name}) == {record.size['64']}, \"{record.name}\");")
            rows += [f"_Static_assert(offsetof({record.name}, {field.name}) == {field.offset['64']}, \"\");"
                     for field in record.fields]
        rows += [f"_Static_assert({constant.name} == {constant.value}, \"{constant.name}\");"
                 for constant in self.description.constants]
        self.assertGreater(len(rows), 300)
        source = "#include <stddef.h>\n#include <kral/kral.h>\n" + "\n".join(rows)
        subprocess.run(["cc", "-std=c11", "-fsyntax-only", "-I", HEADERS.parent, "-x", "c", "-"], input=source,
                       text=True, check=True)

    def test_cffi_reads_the_headers(self):
        text = subprocess.run(["cc", "-E", "-P", "-D__attribute__(x)=", "-I", HEADERS.parent, HEADERS / "kral.h"],
                              check=True, capture_output=True, text=True).stdout
        ffi = cffi.FFI()
        ffi.cdef(text)
        library = ffi.dlopen(LIBRARY)
        self.assertEqual([name for name in self.functions if not callable(getattr(library, name))], [])
        self.assertEqual(library.KRAL_Band_Helper_CalculateULFrequency(1, 60), 902.0)
        for record in self.description.records:
            self.assertEqual(ffi.sizeof(record.name), record.size["64"])

    def test_the_page_for_labview_knows_every_type_and_callback(self):
        page = (TREE / "docs" / "labview.md").read_text(encoding="utf-8")
        callbacks = {callback.name for callback in self.description.callbacks}
        kinds = [(function.name, kind) for function in self.description.functions
                 for kind in (function.result, *(argument.type for argument in function.arguments))]
        wanted = {name for name, kind in kinds if kind.name in callbacks}
        wanted |= {make_labview.spelled(kind) for _, kind in kinds
                   if kind.name in make_labview.SCALARS and kind.pointers != 1 and kind.name != "void"}
        self.assertGreater(len(wanted), 15)
        self.assertEqual({each for each in wanted if f"`{each}`" not in page}, set())

    def test_the_list_has_every_function_once(self):
        rows = [row for row in exports.lines_of(self.description) if row.startswith("function ")]
        self.assertEqual(len(rows), len(self.functions))
        self.assertEqual(len(rows), len(set(rows)))


if __name__ == "__main__":
    LIBRARY = sys.argv.pop(1)
    unittest.main(verbosity=1)
