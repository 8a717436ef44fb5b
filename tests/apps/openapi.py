"""Holds docs/openapi.yaml against the real replies of the programs, and against their table.

  openapi.py SOURCE BUILD URL      the passwords of the demo's users in ORVEL_TEST_ALICE and so on
"""
import base64
import json
import os
import pathlib
import re
import subprocess
import sys
import time
import urllib.parse
import urllib.request

import jsonschema
import yaml

source, build, url = pathlib.Path(sys.argv[1]), pathlib.Path(sys.argv[2]), sys.argv[3]
described = yaml.safe_load((source / "docs/openapi.yaml").read_text(encoding="utf-8"))
schemas = described["components"]["schemas"]
resolver = jsonschema.RefResolver("", described)
failures = []
answered = set()  # schemas of requests that were served
shown = set()  # members of replies that were seen


def expect(condition, what):
    if not condition:
        failures.append(what)


def follow(node):
    while isinstance(node, dict) and "$ref" in node:
        node = resolver.resolve(node["$ref"])[1]
    return node


def fits(value, schema, what):
    validator = jsonschema.Draft202012Validator(schema, resolver=resolver)
    problem = jsonschema.exceptions.best_match(validator.iter_errors(value))
    expect(problem is None, f"{what}: {problem.message if problem else ''} at {list(problem.path) if problem else ''}")
    return problem is None


def note(value, schema):
    """Which described members a reply shows."""
    schema = follow(schema)
    for member, inner in schema.get("properties", {}).items():
        if isinstance(value, dict) and member in value:
            shown.add((id(schema), member))
            note(value[member], inner)
    for element in value if isinstance(value, list) else []:
        note(element, schema.get("items", {}))


def requestSchemas(program, method):
    operation = described["paths"]["/cgi-bin/" + program].get(method, {})
    found = [p["schema"] for p in operation.get("parameters", []) if p["in"] == "query"]
    found += [c["schema"] for t, c in operation.get("requestBody", {}).get("content", {}).items() if "urlencoded" in t]
    for schema in found:
        schema = follow(schema)
        for name in schema.get("oneOf", [schema]):
            yield follow(name)


def schemaOf(program, parameters):
    """The schema of an action, whatever its method."""
    for method in ("get", "post", "put"):
        for schema in requestSchemas(program, method):
            action = follow(schema["properties"].get("action", {})).get("const", "")
            if action == parameters.get("action", ""):
                return schema
    return None


def send(program, method, parameters, user, body=None, headers=None):
    headers = dict(headers or {})
    if user:
        word = os.environ["ORVEL_TEST_" + user.upper()]
        headers["Authorization"] = "Basic " + base64.b64encode(f"{user}:{word}".encode()).decode()
    form = urllib.parse.urlencode(parameters, doseq=True)
    address = f"{url}/cgi-bin/{program}"
    if method == "POST" and body is None:
        body = form.encode()
    elif form:
        address += "?" + form
    request = urllib.request.Request(address, data=body, headers=headers, method=method)
    try:
        with urllib.request.urlopen(request, timeout=60) as reply:
            return reply.status, reply.headers, reply.read()
    except urllib.error.HTTPError as error:
        return error.code, error.headers, error.read()


def ask(program, method, parameters, user="alice", status=200, success=True, body=None, headers=None, whole=True):
    """Sends a request that the description allows (unless not `whole`), and holds the reply against it."""
    what = f"{method} {program} {parameters}"
    schema = schemaOf(program, parameters)
    if schema is None:
        expect(not whole, f"{what}: no such action is described")
        whole = False
    if whole:
        numbers = {k: int(v) if str(v).isdigit() and follow(schema["properties"].get(k, {})).get("type") == "integer" else v
                   for k, v in parameters.items()}
        fits(numbers, schema, "request " + what)
    got, replied, text = send(program, method, parameters, user, body, headers)
    expect(got == status, f"{what}: status {got}, not {status}: {text[:200]}")
    operation = described["paths"]["/cgi-bin/" + program].get(method.lower())
    if operation is None:
        item = described["paths"]["/cgi-bin/" + program]
        operation = item.get("post", item.get("get"))
    response = follow(operation["responses"].get(str(got)))
    if response is None:
        failures.append(f"{what}: status {got} is not described")
        return {}
    kind = replied.get_content_type()
    content = response.get("content", {})
    expect(not text or kind in content, f"{what}: {kind} is not described for {got}")
    if kind != "application/json":
        answered.add(id(schema))
        return {}
    reply = json.loads(text)
    expect(reply["success"] == success, f"{what}: {reply}")
    if fits(reply, content[kind]["schema"], f"{what}: {text[:300]}") and reply["success"] and whole:
        names = schema.get("x-reply", [])
        for name in [names] if isinstance(names, str) else names:
            if isinstance(names, list) and not jsonschema.Draft202012Validator(schemas[name], resolver=resolver).is_valid(reply):
                continue
            fits(reply, schemas[name], f"{what} as {name}")
            note(reply, schemas[name])
            answered.add(id(schema))
    if not reply["success"]:
        for choice in follow(content[kind]["schema"]).get("oneOf", []) + [content[kind]["schema"]]:
            note(reply, choice)
    return reply | {"headers": replied}


