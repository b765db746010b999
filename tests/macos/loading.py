"""Reads the tables of a Mach-O file that the system's loader follows: the pointers to correct, the imports and the exports.

An image is a `mach_o.Image`. The functions fill its `pointers`, `imports` and `exports`.
"""

import collections
import struct

# `library` is the number of a dylib, counted from 1, or one of the numbers below.
Import = collections.namedtuple("Import", "name library is_weak")
ANY_IMAGE, COALESCED = -2, -3


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


def text(data, at=0):
    """Reads a text that a zero byte ends."""
    return data[at:data.index(b"\0", at)].decode()


def read_chains(image, part):
    """Reads the newer form: each page has a chain of pointers, and each of these has the distance to the next."""
    _, starts, table, names, count, form, _ = struct.unpack_from("<7I", part)
    imports = []
    for index in range(count):
        if form in (1, 2):
            bits, = struct.unpack_from("<I", part, table + index * 4 * form)
            library, is_weak, name = bits & 0xFF, bits >> 8 & 1, bits >> 9
            library -= 0x100 if library > 0xF0 else 0
        elif form == 3:
            bits, = struct.unpack_from("<Q", part, table + index * 16)
            library, is_weak, name = bits & 0xFFFF, bits >> 16 & 1, bits >> 32
            library -= 0x10000 if library > 0xFFF0 else 0
        else:
            raise ValueError(f"imports of form {form}")
        imports.append(Import(text(part, names + name), library, bool(is_weak)))
    image.imports.update(imports)
    for index in range(struct.unpack_from("<I", part, starts)[0]):
        offset, = struct.unpack_from("<I", part, starts + 4 + 4 * index)
        if offset != 0:
            read_pages(image, part, starts + offset, imports)


def read_pages(image, part, at, imports):
    """Reads the chains of one segment."""
    _, page_size, form, segment, _, count = struct.unpack_from("<I2HQIH", part, at)
    if form not in (2, 6):
        raise ValueError(f"pointers of form {form}")
    for page, start in enumerate(struct.unpack_from(f"<{count}H", part, at + 22)):
        address = image.base() + segment + page * page_size + start
        is_last = start == 0xFFFF  # A page without a chain.
        while not is_last:
            pointer, = struct.unpack_from("<Q", image.data, image.file_offset(address))
            if pointer >> 63:
                image.pointers[address] = imports[pointer & 0xFFFFFF]
            else:
                image.pointers[address] = (pointer & (1 << 36) - 1) + (image.base() if form == 6 else 0)
            distance = 4 * (pointer >> 51 & 0xFFF)
            address += distance
            is_last = distance == 0


class Machine:
    """Runs a table of the older form: a program for a small machine that walks over the segments.

    A subclass defines `step`, which runs one operation with its small operand. The result says how often to call `correct`
    then, and with which gap. A subclass defines that, too, for the pointer at `address`.
    """

    def __init__(self, image, part):
        self.image, self.part = image, part
        self.at = self.address = 0

    def run(self):
        while self.at < len(self.part):
            operation, operand = self.part[self.at] & 0xF0, self.part[self.at] & 0x0F
            self.at += 1
            times, gap = self.step(operation, operand) or (0, 0)
            for _ in range(times):
                self.correct()
                self.move(8 + gap)

    def number(self):
        result, self.at = number(self.part, self.at)
        return result

    def move(self, distance):
        """Moves on. A table goes back by adding large numbers."""
        self.address = self.address + distance & 0xFFFFFFFFFFFFFFFF

    def start(self, segment):
        self.address = self.image.segments[segment].address + self.number()


class Rebases(Machine):
    """Finds the pointers to addresses of the image itself."""

    def step(self, operation, operand):
        if operation in (0x00, 0x10):  # DONE, SET_TYPE_IMM
            return None
        if operation == 0x20:  # SET_SEGMENT_AND_OFFSET_ULEB
            return self.start(operand)
        if operation == 0x30:  # ADD_ADDR_ULEB
            return self.move(self.number())
        if operation == 0x40:  # ADD_ADDR_IMM_SCALED
            return self.move(8 * operand)
        if operation == 0x50:  # DO_REBASE_IMM_TIMES
            return operand, 0
        if operation == 0x60:  # DO_REBASE_ULEB_TIMES
            return self.number(), 0
        if operation == 0x70:  # DO_REBASE_ADD_ADDR_ULEB
            return 1, self.number()
        if operation == 0x80:  # DO_REBASE_ULEB_TIMES_SKIPPING_ULEB
            return self.number(), self.number()
        raise ValueError(f"rebase operation {operation:#x}")

    def correct(self):
        self.image.pointers[self.address], = struct.unpack_from(
            "<Q", self.image.data, self.image.file_offset(self.address))


class Binds(Machine):
    """Finds the pointers to imports. `library` is where they come from unless the table says otherwise."""

    def __init__(self, image, part, library):
        super().__init__(image, part)
        self.library, self.name, self.is_weak = library, "", False

    def step(self, operation, operand):
        if operation in (0x00, 0x50):  # DONE, SET_TYPE_IMM
            return None
        if operation == 0x10:  # SET_DYLIB_ORDINAL_IMM
            self.library = operand
            return None
        if operation == 0x20:  # SET_DYLIB_ORDINAL_ULEB
            self.library = self.number()
            return None
        if operation == 0x30:  # SET_DYLIB_SPECIAL_IMM
            self.library = operand - 0x10 if operand else 0
            return None
        if operation == 0x40:  # SET_SYMBOL_TRAILING_FLAGS_IMM
            self.name, self.is_weak = text(self.part, self.at), bool(operand & 1)
            self.at += len(self.name.encode()) + 1
            return None
        if operation == 0x60:  # SET_ADDEND_SLEB
            self.number()
            return None
        if operation == 0x70:  # SET_SEGMENT_AND_OFFSET_ULEB
            return self.start(operand)
        if operation == 0x80:  # ADD_ADDR_ULEB
            return self.move(self.number())
        if operation == 0x90:  # DO_BIND
            return 1, 0
        if operation == 0xA0:  # DO_BIND_ADD_ADDR_ULEB
            return 1, self.number()
        if operation == 0xB0:  # DO_BIND_ADD_ADDR_IMM_SCALED
            return 1, 8 * operand
        if operation == 0xC0:  # DO_BIND_ULEB_TIMES_SKIPPING_ULEB
            return self.number(), self.number()
        raise ValueError(f"bind operation {operation:#x}")

    def correct(self):
        self.image.pointers[self.address] = Import(self.name, self.library, self.is_weak)
        self.image.imports.add(self.image.pointers[self.address])


def read_exports(image, part):
    """Reads a tree whose edges have parts of the names."""
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
            image.exports[prefix.decode()] = image.base() + number(part, value)[0]
        at += size
        for _ in range(part[at]):
            end = part.index(b"\0", at + 1)
            child, after = number(part, end + 1)
            left.append((child, prefix + part[at + 1:end]))
            at = after - 1
