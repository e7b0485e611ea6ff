#!/usr/bin/python3
"""The published interface description against the live service.

1. docs/openapi.yaml is checked as a document (openapi_check.check_document).
2. Every answer that the end-to-end suite received (its answer log), and the
   answers of a table of requests served over the shipped example scenarios,
   the built-in one, an unusable one and a host with a small body limit, are
   held against it by path, method, status code and media type.
3. Answers altered the way a wrong implementation would answer (a member
   renamed, a type changed) must fail the check: the schemas are strict.
4. Every documented kind of answer that the simulated platform can produce
   must have been seen.

Usage: contract_test.py --document docs/openapi.yaml --host build/bin/ws-runtime
       --scenarios examples/scenarios --answers e2e-answers.log
Exits 0 when all holds, 1 with the list of problems otherwise."""

import argparse
import copy
import json
import os
import sys
import tempfile

import yaml

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "support"))
from openapi_check import check_document, validate_answer  # noqa: E402
from quillon_host import Answer, Host, environment  # noqa: E402

MEDIA_TYPE = "vnd.ko.syncDomain.v0/json; charset=utf-8"
DEVICE = "/quillon/syncableDevices/pendulo/timekeeper/genericTk"
VENDOR = {"Content-Type": MEDIA_TYPE}

# The kinds of answer the simulated platform gives; 202 (a lower library's
# "accepted") and 503 (a stopping host) cannot be provoked through it.
EXPECTED_KINDS = {
    f"get /quillon/resources 200 {MEDIA_TYPE}",
    f"get /quillon/syncableDevices/{{plugin}}/{{type}}/{{name}} 200 {MEDIA_TYPE}",
    f"get /quillon/timescales/{{plugin}}/{{type}}/{{name}} 200 {MEDIA_TYPE}",
    f"put /quillon/syncableDevices/{{plugin}}/{{type}}/{{name}} 200 {MEDIA_TYPE}",
    f"get /quillon/{{command}} 404 {MEDIA_TYPE}",
    f"put /quillon/resources 404 {MEDIA_TYPE}",
    f"get /quillon/syncableDevices/{{plugin}}/{{type}}/{{name}} 415 {MEDIA_TYPE}",
    f"get /quillon/resources 500 {MEDIA_TYPE} X-Status-Code",
    f"get /quillon/syncableDevices/{{plugin}}/{{type}}/{{name}} 500 {MEDIA_TYPE} X-Status-Code",
    f"put /quillon/syncableDevices/{{plugin}}/{{type}}/{{name}} 500 {MEDIA_TYPE} X-Status-Code",
    f"get /quillon/timescales/{{plugin}}/{{type}}/{{name}} 500 {MEDIA_TYPE} X-Status-Code",
    f"put /quillon/syncableDevices/{{plugin}}/{{type}}/{{name}} 500 {MEDIA_TYPE}",
    "other /quillon/resources 500 untyped",
    "get (unrouted) 404 text/plain; charset=utf-8",
    "get /quillon/timescales/{plugin}/{type}/{name} 400 text/plain; charset=utf-8",
    "put /quillon/syncableDevices/{plugin}/{type}/{name} 413 text/plain; charset=utf-8",
}


def read_answer_log(path):
    """The answers of the end-to-end suite's log (support/answer_log.h)."""
    answers = []
    with open(path, "rb") as log:
        data = log.read()
    position = 0
    while position < len(data):
        line_end = data.index(b"\n", position)
        head = data[position:line_end].decode()
        if not head.startswith("answer "):
            raise ValueError(f"{path}: broken record at byte {position}")
        size = int(head[len("answer "):])
        record = data[line_end + 1:line_end + 1 + size]
        position = line_end + 1 + size
        header_end = record.index(b"\n\n")
        lines = record[:header_end].decode("latin-1").split("\n")
        method, target = lines[0].split(" ", 1)
        headers = [tuple(line.split(": ", 1)) for line in lines[2:]]
        answers.append(Answer(method, target, int(lines[1]), headers, record[header_end + 2:]))
    return answers


def served_answers(host):
    """A request of every kind against one running host."""
    answers = [host.request("GET", "/quillon/resources")]
    for kind in ("timescales", "syncableDevices", "SyncableDevices"):
        answers.append(host.request("GET", f"/quillon/resources?resourceType={kind}"))
    try:
        uris = [r["uri"] for r in json.loads(answers[1].body)["result"]["resources"]]
    except (ValueError, KeyError, TypeError):
        uris = []
    timescale = "/quillon/timescales/pendulo/tr0/00-80-2F-FF-FE-12-34-56"
    for uri in uris + [timescale + "-00", timescale.lower()]:
        answers.append(host.request("GET", uri, {"Accept": "text/html, */*"}))
    requests = [
        ("GET", DEVICE, {}, None),
        ("PUT", DEVICE, VENDOR, '{"maxOffsetNanos":1000}'),
        ("GET", DEVICE, {}, None),
        ("PUT", DEVICE, {}, "maxOffsetNanos=1"),
        ("PUT", DEVICE, VENDOR, ""),
        ("PUT", DEVICE + "%22", {}, "{}"),
        ("GET", DEVICE.lower(), {}, None),
        ("PUT", "/quillon/resources", {}, "{}"),
        ("PUT", timescale, {}, "{}"),
        ("GET", "/quillon/unknownCommand", {}, None),
        ("GET", "/quillon/unknownCommand/a/b/c", {}, None),
        ("GET", "/quillon/syncableDevices", {}, None),
        ("GET", "/quillon/timescales", {}, None),
        ("GET", DEVICE, {"Accept": "text/html"}, None),
        ("GET", DEVICE, {"Content-Type": "application/json"}, None),
        ("POST", "/quillon/resources", {}, "{}"),
        ("DELETE", DEVICE, {}, None),
        ("GET", "/quillon/resources/", {}, None),
        ("GET", "/elsewhere/resources", {}, None),
        ("GET", "/quillon/timescales/pendulo/tr%ZZ/x", {}, None),
        ("GET", "/quillon/timescales/pendulo/tr%FF/x", {}, None),
    ]
    answers += [host.request(method, target, headers, body) for method, target, headers, body in requests]
    return answers