def checkText(node, where=""):
    """A comma in an unquoted text would end it and begin a member without a value."""
    for name, value in node.items() if isinstance(node, dict) else enumerate(node) if isinstance(node, list) else ():
        expect(value is not None, f"{where}: {name} has no value")
        checkText(value, f"{where}/{name}")


def checkTable():
    """Every program and action of the code is described, and nothing else."""
    known = subprocess.run([build / "cgi/orvel-cgi"], capture_output=True, text=True, check=False).stderr
    programs = set(known.split(":")[-1].split())
    expect(len(programs) >= 8, f"no programs: {known}")
    expect({"/cgi-bin/" + name for name in programs} == set(described["paths"]), f"programs: {programs}")
    for program in sorted(programs & {path.split("/")[-1] for path in described["paths"]}):
        code = "".join(path.read_text() for path in (source / "apps/cgi" / program).glob("*.cpp"))
        actions = set(re.findall(r'action [!=]= "(\w+)"', code) + re.findall(r'\{"(\w+)", Takes::', code))
        named = {follow(s["properties"].get("action", {})).get("const")
                 for method in ("get", "post") for s in requestSchemas(program, method)} - {None, ""}
        expect(actions == named, f"{program}: its actions are {actions}, described are {named}")
        read = set(re.findall(r'Params?\((?:[\w.]+, )?"(\w+)"', code))
        taken = {name for schema in (s for m in ("get", "post", "put", "patch", "delete") for s in requestSchemas(program, m)) for name in schema["properties"]}
        expect(read <= taken, f"{program}: parameters {read - taken} are not described")
        refused = "PUT" if program == "tus" else "DELETE"
        allowed = send(program, refused, {}, "alice")[1]["Allow"]
        methods = {m.lower() for m in allowed.split(", ")} - {"head"}
        expect(methods == set(described["paths"]["/cgi-bin/" + program]), f"{program}: methods {allowed}")
        ask(program, refused, {}, status=405, success=False, whole=False)


def checkResumed():
    """An upload in two pieces; what has no body is held against its status alone."""
    version = {"Tus-Resumable": "1.0.0"}
    piece = version | {"Content-Type": "application/offset+octet-stream"}
    asked = {"path": "/projects/resumed", "conflict": "overwrite", "mtime": 1}
    begun = ask("tus", "POST", asked, status=201, headers=version | {"Upload-Length": "4"})
    ask("tus", "GET", {}, whole=False)
    ask("tus", "POST", asked, status=412, success=False, headers={"Upload-Length": "4"})
    known = set(map(int, described["paths"]["/cgi-bin/tus"]["patch"]["responses"]))
    one = {"id": begun["data"]["id"]}
    for method, headers, body, status in (("OPTIONS", {}, None, 204), ("PATCH", piece | {"Upload-Offset": "0"}, b"te", 204),
                                          ("PATCH", piece | {"Upload-Offset": "0"}, b"te", 409),
                                          ("PATCH", piece | {"Upload-Offset": "2", "Upload-Checksum": "md5 kAFQmDzST7DWlj99KOF/cg=="}, b"xt", 460),
                                          ("PATCH", piece | {"Upload-Offset": "2"}, b"xt", 204), ("DELETE", version, None, 204),
                                          ("DELETE", version, None, 404)):
        got = send("tus", method, one, "alice", body, headers)[0]
        expect(got == status and status in known, f"{method} tus: status {got}, not {status}")


