"""usage: check_dll_test.py CHECK-DLL DLL

Shows that scripts/check-dll passes the DLL, and none of several copies with one thing changed in each.
"""

import pathlib
import struct
import subprocess
import sys
import tempfile


def replaced(content, old, new):
    if content.count(old) < 1:
        sys.exit(f"the library has no {old!r}")
    return content.replace(old, new)


def with_header_field(content, offset, layout, change):
    """Changes a number at an offset from the portable executable's signature."""
    copy = bytearray(content)
    place = struct.unpack_from("<I", content, 0x3C)[0] + offset
    struct.pack_into(layout, copy, place, change(struct.unpack_from(layout, content, place)[0]))
    return bytes(copy)


def with_ordinal_base(content, change):
    """Changes the ordinal base, which is 16 bytes into the export table, which begins its section."""
    copy = bytearray(content)
    header = struct.unpack_from("<I", content, 0x3C)[0]
    sections = header + 24 + struct.unpack_from("<H", content, header + 20)[0]
    while content[sections : sections + 6] != b".edata":
        sections += 40
    place = struct.unpack_from("<I", content, sections + 20)[0] + 16
    struct.pack_into("<I", copy, place, change(struct.unpack_from("<I", content, place)[0]))
    return bytes(copy)


def with_version(content, change):
    """Changes the low half of the file's version, which is 12 bytes behind the signature of the version information."""
    copy = bytearray(content)
    place = content.index(struct.pack("<I", 0xFEEF04BD)) + 12
    struct.pack_into("<I", copy, place, change(struct.unpack_from("<I", content, place)[0]))
    return bytes(copy)


CHANGES = {
    "an export of another name": lambda dll: replaced(dll, b"d4fb86cecc88582a\0", b"d4fb86cecc88582b\0"),
    "ordinals moved by one": lambda dll: with_ordinal_base(dll, lambda base: base + 1),
    "a function that Windows XP lacks": lambda dll: replaced(dll, b"GetTickCount\0", b"GetTickCounX\0"),
    "a library that is not permitted": lambda dll: replaced(dll, b"ADVAPI32.dll\0", b"ADVAPI64.dll\0"),
    "another machine": lambda dll: with_header_field(dll, 4, "<H", lambda _: 0x8664),
    "no library": lambda dll: with_header_field(dll, 22, "<H", lambda flags: flags & ~0x2000),
    "for a later Windows": lambda dll: with_header_field(dll, 24 + 48, "<H", lambda _: 6),
    "symbols": lambda dll: with_header_field(dll, 16, "<I", lambda _: 4096),
    "symbols in another file": lambda dll: replaced(dll, b"ostra.dll.debug\0", b"ostra.dll.bogus\0"),
    "a fixed address": lambda dll: with_header_field(dll, 24 + 70, "<H", lambda flags: flags & ~0x40),
    "data that may be run": lambda dll: with_header_field(dll, 24 + 70, "<H", lambda flags: flags & ~0x100),
    "no relocations": lambda dll: with_header_field(dll, 24 + 96 + 8 * 5, "<I", lambda _: 0),
    "no resources": lambda dll: with_header_field(dll, 24 + 96 + 8 * 2, "<I", lambda _: 0),
    "another version": lambda dll: with_version(dll, lambda version: version + 1),
    "the time of the build": lambda dll: with_header_field(dll, 8, "<I", lambda _: 1),
}


def main():
    check, library = sys.argv[1:]
    content = pathlib.Path(library).read_bytes()

    def passes(tried):
        with tempfile.TemporaryDirectory() as folder:
            copy = pathlib.Path(folder, pathlib.Path(library).name)
            copy.write_bytes(tried)
            return subprocess.run([sys.executable, check, copy], capture_output=True, check=False).returncode == 0

    wrong = [] if passes(content) else ["the library itself does not pass"]
    wrong += [f"passes: {name}" for name, change in CHANGES.items() if passes(change(content))]
    print("\n".join(wrong))
    sys.exit(1 if wrong else 0)


if __name__ == "__main__":
    main()
