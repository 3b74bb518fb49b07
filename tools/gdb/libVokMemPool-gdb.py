"""gdb and the pools of libVokMemPool, in a process or a core file:

mempool list             the pools, with what each holds
mempool report NAME      a pool by size classes
mempool of ADDRESS       which record it lies in, of which pool, and its neighbours

and values of the types Mgr, Allocator, Resource, Deleter, ThreadPools, ThreadResource and
ThreadAllocator with the names of their pools. The commands need no debug information: the library
describes its own layout. They believe nothing that they read: a walk ends where the memory is
damaged, and says so.
"""
import struct

import gdb
import gdb.printing
import gdb.types

FORMAT = 1
# The fields of s/diagnostics/Layout.h, in its order.
STRUCTURES = {
    "entry": "name pool next size",
    "mgr": "bucketMgr size",
    "bucketMgr": "mgr groups extRecs numGroups numExtRecs bucketSize dataAlignment maxRecSize "
                 "minRecSize enabled size",
    "group": "owner head1 head2 numBuckets numFreeBuckets dataSize size",
    "bucket": "parent next1 prev1 next2 prev2 recsSize recSize freeHead freeRecs size",
    "rec": "offsetLow offsetHigh type size",
    "extRec": "next prev length tag0 tag1 type tag3 size",
}
MAX_GROUPS = 65536
FREE, USED, EXT = 0, 1, 2


def memory(address, size):
    """The bytes there, None if they can't be read."""
    try:
        return bytes(gdb.selected_inferior().read_memory(address, size))
    except (gdb.MemoryError, OverflowError):
        return None


class Layout:
    """Where the fields of a structure are; and the structures that can be read."""

    def __init__(self):
        try:
            at = int(gdb.parse_and_eval("&'VOK::MemPool::layout'"))
        except gdb.error:
            raise gdb.GdbError("mempool: libVokMemPool isn't loaded, or is older than 1.1") from None
        head = memory(at, 32)
        if head is None or head[:16] != b"VokMemPoolLayout":
            raise gdb.GdbError("mempool: the library's description of its layout can't be read")
        number, self.width = struct.unpack("=II", head[24:])
        if number != FORMAT or self.width not in (4, 8):
            raise gdb.GdbError(f"mempool: the library describes its layout in format {number}, "
                               f"this script reads {FORMAT}")
        self.pointer = "=I" if self.width == 4 else "=Q"
        self.first = self.read_pointer(at + 32 + self.width)
        at += 32 + 2 * self.width
        self.structures = {name: {} for name in STRUCTURES}
        places = [(name, field) for name in STRUCTURES for field in STRUCTURES[name].split()]
        offsets = memory(at, 4 * len(places))
        if offsets is None:
            raise gdb.GdbError("mempool: the library's description of its layout can't be read")
        for (name, field), (offset,) in zip(places, struct.iter_unpack("=I", offsets)):
            self.structures[name][field] = offset

    def read_pointer(self, address):
        data = memory(address, self.width)
        return 0 if data is None else struct.unpack(self.pointer, data)[0]

    def fetch(self, kind, address):
        """A structure, None if it can't be read."""
        fields = self.structures[kind]
        data = memory(address, fields["size"])
        return None if data is None else Structure(self, fields, address, data)

    def follow(self, kind, address, link, damages):
        """The structures of a list; what stops before its end is added to the damages."""
        seen = set()
        while address != 0:
            found = self.fetch(kind, address)
            if found is None or address in seen:
                damages.append(f"a link leads to {address:#x}")
                return
            seen.add(address)
            yield found
            address = found.pointer(link)

    def entries(self, damages):
        """The name of each pool, and its address."""
        for entry in self.follow("entry", self.read_pointer(self.first), "next", damages):
            yield text_at(entry.pointer("name")), entry.pointer("pool")


class Structure:
    """A copy of one, whose fields are read by name."""

    def __init__(self, layout, fields, address, data):
        self.layout, self.fields, self.address, self.data = layout, fields, address, data
        self.end = address + len(data)

    def _get(self, field, form):
        return struct.unpack_from(form, self.data, self.fields[field])[0]

    def pointer(self, field):
        return self._get(field, self.layout.pointer)

    def word(self, field):
        return self._get(field, "=I")

    def half(self, field):
        return self._get(field, "=H")

    def byte(self, field):
        return self.data[self.fields[field]]


