# SPDX-License-Identifier: Apache-2.0
"""The populated places of the world: name, country and first-level division from one list, kind and
population from an older one that has them."""

import collections
import dataclasses
import json
import math

import protobuf

# Quarters, historical, abandoned and destroyed places: not what anybody calls the city. They still
# tell in which state they are.
_CITY_PARTS = ("PPLX", "PPLH", "PPLQ", "PPLW")
_SAME_PLACE = 0.1  # degrees between two entries of one name
# The first level of these countries, in the list, was given up long ago; the second is used.
_SECOND_LEVEL = ("TW",)
_UNKNOWN_POPULATION = 500  # the first list has a floor there
_DENSITY = 3000  # people per square kilometre of a city


@dataclasses.dataclass
class Place:
    name: str
    latitude: float
    longitude: float
    country: str
    division: str  # code within the country; "" where there is none
    population: int = _UNKNOWN_POPULATION
    is_city: bool = True

    @property
    def label(self):
        """The label of the division: COUNTRY.CODE."""
        return f"{self.country}.{self.division}"

    @property
    def radius(self):
        """Roughly how far the city reaches, in kilometres."""
        return math.sqrt(self.population / (_DENSITY * math.pi))


@dataclasses.dataclass
class _Counted:
    name: str
    country: str
    kind: str
    population: int
    latitude: float
    longitude: float


def load(places_file, counted_file):
    """All places, sorted by country, name and position so that every build has the same order."""
    places = [Place(entry["name"], float(entry["lat"]), float(entry["lng"]), entry["country"],
                    entry["admin2" if entry["country"] in _SECOND_LEVEL else "admin1"])
              for entry in _entries(places_file)]
    _join(places, list(_counted(counted_file)))
    places.sort(key=lambda place: (place.country, place.name, place.latitude, place.longitude))
    return places


def division_names(first_level, second_level):
    """The names of the divisions, by label (COUNTRY.CODE), from the files of both levels."""
    names = {entry["code"]: entry["name"] for entry in _entries(first_level)
             if entry["code"][:2] not in _SECOND_LEVEL}
    for entry in _entries(second_level):
        country, _, code = entry["code"].split(".", 2)
        if country in _SECOND_LEVEL:
            names[f"{country}.{code}"] = entry["name"]
    return names


def _entries(file_name):
    with open(file_name, encoding="utf-8") as file:
        return json.load(file)


def _counted(file_name):
    latitude = longitude = 0  # each entry has the difference to the one before
    for message in protobuf.messages(memoryview(file_name.read_bytes())):
        values = dict(protobuf.fields(message))
        longitude += protobuf.signed(values.get(10, 0))
        latitude += protobuf.signed(values.get(11, 0))
        yield _Counted(bytes(values[2]).decode(), bytes(values[3]).decode(),
                       bytes(values.get(7, b"")).decode(), values.get(9, 0),
                       latitude / 1e5, longitude / 1e5)


def _join(places, counted):
    by_position, by_name = {}, collections.defaultdict(list)
    for entry in counted:
        by_position[entry.country, round(entry.latitude, 5), round(entry.longitude, 5)] = entry
        by_name[entry.country, entry.name].append(entry)
    unknown = []
    for place in places:
        entry = by_position.get(
            (place.country, round(place.latitude, 5), round(place.longitude, 5)))
        if entry is None:
            near = [other for other in by_name[place.country, place.name]
                    if abs(other.latitude - place.latitude) < _SAME_PLACE
                    and abs(other.longitude - place.longitude) < _SAME_PLACE]
            entry = min(near, default=None, key=lambda other: _distance(other, place))
        if entry is None:
            unknown.append(place)
            continue
        place.population = max(entry.population, _UNKNOWN_POPULATION)
        place.is_city = entry.kind not in _CITY_PARTS
    _mark_parts(places, unknown)


def _mark_parts(places, unknown):
    """A place that the older list does not know, within the reach of a city, is a part of it."""
    large = collections.defaultdict(list)
    for place in places:
        if place.is_city and place.radius > 1:
            large[place.country].append(place)
    for place in unknown:
        place.is_city = all(_distance(city, place) > city.radius for city in large[place.country])


def _distance(one, other):
    """Kilometres between two places that are near each other."""
    east = (one.longitude - other.longitude) * math.cos(math.radians(one.latitude))
    return math.hypot(east, one.latitude - other.latitude) * 111.2
