# SPDX-License-Identifier: Apache-2.0
"""Makes tables with the names and columns of the store's views, for tests that say themselves what is in them."""

import pathlib
import re

SOURCE = pathlib.Path(__file__).resolve().parents[3]


def columns():
    """The columns of each view, as "id INTEGER, at REAL": a test of the views holds docs/views.md to them."""
    views = {}
    for part in (SOURCE / "docs/views.md").read_text().split("\n## ")[1:]:
        found = re.findall(r"^\| `(\w+)` \| (\w+) \|", part, re.MULTILINE)
        views[part.split("\n", 1)[0]] = ", ".join(f"{name} {kind.upper()}" for name, kind in found)
    return views


def schema():
    """The SQL that makes the tables."""
    return "".join(f"CREATE TABLE {view} ({text});\n" for view, text in columns().items())


def schema_version():
    text = (SOURCE / "src/platform/linux/store/StoreSchema.h").read_text()
    return int(re.search(r"kStoreSchemaVersion = (\d+)", text).group(1))