class Bucket:
    """A bucket and its records, which follow its header."""

    def __init__(self, header):
        self.address, self.header = header.address, header
        self.rec_size, size = header.half("recSize"), header.half("recsSize")
        self.total = (size - 2) // self.rec_size if self.rec_size and size >= 2 else 0
        self.free = min(header.half("freeRecs"), self.total)
        self.used = self.total - self.free
        self.end = header.end + self.total * self.rec_size

    def record(self, index):
        """The address of its data, and whether it is used, free or damaged."""
        rec = self.header.layout.structures["rec"]
        at = self.header.end + index * self.rec_size
        head = memory(at, rec["size"])
        kind = head[rec["type"]] if head else None
        return at + rec["size"], {FREE: "free", USED: "used"}.get(kind, "damaged")


class Pool:
    """A pool: its size classes with their buckets, its ext records, and what stopped a walk."""

    def __init__(self, layout, name, address):
        self.layout, self.name, self.address = layout, name, address
        self.classes, self.exts, self.damages = [], [], []
        self.body = layout.fetch("bucketMgr", address)
        if self.body is None:
            self.damages.append(f"the pool at {address:#x} can't be read")
            return
        self.is_off = self.body.byte("enabled") == 0
        self._read_classes()
        for ext in layout.follow("extRec", self.body.pointer("extRecs"), "next", self.damages):
            if ext.byte("type") != EXT:
                self.damages.append(f"the ext record at {ext.end:#x} has another type")
                break
            self.exts.append(ext)

    def _read_classes(self):
        count, width = self.body.word("numGroups"), self.layout.width
        table = memory(self.body.pointer("groups"), count * width) if 0 < count <= MAX_GROUPS else None
        if table is None:
            if count:
                self.damages.append("the table of size classes can't be read")
            return
        for (address,) in struct.iter_unpack(self.layout.pointer, table):
            group = self.layout.fetch("group", address) if address else None
            if group is not None and group.pointer("owner") == self.address:
                buckets = []
                for header in self.layout.follow("bucket", group.pointer("head1"), "next1", self.damages):
                    if header.pointer("parent") != address:
                        self.damages.append(f"the bucket at {header.address:#x} has another parent")
                        break
                    buckets.append(Bucket(header))
                    if header.half("freeRecs") > buckets[-1].total:
                        self.damages.append(f"the bucket at {header.address:#x} has wrong counts")
                if buckets:
                    self.classes.append((group.half("dataSize"), buckets))
            elif address:
                self.damages.append(f"the size class at {address:#x} is another pool's, or can't be read")

    def buckets(self):
        for _, buckets in self.classes:
            yield from buckets

    def sums(self):
        """Used and free records, ext records, buckets, bytes held."""
        buckets = list(self.buckets())
        held = sum(b.end - b.address for b in buckets)
        held += sum(ext.end - ext.address + ext.word("length") for ext in self.exts)
        return (sum(b.used for b in buckets), sum(b.free for b in buckets), len(self.exts),
                len(buckets), held)

    def find(self, address):
        """Lines on what is at the address, None if it isn't in this pool."""
        for bucket in self.buckets():
            if bucket.address <= address < bucket.end:
                return self._in_bucket(bucket, address)
        for ext in self.exts:
            if ext.address <= address < ext.end + ext.word("length"):
                what = f"byte {address - ext.end}" if address >= ext.end else "in the header"
                return [f"{address:#x}: {what} of the ext record at {ext.end:#x}, used, "
                        f"{ext.word('length')} bytes", f"  pool '{self.name}'"]
        return None

    def _in_bucket(self, bucket, address):
        place = f"  pool '{self.name}', bucket {bucket.address:#x} with records of {bucket.rec_size} bytes"
        if address < bucket.header.end:
            return [f"{address:#x}: in the header of a bucket", place]
        index = (address - bucket.header.end) // bucket.rec_size

        def line(i, what):
            data, state = bucket.record(i)
            return f"{what}record {i + 1} of {bucket.total} at {data:#x}, {state}"

        data = bucket.record(index)[0]
        what = f"byte {address - data} of " if address >= data else "in the header of "
        lines = [f"{address:#x}: " + line(index, what), place]
        if index > 0:
            lines.append(line(index - 1, "  before it: "))
        if index + 1 < bucket.total:
            lines.append(line(index + 1, "  after it: "))
        return lines


def all_pools():
    """The pools by name. What stops their list is printed at once."""
    layout, damages = Layout(), []
    pools = [Pool(layout, name, address) for name, address in layout.entries(damages)]
    for damage in damages:
        print(f"the list of pools: {damage}")
    return pools


def print_damages(pools):
    for pool in pools:
        for damage in pool.damages:
            print(f"pool '{pool.name}': {damage}")


def text_at(address):
    text = b""
    while len(text) < 4096:
        piece = memory(address + len(text), 64 - (address + len(text)) % 64)
        if piece is None:
            break
        text += piece
        if b"\0" in piece:
            return text[:text.index(b"\0")].decode(errors="replace")
    return f"(unknown, {address:#x})"