def checkRefusals():
    """What a schema does not allow is refused."""
    search = ask("search", "POST", {"action": "start", "path": "/photo", "name": "*"})["data"]["taskid"]
    for path, item in described["paths"].items():
        program = path.split("/")[-1]
        for schema in requestSchemas(program, "post"):
            fields = schema["properties"]
            action = follow(fields.get("action", {})).get("const", "")
            if program == "share" or (not action and program != "thumbnail"):
                continue
            usual = {"action": action, "path": "/photo", "target": "/photo/none", "name": "x", "taskid": search, "id": "x"}
            usual = {k: v for k, v in usual.items() if k in fields}
            if schema is schemas["SearchStart"]:
                usual |= {"name": "*", "limit": 1}  # the parameters of a page count where one is asked for
            if program == "operation" and fields.get("taskid") != {"$ref": "#/components/schemas/OperationId"}:
                usual.pop("taskid")
            for name, field in fields.items():
                field = follow(field)
                wrong = "wrong" if "enum" in field else "x" if field.get("type") == "integer" else "?" if "pattern" in field else None
                if wrong is not None:
                    ask(program, "POST", usual | {name: wrong}, status=400, success=False, whole=False)
                if "maximum" in field:
                    ask(program, "POST", usual | {name: field["maximum"] + 1}, status=400, success=False, whole=False)
            posted = action and item.get("get") and schema not in list(requestSchemas(program, "get"))
            if posted:
                ask(program, "GET", usual, status=400, success=False, whole=False)
        if program not in ("send", "share", "sessions"):
            method = "PUT" if program == "upload" else "POST"
            ask(program, method, {}, status=403, success=False, whole=False, headers={"Origin": "http://elsewhere"})


def finished(task):
    for _ in range(1200):
        reply = ask("operation", "GET", {"action": "status", "taskid": task})
        if reply["data"]["finished"]:
            return reply["data"]
        time.sleep(0.05)
    failures.append(f"{task} does not end")
    return {}


def checkRequests():
    """What programs answer to the requests of data/apps/openapi_requests.yaml."""
    known = {"alice": os.environ["ORVEL_TEST_ALICE"], "long": "x" * 491,
             "every": "real_path,size,owner,time,perm,type,mount_point_type,volume_status,sync_share,icon"}

    def filled(values):
        return {k: known[v[1:]] if str(v).startswith("$") else v for k, v in values.items()}

    for program, method, parameters, *more in yaml.safe_load((source / "tests/data/apps/openapi_requests.yaml").read_text(encoding="utf-8")):
        usual = {"user": None if program == "share" else "alice", "keep": {}, "finished": None, "until": None, "headers": {}}
        told = usual | (more[0] if more else {})
        keep, end, until = told.pop("keep"), told.pop("finished"), told.pop("until")
        told["headers"] = filled(told["headers"])
        if "body" in told:
            told["body"] = told["body"].encode()
        for _ in range(100):
            reply = ask(program, method, filled(parameters), **told)
            if until is None or until in reply["data"]:
                break
            ask(program, "POST", {"action": "clean", "taskid": reply["data"]["taskid"]})
        known |= {name: reply["data"].get(member) or reply["headers"][member].split(";")[0] for name, member in keep.items()}
        if end is not None:
            record = finished(reply["data"]["taskid"])
            expect(end.items() <= record.items(), f"{method} {program} {parameters}: {record}")


# Of a network mount, an index, a search that failed, or an archive made elsewhere: nothing that a demo has.
UNSEEN = {"not_kept", "mount_type", "failure", "left_out", "share_raw", "current_raw", "code", "key", "ListArchiveReply.data.cut",
          "ListArchiveReply.data.items.name_raw", "ListArchiveReply.data.items.link"}


def checkCoverage():
    """Every described action was served, and every described member shown."""
    for path, item in described["paths"].items():
        program = path.split("/")[-1]
        for schema in (s for method in ("get", "post", "put") for s in requestSchemas(program, method)):
            expect(id(schema) in answered, f"{program} {schema['properties'].get('action', '')}: no request was served")

    def walk(schema, where, above):
        schema = follow(schema)
        if id(schema) in above:
            return
        for member, inner in schema.get("properties", {}).items():
            expect((id(schema), member) in shown or {member, f"{where}.{member}"} & UNSEEN, f"{where}.{member} never came")
            walk(inner, f"{where}.{member}", above | {id(schema)})
        walk(schema["items"], where, above) if "items" in schema else None

    for name, schema in schemas.items():
        if name.endswith("Reply") or name == "UploadFailure":
            walk(schema, name, frozenset())


checkText(described)
checkTable()
checkRequests()
checkResumed()
checkRefusals()
checkCoverage()
for failure in failures:
    print("FAILED:", failure)
print(f"{len(answered)} actions served as described")
sys.exit(1 if failures else 0)
