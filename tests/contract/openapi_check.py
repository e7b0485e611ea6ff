"""Holds the OpenAPI document of the service against the rules of its kind,
and answers against the document.

No package of the distribution ships the OpenAPI 3.1 schema, so the
document's own check is the JSON Schema 2020-12 meta-schema (which
python3-jsonschema ships) applied to every Schema Object, plus the few
structural rules of the OpenAPI object written out below. Answers are
validated by python3-jsonschema against the schema of the response that the
document gives for their path, method, status code and media type."""

import json
import re

import jsonschema

OPERATIONS = ("get", "put", "post", "delete", "options", "head", "patch", "trace")
_STATUS_KEY = re.compile(r"^([1-5](\d\d|XX)|default)$")
_COMPONENT_NAME = re.compile(r"^[a-zA-Z0-9.\-_]+$")
_TEMPLATE_VARIABLE = re.compile(r"\{([^}/]+)\}")


def resolve(document, node):
    """`node`, or what its local "$ref" points at, followed to the end."""
    seen = set()
    while isinstance(node, dict) and "$ref" in node:
        reference = node["$ref"]
        if not reference.startswith("#/") or reference in seen:
            raise KeyError(f"unresolvable or circular $ref {reference}")
        seen.add(reference)
        node = document
        for part in reference[2:].split("/"):
            node = node[part.replace("~1", "/").replace("~0", "~")]
    return node


def _references(node):
    if isinstance(node, dict):
        if isinstance(node.get("$ref"), str):
            yield node["$ref"]
        for value in node.values():
            yield from _references(value)
    elif isinstance(node, list):
        for value in node:
            yield from _references(value)


def _schemas_of(document, node, where):
    """(place, Schema Object) of every media type, parameter and header
    below `node`, whose schemas are not walked into."""
    node = resolve(document, node)
    if isinstance(node, dict):
        for key, value in node.items():
            if key in ("schema", "contentSchema") and isinstance(value, dict):
                yield f"{where}/{key}", value
            elif key == "schemas":
                continue
            else:
                yield from _schemas_of(document, value, f"{where}/{key}")
    elif isinstance(node, list):
        for index, value in enumerate(node):
            yield from _schemas_of(document, value, f"{where}/{index}")


def check_document(document):
    """The problems of the document itself, [] when there are none."""
    problems = []
    if not re.fullmatch(r"3\.1\.\d+", str(document.get("openapi", ""))):
        problems.append("'openapi' is not a 3.1 version")
    info = document.get("info")
    if not isinstance(info, dict) or not all(isinstance(info.get(k), str) for k in ("title", "version")):
        problems.append("'info' needs the strings 'title' and 'version'")
    for reference in _references(document):
        try:
            resolve(document, {"$ref": reference})
        except (KeyError, TypeError, IndexError) as error:
            problems.append(f"$ref {reference} does not resolve: {error}")
    if problems:
        return problems

    components = document.get("components", {})
    for kind, entries in components.items():
        if not kind.startswith("x-"):
            problems += [f"component name {kind}/{name}" for name in entries if not _COMPONENT_NAME.match(name)]
    schemas = [(f"#/components/schemas/{name}", schema)
               for name, schema in components.get("schemas", {}).items()]
    schemas += list(_schemas_of(document, document.get("paths", {}), "#/paths"))
    schemas += list(_schemas_of(document, {k: v for k, v in components.items() if k != "schemas"},
                                "#/components"))
    for place, schema in schemas:
        try:
            jsonschema.Draft202012Validator.check_schema(schema)
        except jsonschema.SchemaError as error:
            problems.append(f"{place}: {error.message}")

    operation_ids = []
    paths = document.get("paths")
    if not isinstance(paths, dict) or not paths:
        return problems + ["'paths' must be a non-empty object"]
    for path, item in paths.items():
        if not path.startswith("/"):
            problems.append(f"path {path} does not start with /")
        variables = _TEMPLATE_VARIABLE.findall(path)
        shared = [resolve(document, p) for p in item.get("parameters", [])]
        for method in OPERATIONS:
            if method not in item:
                continue
            operation = item[method]
            where = f"{method.upper()} {path}"
            if "operationId" in operation:
                operation_ids.append(operation["operationId"])
            responses = operation.get("responses")
            if not isinstance(responses, dict) or not responses:
                problems.append(f"{where}: no responses")
                continue
            problems += [f"{where}: response key {key}" for key in responses if not _STATUS_KEY.match(str(key))]
            own = [resolve(document, p) for p in operation.get("parameters", [])]
            declared = {p["name"]: p for p in shared}
            declared.update({p["name"]: p for p in own})
            for variable in variables:
                parameter = declared.get(variable)
                if not parameter or parameter.get("in") != "path" or parameter.get("required") is not True:
                    problems.append(f"{where}: {{{variable}}} is not a required path parameter")
            for parameter in declared.values():
                if parameter.get("in") == "path" and parameter["name"] not in variables:
                    problems.append(f"{where}: path parameter {parameter['name']} is not in the path")
    duplicates = {i for i in operation_ids if operation_ids.count(i) > 1}
    problems += [f"operationId {i} is used twice" for i in sorted(duplicates)]
    return problems


def _validator(document, schema):
    root = dict(schema)
    root.setdefault("components", document.get("components", {}))
    return jsonschema.Draft202012Validator(root)


