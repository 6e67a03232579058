"""Makes pyramid files, and tells what others read in them.

The first argument is a folder, standard input a JSON list of jobs; each leaves NAME.pyr there. A job with
"header" makes a file of random tile data from its values: what GDAL's world reads in it, as one NAME.LEVEL.raw
for each level (bands, rows, columns), is what the reader under test has to find. "array" makes one with the
driver, out of known samples. "headers" opens many texts as headers and answers what each was taken for.
"""

import json
import pathlib
import struct
import sys

import numpy
from osgeo import gdal

gdal.UseExceptions()
SAMPLE_BYTES = {"Byte": 1, "Char": 1, "UInt16": 2, "Int16": 2, "UInt32": 4, "Int32": 4, "UInt64": 8, "Int64": 8,
                "Single": 4, "Double": 8, "ComplexSingle": 8, "ComplexDouble": 16}


def document_of(header):
    elements = "".join(f"<HEADER_{name}>{value}</HEADER_{name}>" for name, value in header.items())
    return f"<?xml version=\"1.0\"?><DATASET><HEADER>{elements}</HEADER></DATASET>".encode()


def front_of(document):
    return b"KOBT" + struct.pack("<QQ", 20 + len(document), 0) + document


def random_file(path, job):
    header = job["header"]
    sizes = [(header["PIXEL_WIDTH"] >> level) * (header["PIXEL_HEIGHT"] >> level)
             for level in range(header["LEVELMIN"], header["LEVELMAX"] + 1)]
    count = sum(sizes) * header["BANDS"] * SAMPLE_BYTES[header["PIXEL_TYPE"]]
    data = numpy.random.default_rng(job["seed"]).integers(0, 256, count, dtype=numpy.uint8).tobytes()
    path.write_bytes(front_of(document_of(header)) + data[:len(data) - job.get("cut", 0)])


def samples(dataset, is_char):
    array = dataset.ReadAsArray()
    if array.ndim == 2:
        array = array[None]
    return array.astype(numpy.int8) if is_char else array


def tell(path, job):
    is_char = job["header"]["PIXEL_TYPE"] == "Char"
    whole = gdal.OpenEx(str(path))
    for level in range(whole.GetRasterBand(1).GetOverviewCount() + 1):
        options = ["MISSING=ZEROS"] + ([f"OVERVIEW_LEVEL={level - 1}"] if level else [])
        dataset = gdal.OpenEx(str(path), open_options=options)
        number = level + job["header"]["LEVELMIN"]
        path.with_suffix(f".{number}.raw").write_bytes(samples(dataset, is_char).tobytes())


def built_file(path, job):
    bands, rows, columns = job["array"]
    values = numpy.random.default_rng(job["seed"]).integers(0, 250, (bands, rows, columns), dtype=numpy.uint8)
    memory = gdal.GetDriverByName("MEM").Create("", columns, rows, bands)
    memory.WriteArray(values)
    memory.SetGeoTransform((500000, 30, 0, 4000000, 0, -30))
    if "colors" in job:
        table = gdal.ColorTable()
        for index, color in enumerate(job["colors"]):
            table.SetColorEntry(index, tuple(color))
        memory.GetRasterBand(1).SetColorTable(table)
    gdal.GetDriverByName("ZMCPyramid").CreateCopy(str(path), memory, options=job.get("options", []))
    path.with_suffix(".0.raw").write_bytes(values.tobytes())


def judge(text):
    name = "/vsimem/judged.pyr"
    gdal.FileFromMemBuffer(name, front_of(text))
    try:
        dataset = gdal.OpenEx(name, gdal.OF_RASTER, allowed_drivers=["ZMCPyramid"])
        band = dataset.GetRasterBand(1) if dataset.RasterCount else None
        return [dataset.RasterXSize, dataset.RasterYSize, dataset.RasterCount,
                gdal.GetDataTypeName(band.DataType) if band else None,
                band.GetBlockSize()[0] if band else None]
    except RuntimeError as error:
        return str(error)
    finally:
        gdal.Unlink(name)


def main():
    folder = pathlib.Path(sys.argv[1])
    answers = {}
    for job in json.load(sys.stdin):
        path = folder / (job["name"] + ".pyr")
        if "headers" in job:
            answers[job["name"]] = [judge(bytes.fromhex(text)) for text in job["headers"]]
        elif "array" in job:
            built_file(path, job)
        else:
            random_file(path, job)
            tell(path, job)
    print(json.dumps(answers))


main()
