"""What tools/benchmosaic runs once everything is built."""

import argparse
import os
import shutil
import subprocess
import sys
import tempfile
import time

import numpy as np
from osgeo import gdal, ogr, osr

gdal.UseExceptions()
ogr.UseExceptions()

SIDE = 4096
STRIDE = 3968
COUNT = 4
WHOLE = STRIDE * (COUNT - 1) + SIDE
LEFT, TOP = 400000.0, 5600000.0
FEATHER = 50
VERTICES = 2000  # of each cutline
FORMAT = ["-co", "TILED=YES", "-co", "COMPRESS=DEFLATE", "-co", "ZLEVEL=1", "-co", "PREDICTOR=2"]


def system():
    srs = osr.SpatialReference()
    srs.ImportFromEPSG(32633)
    return srs


def write_scenes(folder):
    """Mirrored pieces of the sample's truth, each scene with its own brightness and noise."""
    subprocess.run(["zarn", "sample", "-q", folder], check=True)
    truth = gdal.Open(os.path.join(folder, "truth_u8.tif")).ReadAsArray()
    land = np.concatenate([truth, truth[:, :, ::-1]], axis=2)
    land = np.concatenate([land, land[:, ::-1]], axis=1)
    random = np.random.default_rng(1)
    names = []
    for row in range(COUNT):
        for column in range(COUNT):
            x, y = column * STRIDE, row * STRIDE
            rows = np.arange(y, y + SIDE) % land.shape[1]
            columns = np.arange(x, x + SIDE) % land.shape[2]
            pixels = land[:, rows][:, :, columns].astype(np.float32)
            gain, offset = random.uniform(0.8, 1.2), random.uniform(-15, 15)
            noise = random.integers(-2, 3, pixels.shape, dtype=np.int8)
            pixels = np.clip(pixels * gain + offset + noise, 1, 255).astype(np.uint8)
            name = os.path.join(folder, f"scene_{row}{column}.tif")
            options = ["TILED=YES", "COMPRESS=DEFLATE", "ZLEVEL=1", "PREDICTOR=2"]
            dataset = gdal.GetDriverByName("GTiff").Create(name, SIDE, SIDE, 3, gdal.GDT_Byte, options)
            dataset.SetGeoTransform([LEFT + x, 1, 0, TOP - y, 0, -1])
            dataset.SetSpatialRef(system())
            for band in range(3):
                dataset.GetRasterBand(band + 1).SetNoDataValue(0)
                dataset.GetRasterBand(band + 1).WriteArray(pixels[band])
            dataset = None
            names.append(name)
    return names


def write_cutlines(name):
    """One polygon for each scene; neighbours share their jagged borders, which run in the overlap."""
    random = np.random.default_rng(2)
    lines = [0.0] + [k * STRIDE + (SIDE - STRIDE) / 2 for k in range(1, COUNT)] + [float(WHOLE)]
    count = VERTICES // 4

    def border(a, b, fixed, outer):
        along = np.linspace(a, b, count + 1)
        # Borders that meet in a corner must not cross.
        most = np.minimum(10, 0.4 * np.minimum(along - a, b - along))
        share = 0 if outer else random.uniform(-1, 1, count + 1)
        return along, fixed + most * share

    across = {}
    for k in range(COUNT + 1):
        for i in range(COUNT):
            outer = k in (0, COUNT)
            across["v", k, i] = border(lines[i], lines[i + 1], lines[k], outer)
            across["h", k, i] = border(lines[i], lines[i + 1], lines[k], outer)
    dataset = ogr.GetDriverByName("GPKG").CreateDataSource(name)
    layer = dataset.CreateLayer("cutlines", system(), ogr.wkbPolygon)
    layer.CreateField(ogr.FieldDefn("scene", ogr.OFTString))
    for row in range(COUNT):
        for column in range(COUNT):
            x, y = across["h", row, column]
            points = list(zip(x, y))
            y, x = across["v", column + 1, row]
            points += list(zip(x, y))[1:]
            x, y = across["h", row + 1, column]
            points += list(zip(x, y))[::-1][1:]
            y, x = across["v", column, row]
            points += list(zip(x, y))[::-1][1:]
            ring = ogr.Geometry(ogr.wkbLinearRing)
            for px, py in points:
                ring.AddPoint_2D(LEFT + px, TOP - py)
            polygon = ogr.Geometry(ogr.wkbPolygon)
            polygon.AddGeometry(ring)
            feature = ogr.Feature(layer.GetLayerDefn())
            feature["scene"] = f"scene_{row}{column}"
            feature.SetGeometry(polygon)
            layer.CreateFeature(feature)


