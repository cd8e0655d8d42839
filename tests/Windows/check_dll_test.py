"""usage: check_dll_test.py CHECK-DLL DLL

Shows that scripts/check-dll passes the DLL, and none of several copies with one thing changed in each.
"""

import pathlib
import struct
import subprocess
import sys
import tempfile


def header_of(content):
    """Where the portable executable's signature is."""
    return struct.unpack_from("<I", content, 0x3C)[0]


def export_table_of(content):
    """Where the export table is, which begins its section."""
    header = header_of(content)
    section = header + 24 + struct.unpack_from("<H", content, header + 20)[0]
    while content[section : section + 6] != b".edata":
        section += 40
    return struct.unpack_from("<I", content, section + 20)[0]


def version_of(content):
    """Where the version information is."""
    return content.index(struct.pack("<I", 0xFEEF04BD))


# What is replaced by what, or a number: what its place is counted from, how far behind that, its layout and its change.
CHANGES = {
    "an export of another name": (b"d4fb86cecc88582a\0", b"d4fb86cecc88582b\0"),
    "ordinals moved by one": (export_table_of, 16, "<I", lambda base: base + 1),
    "a function that Windows XP lacks": (b"GetTickCount\0", b"GetTickCounX\0"),
    "a library that is not permitted": (b"ADVAPI32.dll\0", b"ADVAPI64.dll\0"),
    "another machine": (header_of, 4, "<H", lambda _: 0x8664),
    "no library": (header_of, 22, "<H", lambda flags: flags & ~0x2000),
    "for a later Windows": (header_of, 24 + 48, "<H", lambda _: 6),
    "symbols": (header_of, 16, "<I", lambda _: 4096),
    "symbols in another file": (b"ostra.dll.debug\0", b"ostra.dll.bogus\0"),
    "a fixed address": (header_of, 24 + 70, "<H", lambda flags: flags & ~0x40),
    "data that may be run": (header_of, 24 + 70, "<H", lambda flags: flags & ~0x100),
    "no relocations": (header_of, 24 + 96 + 8 * 5, "<I", lambda _: 0),
    "no resources": (header_of, 24 + 96 + 8 * 2, "<I", lambda _: 0),
    "another version": (version_of, 12, "<I", lambda version: version + 1),
    "the time of the build": (header_of, 8, "<I", lambda _: 1),
}


def changed(content, change):
    if len(change) == 2:
        copy = content.replace(*change)
    else:
        start, offset, layout, number = change
        copy, place = bytearray(content), start(content) + offset
        struct.pack_into(layout, copy, place, number(struct.unpack_from(layout, content, place)[0]))
    return copy if copy != content else sys.exit(f"{change} changes nothing")


def main():
    check, library = sys.argv[1:]
    content = pathlib.Path(library).read_bytes()

    def passes(tried):
        with tempfile.TemporaryDirectory() as folder:
            copy = pathlib.Path(folder, pathlib.Path(library).name)
            copy.write_bytes(tried)
            return subprocess.run([sys.executable, check, copy], capture_output=True, check=False).returncode == 0

    wrong = [] if passes(content) else ["the library itself does not pass"]
    wrong += [f"passes: {name}" for name, change in CHANGES.items() if passes(changed(content, change))]
    print("\n".join(wrong))
    sys.exit(1 if wrong else 0)


if __name__ == "__main__":
    main()
