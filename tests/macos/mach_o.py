"""Reads what a Mach-O file says about itself: its segments, imports, exports, initialisers and signature.

Reads little-endian 64-bit files of one architecture. `Image` raises `Unreadable` for anything else, and for a file that
contradicts itself.
"""

import collections
import hashlib
import re
import struct

CPUS = {0x01000007: "x86_64", 0x0100000C: "arm64"}
EXECUTABLE, DYLIB, BUNDLE = 2, 6, 8
# Flags of the header.
TWO_LEVEL, STACK_EXECUTION, PIE = 0x80, 0x20000, 0x200000
WRITE, EXECUTE = 2, 4
MACOS = 1

DYLIB_COMMANDS = {0xC: "required", 0x80000018: "weak", 0x8000001F: "re-exported", 0x80000023: "upward", 0x20: "lazy"}
DYLIB_IDENTIFIER, SEGMENT, SYMBOL_TABLE = 0xD, 0x19, 0x2
LOADER_ENVIRONMENT, RUN_PATH, OLD_VERSION, VERSION = 0x27, 0x8000001C, 0x24, 0x32
DYLD_INFO = (0x22, 0x80000022)
CHAINED_FIXUPS, EXPORTS_TRIE, CODE_SIGNATURE = 0x80000034, 0x80000033, 0x1D
INITIALISER_POINTERS, INITIALISER_OFFSETS = 0x9, 0x16

# `maximum` and `initial` are protections.
Segment = collections.namedtuple("Segment", "name address size offset length maximum initial sections")
Section = collections.namedtuple("Section", "segment name address size offset type")
Dylib = collections.namedtuple("Dylib", "path kind")
# `library` is the number of a dylib, counted from 1, or one of the numbers below.
Import = collections.namedtuple("Import", "name library is_weak")
OWN_IMAGE, MAIN_PROGRAM, ANY_IMAGE, COALESCED = 0, -1, -2, -3
Signature = collections.namedtuple("Signature", "identifier is_ad_hoc limit page_size hashes executable_range")


class Unreadable(Exception):
    """The file is not what this module reads."""


def number(data, at):
    """Reads a number in groups of seven bits. Returns it and the position behind it."""
    result = shift = 0
    while True:
        byte = data[at]
        at += 1
        result |= (byte & 0x7F) << shift
        shift += 7
        if byte < 0x80:
            return result, at


def signed_number(data, at):
    result, end = number(data, at)
    return result - (1 << 7 * (end - at)) if data[end - 1] & 0x40 else result, end


def wrapped(address):
    """Returns the address as the system computes it, which goes back by adding large numbers."""
    return address & 0xFFFFFFFFFFFFFFFF


