# SPDX-License-Identifier: Apache-2.0
"""What a fleet's captures cost without the library: decodes statistics captures to JSON, a line each.

The same documents as `kspdump stats --format json`, made the straightforward way with the struct module.
"""

import json
import re
import struct
import sys

END_MARKER = 0xFFFF
GREATEST_KEY = 0x30000000


def key_table(path):
    rows = re.findall(r'\{(\d+), "(\w+)", (\d+)\}', open(path).read())
    return {int(key): (name, int(count)) for key, name, count in rows}


def decode(path, table):
    data = open(path, "rb").read()
    records, findings, offset = [], [], 0
    while offset + 8 <= len(data):
        key, count = struct.unpack_from("<II", data, offset)
        if count == 0:
            offset += 8
            continue
        if key == END_MARKER:
            break
        if key > GREATEST_KEY or count > (len(data) - offset) // 8 - 1:
            findings.append({"offset": offset, "reason": "bad header"})
            break
        name, configured = table.get(key, ("Stat_%d" % key, count))
        if count != configured:
            findings.append({"offset": offset, "reason": "%s carries %d values" % (name, count)})
        values = struct.unpack_from("<%dQ" % min(count, configured), data, offset + 8)
        records.append({"key": key, "name": name, "values": values})
        offset += 8 * (1 + count)
    return {"source": path, "kind": "stats", "bytes": len(data), "records": records, "findings": findings}


def main():
    table = key_table(sys.argv[1])
    for path in map(str.strip, sys.stdin):
        sys.stdout.write(json.dumps(decode(path, table), separators=(",", ":")) + "\n")


main()
