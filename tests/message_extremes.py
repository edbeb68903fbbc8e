"""Payloads at the limits and just past them: (what, message, what comes of it). An outcome of None
is the model's."""


def chain(keys, payloads, tip):
    """Payloads, each in a list of the next; `keys` are those of the lists in turn."""
    message = {"c": payloads} | tip
    for number in range(payloads - 1, 0, -1):
        message = {"c": number, keys[number % len(keys)]: [message]}
    return message


def lists(depth):
    value = []
    for _ in range(depth - 1):
        value = [value]
    return value


def refused(path):
    return {"error": {"kind": "limitExceeded", "path": path}}


def nesting(limit):
    """The containers inside one another are `limit`, or one more. A payload within a payload takes
    two, so that those of a chain end at an odd number."""
    assert limit % 2 == 0
    for keys in (["dtl"], ["dtl", "mml", "mml"]):
        for tip in ({"mml": []}, {"h": {"aS": "x"}}, {"Dc": {"c": 1}}, {"dal": ["x"]}, {"?": {}}):
            yield "at the limit", chain(keys, limit // 2, tip), None
        for tip in ({"mml": [{"c": 1}]}, {"qal": [{}]}, {"h": {"?": []}}, {"?": [[]]}):
            yield "past the limit", chain(keys, limit // 2, tip), refused("")
    yield "unknown lists at the limit", {"c": 1, "?": lists(limit - 1)}, None
    yield "unknown lists past the limit", {"c": 1, "?": lists(limit)}, refused("")


def lists_of_records(tables):
    """Lists that take all the memory that there is for records, and one record more."""
    size = {record["name"]: record["bytes"] for record in tables["wireRecords"]}
    for key, record, element in (("mml", "VeskCorvelProtocolPayload", {"c": 1}),
                                 ("qsatv", "VeskHoplineSelfAllocToken", {})):
        most = tables["limits"]["recordBytes"] // size[record]
        yield "a list", {"c": 1, key: [element] * most}, None
        yield "a list", {"c": 1, key: [element] * (most + 1)}, refused(key)
        yield "two lists", {"c": 1, "dtl": [{"c": 2}], key: [element] * most}, refused(key)


def messages(tables):
    yield from nesting(tables["limits"]["nestedContainers"])
    yield from lists_of_records(tables)
    yield "many texts", {"c": 1, "dul": [f"{number:x}" for number in range(70_000)]}, None
    yield "long text", {"c": 1, "ua": "ä😀" * 200_000, "i": "x" * 3_000_000}, None
    yield "many bytes", {"c": 1, "P": bytes(range(256)) * 30_000}, None
    yield "many unknown keys", dict.fromkeys(map(str, range(70_000)), 1) | {"c": 1}, None