def live_answers(program, scenarios):
    """Answers over the built-in scenario, each shipped example, an empty
    one, an unusable one, and from a host that takes small bodies only."""
    answers = []
    with tempfile.TemporaryDirectory(prefix="quillon-contract-") as scratch:
        empty = os.path.join(scratch, "empty.json")
        with open(empty, "w") as file:
            file.write('{"apiVersion":1,"selectedTrId":null,"trs":{}}')
        files = [None, empty, os.path.join(scratch, "missing.json")]
        files += sorted(os.path.join(scenarios, f) for f in os.listdir(scenarios) if f.endswith(".json"))
        for scenario in files:
            env = environment(KOPDM_SIM_SCENARIO=scenario, KOSYSQ_SHARE_DIR_FILE=None)
            with Host(program, env=env) as host:
                answers += served_answers(host)
                code = host.stop()
                if code != 0:
                    raise RuntimeError(f"ws-runtime over {scenario} stopped with {code}:\n{host.log()}")
        with Host(program, ["--max-body", "8"]) as host:
            answers.append(host.request("PUT", DEVICE, VENDOR, '{"maxOffsetNanos":1000}'))
            host.stop()
    return answers


def _altered(answer, change):
    """A copy of `answer` whose JSON body has every object passed through
    `change`, which returns the object to put in its place."""
    def walk(node):
        if isinstance(node, dict):
            return change({k: walk(v) for k, v in node.items()})
        if isinstance(node, list):
            return [walk(v) for v in node]
        return node
    altered = copy.copy(answer)
    altered.body = json.dumps(walk(json.loads(answer.body)), separators=(",", ":")).encode()
    return altered


def renamed(answer, old, new):
    return _altered(answer, lambda o: {(new if k == old else k): v for k, v in o.items()})


def retyped(answer, member, value):
    return _altered(answer, lambda o: {k: (value if k == member else v) for k, v in o.items()})


def wrong_answers(answers):
    """(what was changed, the altered answer) for answers that a strict
    description must refuse."""
    def first(status, needle):
        return next(a for a in answers if a.status == status and needle in a.body)
    device = first(200, b'"offsetNanos"')
    listing = first(200, b'"resources":[{')
    timescale = first(200, b'"grandmasterId"')
    failure = first(500, b'"errorInfo"')
    return [
        ("device: offsetNanos renamed offsetNano", renamed(device, "offsetNanos", "offsetNano")),
        ("device: coherent as a string", retyped(device, "coherent", "true")),
        ("listing: uri renamed url", renamed(listing, "uri", "url")),
        ("listing: version 2", retyped(listing, "version", 2)),
        ("timescale: grandmasterId renamed grandMasterId",
         renamed(timescale, "grandmasterId", "grandMasterId")),
        ("envelope: errorCode renamed errorcode", renamed(failure, "errorCode", "errorcode")),
        ("envelope: success true on a failure", retyped(failure, "success", True)),
        ("envelope: errorCode positive", retyped(failure, "errorCode", 52006)),
    ]


def _key(answer):
    """What makes two answers the same one for the check: not the headers
    that change from run to run."""
    headers = sorted((k.lower(), v) for k, v in answer.headers
                     if k.lower() not in ("date", "content-length", "connection"))
    return answer.method, answer.target, answer.status, tuple(headers), answer.body


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--document", required=True)
    parser.add_argument("--host", required=True)
    parser.add_argument("--scenarios", required=True)
    parser.add_argument("--answers", required=True)
    arguments = parser.parse_args()

    with open(arguments.document, encoding="utf-8") as file:
        document = yaml.safe_load(file)
    problems = [f"document: {p}" for p in check_document(document)]
    if problems:
        print("\n".join(problems))
        return 1

    recorded = read_answer_log(arguments.answers)
    if not recorded:
        problems.append(f"{arguments.answers}: the end-to-end suite logged no answer")
    answers = recorded + live_answers(arguments.host, arguments.scenarios)
    unique = {_key(a): a for a in answers}
    seen = set()
    for answer in unique.values():
        found, kind = validate_answer(document, answer)
        problems += found
        if kind:
            seen.add(kind)
    problems += [f"no answer of the kind '{k}' was seen" for k in sorted(EXPECTED_KINDS - seen)]

    for change, altered in wrong_answers(answers):
        found, _ = validate_answer(document, altered)
        if not found:
            problems.append(f"an answer with '{change}' passed the check")
        else:
            print(f"refused as it should be, {change}: {found[0]}")

    print(f"{len(recorded)} answers logged by the end-to-end suite, {len(answers) - len(recorded)} "
          f"served here; {len(unique)} distinct; kinds seen: {len(seen)}")
    for kind in sorted(seen - EXPECTED_KINDS):
        print(f"  also seen: {kind}")
    if problems:
        print("\n".join(problems))
        return 1
    print("every answer conforms to the document")
    return 0


if __name__ == "__main__":
    sys.exit(main())
