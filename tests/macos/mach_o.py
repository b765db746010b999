"""Reads what a Mach-O file says about itself: its segments, imports, exports, initialisers and signature.

Reads little-endian 64-bit files of one architecture. `Image` raises `Unreadable` for anything else, and for a file that
contradicts itself.
"""

import collections
import hashlib
import re
import struct

import loading

CPUS = {0x01000007: "x86_64", 0x0100000C: "arm64"}
EXECUTABLE = 2
# Flags of the header.
TWO_LEVEL, STACK_EXECUTION, PIE = 0x80, 0x20000, 0x200000
WRITE, EXECUTE = 2, 4
MACOS = 1

DYLIB_COMMANDS = {0xC: "required", 0x80000018: "weak", 0x8000001F: "re-exported", 0x80000023: "upward", 0x20: "lazy"}
SEGMENT, SYMBOL_TABLE = 0x19, 0x2
LOADER_ENVIRONMENT, RUN_PATH, OLD_VERSION, VERSION = 0x27, 0x8000001C, 0x24, 0x32
DYLD_INFO = (0x22, 0x80000022)
CHAINED_FIXUPS, EXPORTS_TRIE, CODE_SIGNATURE = 0x80000034, 0x80000033, 0x1D
INITIALISER_POINTERS, INITIALISER_OFFSETS = 0x9, 0x16
INSTRUCTIONS = 0x80000400

# `maximum` and `initial` are protections.
Segment = collections.namedtuple("Segment", "name address size offset length maximum initial sections")
Section = collections.namedtuple("Section", "segment name address size offset type is_code")
Dylib = collections.namedtuple("Dylib", "path kind")
Signature = collections.namedtuple("Signature", "is_ad_hoc limit page_size hashes executable_range")


class Unreadable(Exception):
    """The file is not what this module reads."""


