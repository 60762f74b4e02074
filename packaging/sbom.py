#!/usr/bin/env python3
"""Tells what is in the artefacts of a release: an SPDX document for each, beside it.

    sbom.py VERSION FOLDER

What an artefact needs is read out of itself, where its kind says so (packages, wheels, libraries). What was compiled or
copied into one is told by bundled.json, by patterns of names: with its version, or with the Debian package that it is
copied from, whose version is asked for.
"""

import datetime
import hashlib
import json
import os
import pathlib
import re
import subprocess
import sys
import zipfile

HERE = pathlib.Path(__file__).resolve().parent
NONE = "NOASSERTION"


def digest(path):
    return hashlib.sha256(path.read_bytes()).hexdigest()


def control(path, field):
    run = subprocess.run(["dpkg-deb", "--field", path, field], check=True, capture_output=True, text=True)
    return run.stdout.strip()


def needed(path):
    """Names of what the artefact needs beside itself, by its own words."""
    if path.suffix == ".deb":
        return sorted({re.split(r"[ (|]", part.strip())[0] for part in control(path, "Depends").split(",") if part.strip()})
    if path.suffix == ".whl":
        with zipfile.ZipFile(path) as wheel:
            name = next(name for name in wheel.namelist() if name.endswith(".dist-info/METADATA"))
            lines = wheel.read(name).decode().splitlines()
        return sorted({re.split(r"[ (;<>=!]", line.partition(":")[2].strip())[0] for line in lines if line.startswith("Requires-Dist:")})
    if path.suffix == ".duckdb_extension":
        run = subprocess.run(["readelf", "--dynamic", "--wide", path], check=True, capture_output=True, text=True)
        return sorted(re.findall(r"\(NEEDED\).*\[(.+)\]", run.stdout))
    return []


def version_of(part):
    """As it is told, or of the Debian package without Debian's own revision."""
    if "package" not in part:
        return part["version"]
    query = ["dpkg-query", "--show", "--showformat=${Version}", part["package"]]
    run = subprocess.run(query, check=True, capture_output=True, text=True)
    return run.stdout.rpartition("-")[0] or run.stdout


def bundled(path):
    """What was compiled or copied into the artefact: dicts of name, version, licence."""
    parts = json.loads((HERE / "bundled.json").read_text(encoding="utf-8"))
    found = [part for pattern, parts in parts.items() if re.fullmatch(pattern, path.name) for part in parts]
    return [{**part, "version": version_of(part)} for part in found]


def package(name, identity, version, licence, **more):
    return {
        "SPDXID": f"SPDXRef-{identity}",
        "name": name,
        "versionInfo": version,
        "downloadLocation": NONE,
        "filesAnalyzed": False,
        "licenseConcluded": licence,
        "licenseDeclared": licence,
        "copyrightText": NONE,
        **more,
    }


def identity_of(name):
    return re.sub(r"[^A-Za-z0-9.-]", "-", name)


def document(path, version, when):
    packages = [package(path.name, "artefact", version, "MIT", checksums=[{"algorithm": "SHA256", "checksumValue": digest(path)}])]
    relations = [("SPDXRef-DOCUMENT", "DESCRIBES", "SPDXRef-artefact")]
    for part in bundled(path):
        identity = "in-" + identity_of(part["name"])
        packages.append(package(part["name"], identity, part["version"], part["licence"]))
        relations.append(("SPDXRef-artefact", "CONTAINS", f"SPDXRef-{identity}"))
    for name in needed(path):
        identity = "needs-" + identity_of(name)
        packages.append(package(name, identity, NONE, NONE))
        relations.append(("SPDXRef-artefact", "DEPENDS_ON", f"SPDXRef-{identity}"))
    return {
        "spdxVersion": "SPDX-2.3",
        "dataLicense": "CC0-1.0",
        "SPDXID": "SPDXRef-DOCUMENT",
        "name": path.name,
        "documentNamespace": f"urn:tav:{version}:{path.name}:{digest(path)}",
        "creationInfo": {"created": when, "creators": ["Organization: the tav authors"]},
        "packages": packages,
        "relationships": [
            {"spdxElementId": one, "relationshipType": kind, "relatedSpdxElement": other} for one, kind, other in relations
        ],
    }


def main():
    version, folder = sys.argv[1], pathlib.Path(sys.argv[2])
    seconds = int(os.environ.get("SOURCE_DATE_EPOCH", "0"))
    when = datetime.datetime.fromtimestamp(seconds, datetime.timezone.utc).strftime("%Y-%m-%dT%H:%M:%SZ")
    artefacts = sorted(path for path in folder.iterdir() if path.is_file() and not path.name.endswith(".spdx.json"))
    if not artefacts:
        print(f"{folder} has no artefacts", file=sys.stderr)
        return 1
    for path in artefacts:
        text = json.dumps(document(path, version, when), indent=2) + "\n"
        path.with_name(path.name + ".spdx.json").write_text(text, encoding="utf-8")
    return 0


if __name__ == "__main__":
    sys.exit(main())
