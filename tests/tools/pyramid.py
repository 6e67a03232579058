"""A reader of pyramid files, made from the description of the format alone."""
import struct
import xml.etree.ElementTree as ElementTree

import numpy as np

TYPES = {
    "Byte": "u1", "Char": "i1", "UInt16": "<u2", "Int16": "<i2", "UInt32": "<u4", "Int32": "<i4",
    "UInt64": "<u8", "Int64": "<i8", "Single": "<f4", "Double": "<f8", "ComplexSingle": "<c8",
    "ComplexDouble": "<c16",
}


class Pyramid:
    def __init__(self, path):
        with open(path, "rb") as file:
            self.data = file.read()
        assert self.data[:4] == b"KOBT"
        self.start, self.stored_end = struct.unpack("<QQ", self.data[4:20])
        header = ElementTree.fromstring(self.data[20:self.start].decode()).find("HEADER")
        fields = {child.tag[len("HEADER_"):]: child.text.strip() for child in header}
        self.bands = int(fields["BANDS"])
        self.width, self.height = int(fields["PIXEL_WIDTH"]), int(fields["PIXEL_HEIGHT"])
        self.level_max = int(fields["LEVELMAX"])
        self.tile = int(fields["TILESIZE"])
        self.ordering = fields["BUILD_METHOD"]
        self.type_name = fields["PIXEL_TYPE"]
        self.type = np.dtype(TYPES[self.type_name])
        self.end = self.start + sum(self.level_bytes(level) for level in range(self.level_max + 1))
        self.morton = self._weave() if self.ordering == "Morton" else None

    def size(self, level):
        return self.width >> level, self.height >> level

    def level_bytes(self, level):
        width, height = self.size(level)
        return width * height * self.bands * self.type.itemsize

    def offset(self, level):
        return self.start + sum(self.level_bytes(coarser)
                                for coarser in range(level + 1, self.level_max + 1))

    def tiles(self, level):
        width, height = self.size(level)
        return -(-width // self.tile), -(-height // self.tile)

    def read(self, level):
        """All samples of a level, as height x width x bands."""
        width, height = self.size(level)
        pixels = np.empty((height, width, self.bands), self.type)
        across, down = self.tiles(level)
        for row in range(down):
            for column in range(across):
                x, y = column * self.tile, row * self.tile
                w, h = min(self.tile, width - x), min(self.tile, height - y)
                pixels[y:y + h, x:x + w] = self._tile(level, column, row, w, h)
        return pixels

    def _tile(self, level, column, row, w, h):
        size = self.type.itemsize
        if self.morton is None:
            width, _ = self.size(level)
            at = (self.offset(level) + width * row * self.tile * self.bands * size +
                  column * self.tile * h * self.bands * size)
            return np.frombuffer(self.data, self.type, w * h * self.bands, at).reshape(
                h, w, self.bands)
        return np.stack([
            np.frombuffer(self.data, self.type, w * h, self.morton[band, level, column, row])
            .reshape(h, w) for band in range(self.bands)], axis=-1)

    def _weave(self):
        """Offsets by band, level, column and row in the Morton ordering."""
        across, down = self.tiles(0)
        grid = sorted((self._code(x, y), x, y) for x in range(across) for y in range(down))
        places, cursor = {}, self.start
        for band in range(self.bands):
            opened = {}
            for code, x, y in grid:
                last = (code, x, y) == grid[-1]
                for level in range(self.level_max + 1):
                    block = (x >> level, y >> level)
                    closing = [block] if level == 0 else []
                    if level != 0:
                        if opened.get(level, block) != block:
                            closing.append(opened[level])
                        opened[level] = block
                        if last:
                            closing.append(block)
                    for column, row in closing:
                        places[band, level, column, row] = cursor
                        cursor += self._block_bytes(level, column, row)
        assert cursor == self.end
        return places

    @staticmethod
    def _code(x, y):
        return sum((x >> bit & 1) << 2 * bit | (y >> bit & 1) << 2 * bit + 1 for bit in range(17))

    def _block_bytes(self, level, column, row):
        width, height = self.size(level)
        return (min(self.tile, width - column * self.tile) *
                min(self.tile, height - row * self.tile) * self.type.itemsize)

    def document(self):
        return ElementTree.fromstring(self.data[self.end:].decode()) if len(
            self.data) > self.end else None