class Image:
    """One file. Everything is read when it is made."""

    def __init__(self, path):
        self.path = path
        with open(path, "rb") as file:
            self.data = file.read()
        try:
            self._read()
        except (struct.error, IndexError, ValueError, KeyError) as error:
            raise Unreadable(f"{path}: is no 64-bit Mach-O file, or a damaged one ({error!r})") from error

    def _read(self):
        magic, cpu, _, self.type, count, _, self.flags, _ = struct.unpack_from("<8I", self.data)
        if magic != 0xFEEDFACF:
            raise ValueError(f"magic number {magic:#x}")
        self.cpu = CPUS[cpu]
        self.segments, self.dylibs, self.run_paths, self.environment = [], [], [], []
        self.platform = self.minimum = None
        self.has_local_symbols = False
        self.imports, self.exports = set(), {}  # The addresses of exports, by name.
        # The pointers that the system corrects at loading: by address, the address or the Import that it points to.
        self.pointers = {}
        self.signature = None
        found = {}
        at = 32
        for _ in range(count):
            command, size = struct.unpack_from("<2I", self.data, at)
            self._read_command(command, self.data[at:at + size], found)
            at += size
        # The tables below are read last, because they refer to segments by number.
        for command, body in found.items():
            if command in DYLD_INFO:
                offsets = struct.unpack_from("<10I", body, 8)
                rebases, binds, coalesced, lazy, exports = (
                    self.data[offset:offset + size] for offset, size in zip(offsets[::2], offsets[1::2]))
                loading.Rebases(self, rebases).run()
                loading.Binds(self, binds, library=0).run()
                loading.Binds(self, coalesced, library=loading.COALESCED).run()
                loading.Binds(self, lazy, library=0).run()
                loading.read_exports(self, exports)
                continue
            offset, size = struct.unpack_from("<2I", body, 8)
            part = self.data[offset:offset + size]
            if command == CHAINED_FIXUPS:
                loading.read_chains(self, part)
            elif command == EXPORTS_TRIE:
                loading.read_exports(self, part)
            else:
                self._read_signature(part)
                self.signature_offset = offset

    def _read_command(self, command, body, found):
        if command == SEGMENT:
            self._read_segment(body)
        elif command in DYLIB_COMMANDS:
            self.dylibs.append(Dylib(loading.text(body, struct.unpack_from("<I", body, 8)[0]), DYLIB_COMMANDS[command]))
        elif command in (RUN_PATH, LOADER_ENVIRONMENT):
            value = loading.text(body, struct.unpack_from("<I", body, 8)[0])
            (self.run_paths if command == RUN_PATH else self.environment).append(value)
        elif command in (VERSION, OLD_VERSION):
            platform, version = struct.unpack_from("<2I", body, 8) if command == VERSION else (
                MACOS, *struct.unpack_from("<I", body, 8))
            self.platform, self.minimum = platform, (version >> 16, version >> 8 & 0xFF)
        elif command == SYMBOL_TABLE:
            self._read_symbols(*struct.unpack_from("<2I", body, 8))
        elif command in (CHAINED_FIXUPS, EXPORTS_TRIE, CODE_SIGNATURE, *DYLD_INFO):
            found[command] = body

    def _read_segment(self, body):
        name, *numbers, count, _ = struct.unpack_from("<16s4Q4I", body, 8)
        name = name.rstrip(b"\0").decode()
        sections = []
        for index in range(count):
            section, _, address, size, offset, _, _, _, flags = struct.unpack_from("<16s16s2Q5I", body, 72 + 80 * index)
            sections.append(Section(name, section.rstrip(b"\0").decode(), address, size, offset, flags & 0xFF,
                                    bool(flags & INSTRUCTIONS)))
        segment = Segment(name, *numbers, sections)
        if segment.offset + segment.length > len(self.data):
            raise ValueError(f"{name} is longer than the file")
        self.segments.append(segment)

    def _read_symbols(self, offset, count):
        kinds = [self.data[offset + 16 * index + 4] for index in range(count)]
        # Symbols for debuggers have one of the upper bits, and those that other files see have the lowest one.
        self.has_local_symbols = any(kind & 0xE0 or not kind & 0x01 for kind in kinds)

    def _read_signature(self, part):
        """Reads the code directory: the hashes of the file's pages."""
        magic, _, count = struct.unpack_from(">3I", part)
        if magic != 0xFADE0CC0:
            raise ValueError(f"signature with magic number {magic:#x}")
        at = dict(struct.unpack_from(">2I", part, 12 + 8 * index) for index in range(count))[0]
        magic, size, version, flags, hashes, _, _, count, limit = struct.unpack_from(">9I", part, at)
        if magic != 0xFADE0C02 or version < 0x20400:
            raise ValueError(f"code directory with magic number {magic:#x} and version {version:#x}")
        hash_size, kind, _, page_size = struct.unpack_from("4B", part, at + 36)
        if (hash_size, kind) != (32, 2):
            raise ValueError(f"code directory with hashes of kind {kind}")
        start, length, _ = struct.unpack_from(">3Q", part, at + 64)
        directory = part[at:at + size]
        self.signature = Signature(
            bool(flags & 2), limit, 1 << page_size,
            [directory[hashes + 32 * index:hashes + 32 * index + 32] for index in range(count)], (start, length))

    def base(self):
        """Returns the address of the header."""
        return next(segment.address for segment in self.segments if segment.name == "__TEXT")

    def file_offset(self, address):
        for segment in self.segments:
            if segment.address <= address < segment.address + segment.length:
                return address - segment.address + segment.offset
        raise ValueError(f"the file has no byte for address {address:#x}")

    def pointer(self, address):
        """Returns what the pointer at the address points to after loading: an address or an Import."""
        return self.pointers.get(address, struct.unpack_from("<Q", self.data, self.file_offset(address))[0])

    def segment_at(self, address):
        """Returns the segment that contains the address, or None."""
        return next((segment for segment in self.segments
                     if segment.name != "__PAGEZERO" and segment.address <= address < segment.address + segment.size), None)

    def sections(self):
        return [section for segment in self.segments for section in segment.sections]

    def section_at(self, address):
        """Returns the section that contains the address, or None."""
        return next((section for section in self.sections()
                     if section.address <= address < section.address + section.size), None)

    def section(self, name):
        """Returns the section with the name, or None."""
        return next((section for section in self.sections() if section.name == name), None)

    def is_code(self, target):
        """Returns whether a pointer leads to code of this file. `target` is an address or an Import."""
        section = self.section_at(target) if isinstance(target, int) else None
        return section is not None and section.is_code

    def initialisers(self):
        """Returns the addresses of the initialisers, in the order in which the system calls them."""
        result = []
        for section in self.sections():
            if section.type == INITIALISER_POINTERS:
                result += [self.pointer(at) for at in range(section.address, section.address + section.size, 8)]
            elif section.type == INITIALISER_OFFSETS:
                offsets = struct.unpack_from(f"<{section.size // 4}I", self.data, section.offset)
                result += [self.base() + offset for offset in offsets]
        return result

    def damaged_pages(self):
        """Returns the numbers of the pages whose hash in the signature is wrong."""
        size, limit = self.signature.page_size, self.signature.limit
        pages = [self.data[start:min(start + size, limit)] for start in range(0, limit, size)]
        count = max(len(pages), len(self.signature.hashes))
        return [index for index in range(count)
                if index >= len(pages) or self.signature.hashes[index:index + 1] != [hashlib.sha256(pages[index]).digest()]]


def read_map(path):
    """Reads a map, which the linker writes. Returns a list of addresses, names of object files, and names of symbols."""
    files, symbols = {}, []
    with open(path, encoding="utf-8") as file:
        for line in file:
            entry = re.match(r"(?:(0x[0-9A-F]+)\t0x[0-9A-F]+\t)?\[ *(\d+)\] (.*)\n", line)
            if entry and entry[1]:
                symbols.append((int(entry[1], 16), files[entry[2]], entry[3]))
            elif entry:
                files[entry[2]] = entry[3]
    return symbols