def timed(*commands):
    """Runs commands at the same time; wall seconds and the largest peak of memory, MiB."""
    start = time.monotonic()
    running = [subprocess.Popen(command) for command in commands]
    peak = 0
    for process in running:
        _, status, usage = os.wait4(process.pid, 0)
        if status != 0:
            sys.exit(f"failed: {' '.join(process.args)}")
        peak = max(peak, usage.ru_maxrss / 1024)
    return time.monotonic() - start, peak


def report(text, seconds, peak, unit=None):
    ratio = f"  {seconds / unit:6.2f}x" if unit else ""
    print(f"{text:<58} {seconds:8.1f} s  {peak:6.0f} MiB{ratio}", flush=True)


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--skip-peer", action="store_true")
    parser.add_argument("folder", nargs="?")
    options = parser.parse_args()
    folder = options.folder or tempfile.mkdtemp(prefix="benchmosaic", dir=os.environ.get("TMPDIR"))
    os.makedirs(folder, exist_ok=True)
    scenes = sorted(
        os.path.join(folder, name) for name in os.listdir(folder) if name.startswith("scene_")
    )
    if not scenes:
        scenes = write_scenes(folder)
    cutlines = os.path.join(folder, "cutlines.gpkg")
    if not os.path.exists(cutlines):
        write_cutlines(cutlines)
    out = os.path.join(folder, "out.tif")
    mosaic = ["zarn", "mosaic", "-q", "--overwrite"]
    cut = ["--cutlines", cutlines]

    plain, peak = timed(mosaic + cut + scenes + [out])
    report("cutlines, no correction, no feather", plain, peak)
    for text, arguments in [
        ("cutlines, feather 50", cut + ["--feather", str(FEATHER)]),
        ("cutlines, feather 50, gain-offset", cut + ["--feather", str(FEATHER), "--balance", "gain-offset"]),
        ("cutlines, feather 50, dodging", cut + ["--feather", str(FEATHER), "--balance", "dodging"]),
        ("own seams, feather 50, gain-offset", ["--feather", str(FEATHER), "--balance", "gain-offset"]),
    ]:
        seconds, peak = timed(mosaic + arguments + scenes + [out])
        report(text, seconds, peak, plain)
    os.remove(out)

    job = os.path.join(folder, "job.json")
    tiles = os.path.join(folder, "job.json.tiles")
    plan = ["zarn", "mosaic", "plan", "-q", "--overwrite", "--feather", str(FEATHER), "-o", job]
    seconds, peak = timed(plan + cut + ["--balance", "gain-offset"] + scenes + [out])
    report("plan", seconds, peak)
    run = ["zarn", "mosaic", "run", "-q", "--threads", "1", job]
    shutil.rmtree(tiles, ignore_errors=True)
    whole, peak = timed(run)
    report("run with one thread", whole, peak)
    count = len(os.listdir(tiles))
    shutil.rmtree(tiles)
    seconds, peak = timed(
        run + ["--tiles", f"1-{count // 2}"], run + ["--tiles", f"{count // 2 + 1}-"]
    )
    report("run in two processes with one thread each", seconds, peak, whole)
    seconds, peak = timed(["zarn", "mosaic", "finish", "-q", "--overwrite", job])
    report("finish", seconds, peak)
    os.remove(out)
    shutil.rmtree(tiles)

    if not options.skip_peer:
        feathered, _ = timed(mosaic + cut + ["--feather", str(FEATHER)] + scenes + [out])
        os.remove(out)
        extent = [str(v) for v in (LEFT, TOP - WHOLE, LEFT + WHOLE, TOP)]
        start = time.monotonic()
        peak = 0
        for scene in scenes:
            label = os.path.splitext(os.path.basename(scene))[0]
            command = ["gdalwarp", "-q", "-cutline", cutlines, "-cwhere", f"scene = '{label}'"]
            command += ["-cblend", str(FEATHER), "-multi", "-wo", "NUM_THREADS=ALL_CPUS"]
            if scene == scenes[0]:
                command += ["-te", *extent, "-tr", "1", "1", *FORMAT]
            peak = max(peak, timed(command + [scene, out])[1])
        report("gdalwarp -cblend 50, scene by scene", time.monotonic() - start, peak, feathered)
    if not options.folder:
        shutil.rmtree(folder)


if __name__ == "__main__":
    main()
