#!/usr/bin/env python3
"""Writes sales.csv, the example data set: 400 orders of a small wholesaler.

Only the standard library and a fixed seed, so the file is the same on every run:

    python3 examples/data/make_sales.py > examples/data/sales.csv

Fields
  region        text: east, north, south, west
  channel       text: online, store
  store         text with commas and quotes, so the file needs RFC 4180 quoting
  unit_price    normal around 25 (a few missing, written "NA")
  unit_cost     about 55 % of the price plus noise, so the two correlate (a few missing, ".")
  volume        triangular between 800 and 1500, mode 1000, less 40 units per dollar of
                price above 25 (so volume and price correlate negatively), whole units
  returns       Poisson counts of returned units, mean 2 (an ordinal field)
  satisfaction  rating 1 to 5 (an ordinal field, some empty)
"""
import csv
import math
import random
import sys

SEED = 20260
ROWS = 400

STORES = {
    "east": ['Harbour St, No. 4', 'The "Old Mill"'],
    "north": ['Ridge Rd, Unit 12', 'Northgate'],
    "south": ['Quay Side, Dock 2'],
    "west": ['Westfield Mall', 'Sunset Blvd, 88'],
}


def poisson(rng, mean):
    """Knuth's multiplication method: fine for a small mean."""
    limit = math.exp(-mean)
    k, product = 0, rng.random()
    while product > limit:
        k += 1
        product *= rng.random()
    return k


def main():
    rng = random.Random(SEED)
    out = csv.writer(sys.stdout, lineterminator="\n", quoting=csv.QUOTE_MINIMAL)
    out.writerow(["region", "channel", "store", "unit_price", "unit_cost", "volume",
                  "returns", "satisfaction"])
    for _ in range(ROWS):
        region = rng.choices(["east", "north", "south", "west"], weights=[3, 4, 2, 3])[0]
        channel = rng.choices(["online", "store"], weights=[2, 3])[0]
        store = rng.choice(STORES[region])
        price = rng.gauss(25.0, 2.5)
        cost = 0.55 * price + rng.gauss(0.0, 0.8)
        volume = round(rng.triangular(800, 1500, 1000) - 40.0 * (price - 25.0))
        returns = poisson(rng, 2.0)
        satisfaction = min(5, max(1, round(rng.gauss(3.8 - 0.3 * returns, 0.9))))
        price_text = "NA" if rng.random() < 0.01 else f"{price:.2f}"
        cost_text = "." if rng.random() < 0.01 else f"{cost:.2f}"
        satisfaction_text = "" if rng.random() < 0.02 else str(satisfaction)
        out.writerow([region, channel, store, price_text, cost_text, volume, returns,
                      satisfaction_text])


if __name__ == "__main__":
    main()