def print_table(titles, rows):
    for row in [titles, *rows]:
        first = max(len(str(r[0])) for r in [titles, *rows])
        print(str(row[0]).ljust(first) + "".join(f" {value:>13}" for value in row[1:]))


class MemPool(gdb.Command):
    """The pools of libVokMemPool: mempool list, mempool report NAME, mempool of ADDRESS."""

    def __init__(self):
        super().__init__("mempool", gdb.COMMAND_DATA, prefix=True)

    def invoke(self, argument, from_tty):
        gdb.execute("help mempool")


class List(gdb.Command):
    """The pools by name, with their records, buckets and bytes of the heap."""

    def __init__(self):
        super().__init__("mempool list", gdb.COMMAND_DATA)

    def invoke(self, argument, from_tty):
        pools = all_pools()
        print_table(("pool", "used", "free", "ext", "buckets", "bytes held"),
                    [(pool.name + (" (off)" if pool.body and pool.is_off else ""), *pool.sums())
                     for pool in pools])
        print_damages(pools)


class Report(gdb.Command):
    """A pool by size classes: mempool report NAME."""

    def __init__(self):
        super().__init__("mempool report", gdb.COMMAND_DATA)

    def invoke(self, argument, from_tty):
        if not argument:
            raise gdb.GdbError("usage: mempool report NAME")
        pool = next((pool for pool in all_pools() if pool.name == argument), None)
        if pool is None:
            raise gdb.GdbError(f"mempool: there is no pool '{argument}'")
        rows = [(size, sum(b.used for b in buckets), sum(b.free for b in buckets), len(buckets),
                 sum(b.used == 0 for b in buckets), sum(b.free == 0 for b in buckets))
                for size, buckets in pool.classes]
        print_table(("bytes", "used", "free", "buckets", "empty", "full"), rows)
        lengths = [ext.word("length") for ext in pool.exts]
        print(f"{len(lengths)} ext records of {sum(lengths)} bytes in all")
        print_damages([pool])


class Of(gdb.Command):
    """The record that an address lies in: mempool of ADDRESS."""

    def __init__(self):
        super().__init__("mempool of", gdb.COMMAND_DATA, gdb.COMPLETE_EXPRESSION)

    def invoke(self, argument, from_tty):
        if not argument:
            raise gdb.GdbError("usage: mempool of ADDRESS")
        try:
            address = int(gdb.parse_and_eval(argument).cast(gdb.lookup_type("unsigned long")))
        except gdb.error as error:
            raise gdb.GdbError(f"mempool: {error}") from None
        pools = all_pools()
        for pool in pools:
            lines = pool.find(address)
            if lines is not None:
                print("\n".join(lines))
                return
        print(f"{address:#x}: in no pool")
        print_damages(pools)


def name_of(mgr):
    """The name of the pool of a handle, by the list of pools alone."""
    address = int(mgr["bucketMgr"])
    return next((f"'{name}'" for name, pool in Layout().entries([]) if pool == address), "no pool")


def name_by_source(deleter):
    mgr = gdb.lookup_type("VOK::MemPool::Mgr").pointer()
    return name_of((deleter["source"]["word"] & ~1).cast(mgr))  # bit 0 is a mark


def name_of_threads(pools):
    name = pools["set"]["_M_ptr"]["name"]["_M_dataplus"]["_M_p"]
    return f"'{name.string(errors='replace')}'"


class Printer:
    """A value as its type and the name of its pool."""

    def __init__(self, value, name):
        self.value, self.name = value, name

    def to_string(self):
        value = self.value
        kind = gdb.types.get_basic_type(value.type).name.replace("VOK::MemPool::", "")
        try:
            if value.type.code in (gdb.TYPE_CODE_REF, gdb.TYPE_CODE_RVALUE_REF):
                value = value.referenced_value()
            return f"{kind} of {self.name(value)}"
        except (gdb.error, gdb.GdbError):  # optimised away, not constructed yet, or destroyed
            return kind


def printers():
    collection = gdb.printing.RegexpCollectionPrettyPrinter("libVokMemPool")
    for pattern, name in (
            ("Mgr", name_of),
            ("Allocator<.*>|Resource", lambda value: name_of(value["mgr"])),
            ("Deleter<.*>", name_by_source),
            ("ThreadPools", name_of_threads),
            ("ThreadAllocator<.*>|ThreadResource", lambda value: name_of_threads(value["pools"]))):
        collection.add_printer(pattern, f"^VOK::MemPool::({pattern})$",
                               lambda value, name=name: Printer(value, name))
    return collection


for command in (MemPool, List, Report, Of):
    command()
gdb.printing.register_pretty_printer(gdb.current_objfile(), printers(), replace=True)