def _schema_problems(document, schema, instance, where):
    """[] when `instance` is valid, else the most telling of its errors."""
    error = jsonschema.exceptions.best_match(_validator(document, schema).iter_errors(instance))
    if error is None:
        return []
    return [f"{where}: {error.message[:300]} at {'/'.join(map(str, error.absolute_path)) or 'the top'}"]


def _route(document, path):
    """The path item whose template matches `path` with the most literal
    segments, or None."""
    segments = path.split("/")
    best, best_literals = None, -1
    for template, item in document["paths"].items():
        parts = template.split("/")
        if len(parts) != len(segments):
            continue
        literal = [not _TEMPLATE_VARIABLE.fullmatch(p) for p in parts]
        if any(is_literal and p != s for is_literal, p, s in zip(literal, parts, segments)):
            continue
        if any(not is_literal and s == "" for is_literal, s in zip(literal, segments)):
            continue
        if sum(literal) > best_literals:
            best, best_literals = (template, item), sum(literal)
    return best


def _json_texts(text):
    """Every JSON text of `text`, written back to back; ValueError when the
    text is not such a sequence."""
    decoder, values, position = json.JSONDecoder(), [], 0
    while position < len(text):
        value, position = decoder.raw_decode(text, position)
        values.append(value)
    if not values:
        raise ValueError("no JSON text")
    return values


def _is_json(media_type):
    essence = media_type.split(";")[0].strip().lower()
    return essence.endswith("/json") or essence.endswith("+json")


def _envelopes(instance):
    candidates = instance if isinstance(instance, list) else [instance]
    return [c for c in candidates if isinstance(c, dict) and isinstance(c.get("error"), dict)]


def _body_problems(document, media, media_type, body, where):
    schema = media.get("schema", {})
    try:
        text = body.decode("utf-8")
    except UnicodeDecodeError:
        return [f"{where}: the body is not UTF-8"]
    if not _is_json(media_type):
        return _schema_problems(document, schema, text, where)
    if text in media.get("x-bodies-sent-as-they-are", []):
        return []
    try:
        instance = _json_texts(text) if media.get("x-json-texts-back-to-back") else json.loads(text)
    except ValueError as error:
        return [f"{where}: the body is not JSON ({error}): {text[:200]}"]
    problems = _schema_problems(document, schema, instance, where)
    record_schema = document["components"]["schemas"]["ErrorRecord"]
    for envelope in _envelopes(instance):
        info = envelope["error"].get("errorInfo")
        if not isinstance(info, str):
            continue
        try:
            record = json.loads(info)
        except ValueError as error:
            problems.append(f"{where}: errorInfo is not JSON ({error})")
            continue
        problems += _schema_problems(document, record_schema, record, f"{where} errorInfo")
    return problems


def validate_answer(document, answer):
    """The ways in which `answer` (a quillon_host.Answer) departs from the
    document, [] when it conforms; and the name of the response it was held
    against, for coverage."""
    path = answer.target.split("?", 1)[0]
    routed = _route(document, path)
    if routed is None:
        template, responses = "(unrouted)", document.get("x-unrouted-paths", {})
    else:
        template, item = routed
        method = answer.method.lower()
        responses = item[method]["responses"] if method in item else item.get("x-other-methods", {})
    where = f"{answer.method} {answer.target} -> {answer.status}"
    key = str(answer.status)
    if key not in responses and "default" not in responses:
        return [f"{where}: status not documented for {answer.method} {template}"], None
    reference = responses.get(key, responses.get("default"))
    response = resolve(document, reference)
    operation = answer.method.lower() if routed is None or answer.method.lower() in routed[1] else "other"
    name = f"{operation} {template} {key}"
    problems = []

    for header_name, header in response.get("headers", {}).items():
        header = resolve(document, header)
        value = answer.header(header_name)
        if value is None:
            if header.get("required"):
                problems.append(f"{where}: header {header_name} missing")
            continue
        schema = resolve(document, header.get("schema", {}))
        try:
            instance = int(value) if schema.get("type") == "integer" else value
        except ValueError:
            instance = value
        problems += _schema_problems(document, header.get("schema", {}), instance, f"{where} {header_name}")

    media_type = answer.header("Content-Type")
    if media_type is None:
        untyped = response.get("x-without-content-type")
        if untyped is not None:
            name += " untyped"
            problems += _body_problems(document, untyped, "application/json", answer.body, where)
        elif answer.body:
            problems.append(f"{where}: a body without Content-Type is not documented")
        return problems, name
    content = response.get("content", {})
    if media_type not in content:
        return problems + [f"{where}: media type {media_type!r} not documented"], name
    name += f" {media_type}"
    problems += _body_problems(document, content[media_type], media_type, answer.body, where)

    status_code = answer.header("X-Status-Code")
    if status_code is not None:
        name += " X-Status-Code"
        codes = [e["error"].get("errorCode") for e in _envelopes(_parsed_or_none(answer.body))]
        if codes != [_int_or_none(status_code)]:
            problems.append(f"{where}: X-Status-Code {status_code} but the envelope says {codes}")
    return problems, name


def _parsed_or_none(body):
    try:
        return _json_texts(body.decode("utf-8"))
    except ValueError:
        return None


def _int_or_none(text):
    try:
        return int(text)
    except ValueError:
        return None
