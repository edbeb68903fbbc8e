#!/usr/bin/env python3
"""write_proto.py TABLES.json > records.proto: prints one protobuf message for each wire record in the
output of dump_tables. Field numbers are places in the record's table, from 1."""

import json
import sys

SCALARS = {"Int": "int64", "Int64": "int64", "Bool": "bool", "String": "string", "Data": "bytes"}
LIST = "list of "

with open(sys.argv[1], encoding="utf-8") as file:
    records = json.load(file)["wireRecords"]

print('syntax = "proto3";\npackage peer;\noption cc_enable_arenas = true;')
for record in records:
    print(f"\nmessage {record['name']} {{")
    for number, field in enumerate(record["fields"], 1):
        kind = field["type"]
        label = "repeated" if kind.startswith(LIST) else "optional"
        kind = kind.removeprefix(LIST)
        print(f"  {label} {SCALARS.get(kind, kind)} {field['name']} = {number};")
    print("}")