def text(data, at=0):
    """Reads a text that a zero byte ends."""
    return data[at:data.index(b"\0", at)].decode()


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
        self.platform = self.minimum = self.name = None
        self.symbols = {}  # By address, the names of functions and variables that the file defines.
        self.has_local_symbols = False
        self.imports, self.exports = [], {}  # The addresses of exports, by name.
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
                parts = [self.data[offset:offset + size] for offset, size in zip(offsets[::2], offsets[1::2])]
                self._read_rebases(parts[0])
                for part in parts[1:4]:
                    self._read_binds(part, is_lazy=part is parts[3])
                self._read_exports(parts[4])
                continue
            offset, size = struct.unpack_from("<2I", body, 8)
            part = self.data[offset:offset + size]
            if command == CHAINED_FIXUPS:
                self._read_chains(part)
            elif command == EXPORTS_TRIE:
                self._read_exports(part)
            else:
                self._read_signature(part)
                self.signature_offset = offset

    def _read_command(self, command, body, found):
        if command == SEGMENT:
            self._read_segment(body)
        elif command in DYLIB_COMMANDS:
            self.dylibs.append(Dylib(text(body, struct.unpack_from("<I", body, 8)[0]), DYLIB_COMMANDS[command]))
        elif command in (DYLIB_IDENTIFIER, RUN_PATH, LOADER_ENVIRONMENT):
            value = text(body, struct.unpack_from("<I", body, 8)[0])
            if command == DYLIB_IDENTIFIER:
                self.name = value
            else:
                (self.run_paths if command == RUN_PATH else self.environment).append(value)
        elif command in (VERSION, OLD_VERSION):
            platform, version = struct.unpack_from("<2I", body, 8) if command == VERSION else (
                MACOS, *struct.unpack_from("<I", body, 8))
            self.platform, self.minimum = platform, (version >> 16, version >> 8 & 0xFF)
        elif command == SYMBOL_TABLE:
            self._read_symbols(*struct.unpack_from("<4I", body, 8))
        elif command in (CHAINED_FIXUPS, EXPORTS_TRIE, CODE_SIGNATURE, *DYLD_INFO):
            found[command] = body

    def _read_segment(self, body):
        name, *numbers, count, _ = struct.unpack_from("<16s4Q4I", body, 8)
        name = name.rstrip(b"\0").decode()
        sections = []
        for index in range(count):
            section, _, address, size, offset, _, _, _, flags = struct.unpack_from("<16s16s2Q5I", body, 72 + 80 * index)
            sections.append(Section(name, section.rstrip(b"\0").decode(), address, size, offset, flags & 0xFF))
        segment = Segment(name, *numbers, sections)
        if segment.offset + segment.length > len(self.data):
            raise ValueError(f"{name} is longer than the file")
        self.segments.append(segment)

    def _read_symbols(self, offset, count, names, size):
        names = self.data[names:names + size]
        for index in range(count):
            name, kind, section, _, value = struct.unpack_from("<I2BHQ", self.data, offset + 16 * index)
            is_debugging, is_external, is_defined = kind & 0xE0, kind & 0x01, section != 0
            self.has_local_symbols |= bool(is_debugging or not is_external)
            if is_defined and not is_debugging:
                self.symbols.setdefault(value, text(names, name))

    # The newer form of fixups: each page has a chain of pointers, and each of these has the distance to the next.

    def _read_chains(self, part):
        _, starts, imports, names, count, form, _ = struct.unpack_from("<7I", part)
        for index in range(count):
            if form in (1, 2):
                bits, = struct.unpack_from("<I", part, imports + index * 4 * form)
                library, is_weak, name = bits & 0xFF, bits >> 8 & 1, bits >> 9
                library -= 0x100 if library > 0xF0 else 0
            elif form == 3:
                bits, = struct.unpack_from("<Q", part, imports + index * 16)
                library, is_weak, name = bits & 0xFFFF, bits >> 16 & 1, bits >> 32
                library -= 0x10000 if library > 0xFFF0 else 0
            else:
                raise ValueError(f"imports of form {form}")
            self.imports.append(Import(text(part, names + name), library, bool(is_weak)))
        for index in range(struct.unpack_from("<I", part, starts)[0]):
            offset, = struct.unpack_from("<I", part, starts + 4 + 4 * index)
            if offset != 0:
                self._read_pages(part, starts + offset)

    def _read_pages(self, part, at):
        _, page_size, form, segment, _, count = struct.unpack_from("<I2HQIH", part, at)
        if form not in (2, 6):
            raise ValueError(f"pointers of form {form}")
        base = self.base()
        for page, start in enumerate(struct.unpack_from(f"<{count}H", part, at + 22)):
            address = base + segment + page * page_size + start
            while start != 0xFFFF:
                pointer, = struct.unpack_from("<Q", self.data, self.file_offset(address))
                if pointer >> 63:
                    self.pointers[address] = self.imports[pointer & 0xFFFFFF]
                else:
                    self.pointers[address] = (pointer & (1 << 36) - 1) + (base if form == 6 else 0)
                distance = pointer >> 51 & 0xFFF
                if distance == 0:
                    break
                address += 4 * distance

    # The older form of fixups: programs for a small machine that walks over the segments.

    def _read_rebases(self, part):
        at = address = 0
        while at < len(part):
            operation, value = part[at] & 0xF0, part[at] & 0x0F
            at += 1
            times, skip = 0, 0
            if operation == 0x20:
                offset, at = number(part, at)
                address = self.segments[value].address + offset
            elif operation == 0x30:
                offset, at = number(part, at)
                address = wrapped(address + offset)
            elif operation == 0x40:
                address = wrapped(address + 8 * value)
            elif operation == 0x50:
                times = value
            elif operation == 0x60:
                times, at = number(part, at)
            elif operation == 0x70:
                times = 1
                skip, at = number(part, at)
            elif operation == 0x80:
                times, at = number(part, at)
                skip, at = number(part, at)
            elif operation not in (0x00, 0x10):
                raise ValueError(f"rebase operation {operation:#x}")
            for _ in range(times):
                self.pointers[address], = struct.unpack_from("<Q", self.data, self.file_offset(address))
                address = wrapped(address + 8 + skip)

    def _read_binds(self, part, is_lazy):
        at = address = library = 0
        name, is_weak, seen = "", False, set(self.imports)
        # Coalesced binds name no library.
        if not is_lazy and part and part[0] & 0xF0 == 0x40:
            library = COALESCED
        while at < len(part):
            operation, value = part[at] & 0xF0, part[at] & 0x0F
            at += 1
            times, skip = 0, 0
            if operation == 0x10:
                library = value
            elif operation == 0x20:
                library, at = number(part, at)
            elif operation == 0x30:
                library = value - 0x10 if value else 0
            elif operation == 0x40:
                name, is_weak = text(part, at), bool(value & 1)
                at += len(name) + 1
            elif operation == 0x60:
                _, at = signed_number(part, at)
            elif operation == 0x70:
                offset, at = number(part, at)
                address = self.segments[value].address + offset
            elif operation == 0x80:
                offset, at = number(part, at)
                address = wrapped(address + offset)
            elif operation == 0x90:
                times = 1
            elif operation == 0xA0:
                times = 1
                skip, at = number(part, at)
            elif operation == 0xB0:
                times, skip = 1, 8 * value
            elif operation == 0xC0:
                times, at = number(part, at)
                skip, at = number(part, at)
            elif operation not in (0x00, 0x50):
                raise ValueError(f"bind operation {operation:#x}")
            for _ in range(times):
                bound = Import(name, library, is_weak)
                if bound not in seen:
                    seen.add(bound)
                    self.imports.append(bound)
                self.pointers[address] = bound
                address = wrapped(address + 8 + skip)

    def _read_exports(self, part):
        left = [(0, b"")] if part else []
        visited = set()
        while left:
            node, prefix = left.pop()
            if node in visited:
                raise ValueError("the exports are no tree")
            visited.add(node)
            size, at = number(part, node)
            if size:
                _, value = number(part, at)
                self.exports[prefix.decode()] = self.base() + number(part, value)[0]
            at += size
            for _ in range(part[at]):
                end = part.index(b"\0", at + 1)
                child, after = number(part, end + 1)
                left.append((child, prefix + part[at + 1:end]))
                at = after - 1

    def _read_signature(self, part):
        """Reads the code directory: the hashes of the file's pages."""
        magic, _, count = struct.unpack_from(">3I", part)
        if magic != 0xFADE0CC0:
            raise ValueError(f"signature with magic number {magic:#x}")
        at = dict(struct.unpack_from(">2I", part, 12 + 8 * index) for index in range(count))[0]
        magic, size, version, flags, hashes, identifier, _, count, limit = struct.unpack_from(">9I", part, at)
        if magic != 0xFADE0C02 or version < 0x20400:
            raise ValueError(f"code directory with magic number {magic:#x} and version {version:#x}")
        hash_size, kind, _, page_size = struct.unpack_from("4B", part, at + 36)
        if (hash_size, kind) != (32, 2):
            raise ValueError(f"code directory with hashes of kind {kind}")
        start, length, _ = struct.unpack_from(">3Q", part, at + 64)
        directory = part[at:at + size]
        self.signature = Signature(
            text(directory, identifier), bool(flags & 2), limit, 1 << page_size,
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
        segment = self.segment_at(target) if isinstance(target, int) else None
        return segment is not None and bool(segment.initial & EXECUTE)

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
