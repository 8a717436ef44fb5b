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


def ask(program, method="GET", user="alice", status=200, success=True, body=None, headers=None, whole=True, who=None, **parameters):
    """Sends a request that the description allows (unless not `whole`), and holds the reply against it. `user` asks; `who`
    is the parameter `user` of a log-in."""
    parameters |= {"user": who} if who else {}
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
    return reply


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
        taken = {name for schema in (s for m in ("get", "post", "put") for s in requestSchemas(program, m)) for name in schema["properties"]}
        expect(read <= taken, f"{program}: parameters {read - taken} are not described")
        allowed = send(program, "DELETE", {}, "alice")[1]["Allow"]
        methods = {m.lower() for m in allowed.split(", ")} - {"head"}
        expect(methods == set(described["paths"]["/cgi-bin/" + program]), f"{program}: methods {allowed}")
        ask(program, "DELETE", status=405, success=False, whole=False)


def checkRefusals():
    """What a schema does not allow is refused."""
    search = ask("search", "POST", action="start", path="/photo", name="*")["data"]["taskid"]
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
                    ask(program, "POST", status=400, success=False, whole=False, **{**usual, name: wrong})
                if "maximum" in field:
                    ask(program, "POST", status=400, success=False, whole=False, **{**usual, name: field["maximum"] + 1})
            posted = action and item.get("get") and schema not in list(requestSchemas(program, "get"))
            if posted:
                ask(program, "GET", status=400, success=False, whole=False, **usual)
        if program not in ("share", "sessions"):
            method = "PUT" if program == "upload" else "POST"
            ask(program, method, status=403, success=False, whole=False, headers={"Origin": "http://elsewhere"})


def finished(task):
    for _ in range(1200):
        reply = ask("operation", action="status", taskid=task)
        if reply["data"]["finished"]:
            return reply["data"]
        time.sleep(0.05)
    failures.append(f"{task} does not end")
    return {}


def files():
    every = "real_path,size,owner,time,perm,type,mount_point_type,volume_status,sync_share,icon"
    ask("list", action="shares", additional=every, limit=5)
    ask("list", action="folder", path="/photo", limit=3, offset=1, sort_by="size", sort_direction="desc", filetype="file",
        pattern="*.jpg,*", additional=every)
    ask("list", "POST", action="folder", path_raw="/projects", additional="size")
    ask("list", action="folder", path="/nosuch", success=False)
    ask("list", action="folder", path="/photo", pattern="x" * 491, status=400, success=False)
    ask("list", whole=False, status=400, success=False)
    ask("upload", "PUT", path_raw="/projects/b%FFin/g%FFone", body=b"text")
    finished(ask("operation", "POST", action="delete", path_raw="/projects/b%FFin/g%FFone")["data"]["taskid"])
    ask("list", action="deleted", sort_by="from", sort_direction="asc", pattern="g*", limit=5, offset=0, filetype="file")

    for path in ("/projects", "/projects/not%FFtext"):
        kept = ask("list", action="folder", path_raw=path, keep="1", natural="de", folders_first="1", limit=2)["data"]["listing"]
        ask("list", action="page", listing=kept, offset=0, limit=2, additional="size")
    ask("list", action="find", listing=kept, prefix="x", **{"from": 1})
    ask("list", "POST", action="rows", listing=kept, names_raw="a%FF\nb")
    ask("list", action="renew", listing=kept)
    ask("list", action="page", listing="none", success=False)

    for attempt in range(100):  # a busy machine shows no rows within the time of a reply
        start = ask("search", "POST", action="start", path=["/photo", "/projects"], name="*", type="all", size_greater=1, limit=2)
        if "first" in start["data"]:
            break
        ask("search", "POST", action="clean", taskid=start["data"]["taskid"])
    task = start["data"]["taskid"]
    ask("search", action="list", taskid=task, limit=2, additional="size,perm", filter="a", sort_by="ppath")
    ask("search", "POST", action="stop", taskid=task)
    ask("search", "POST", action="clean", taskid=task)
    ask("search", action="list", taskid=task, success=False)
    ask("search", "POST", action="start", path="/photo", owner="nobody-of-this-name", success=False)
    ask("search", "POST", action="start", path="/photo", status=400, success=False)

    ask("operation", "POST", action="mkdir", path="/projects/made/below", parents="true")
    renamed = ask("operation", "POST", action="rename", path="/projects/made/below", name_raw="below too")["data"]["undo"]
    expect(finished(ask("operation", "POST", action="undo", taskid=renamed)["data"]["taskid"])["items_done"] == 1, "undone")
    ask("operation", "POST", action="undo", taskid=renamed, success=False)
    ask("operation", "POST", action="rename", path="/projects/made/below", name_raw="under%FF")
    ask("operation", "POST", action="mkdir", path="/projects/made", success=False)
    ask("operation", "POST", action="mkdir", path_raw="/projects/made%FF")
    ask("operation", action="subfolders", path="/projects/made")
    ask("operation", "POST", action="present", path="/projects/made", names_raw="under%FF\nnone")
    ask("upload", "PUT", path="/projects/made/a.txt", body=b"text")
    ask("upload", "PUT", path="/projects/made/a.txt", overwrite="skip", body=b"text")
    ask("upload", "PUT", path="/projects/made/a.txt", body=b"text", success=False)
    ask("upload", "PUT", path="/projects/made/a.txt", body=b"text", headers={"If-Match": "*"})
    ask("upload", "PUT", path="/projects/made/a.txt", body=b"text", status=412, success=False, headers={"If-None-Match": "*"})
    ask("upload", "PUT", path_raw="/projects/made/b%FF.txt", mtime=1000000000, body=b"text")
    ask("upload", "PUT", path="/projects/x", mtime=4294967296, body=b"text", status=400, success=False, whole=False)
    ask("upload", "PUT", path="/projects/x", overwrite="wrong", body=b"text", status=400, success=False, whole=False)
    form = b'--b\r\nContent-Disposition: form-data; name="file"; filename="c.txt"\r\n\r\ntext\r\n--b--\r\n'
    ask("upload", "POST", path="/projects/made", body=form, headers={"Content-Type": "multipart/form-data; boundary=b"})
    ask("upload", "POST", whole=False, status=400, success=False, body=b"x", headers={"Content-Type": "multipart/form-data"})

    for action, more in (("copy", {"path": ["/projects/made", "/projects/none"], "target": "/projects/house"}),
                         ("move", {"paths_raw": "/projects/house/made", "target": "/projects", "conflict": "keep_both"}),
                         ("compress", {"path": "/projects/made", "target_raw": "/projects/made.zip"}),
                         ("extract", {"path": "/projects/made.zip", "target": "/projects/made", "password": "x"}),
                         ("delete", {"path_raw": ["/projects/made/a.txt", "/projects/none%FF"]}),
                         ("restore", {"path": "/projects/#recycle/made/a.txt"}),
                         ("delete", {"path": "/projects/made.zip", "permanent": "true"}),
                         ("empty", {"path": "/projects"})):
        reply = ask("operation", "POST", action=action, **more)
        done = finished(reply["data"]["taskid"])
        expect(done.get("state") == "done", f"{action}: {done}")
    rows()
    ask("operation", action="status")
    ask("operation", "POST", action="cancel", taskid=reply["data"]["taskid"])
    ask("operation", "POST", action="clear", taskid=reply["data"]["taskid"])
    ask("operation", "POST", action="clear")
    ask("operation", "POST", action="cancel", taskid="none", success=False)

    ask("download", path="/projects/made/a.txt")
    ask("download", path="/projects/made/a.txt", status=206, headers={"Range": "bytes=1-2"})
    ask("download", path="/projects/made/a.txt", status=416, headers={"Range": "bytes=9-"})
    ask("download", path="/projects/made/a.txt", status=304, headers={"If-None-Match": "*"})
    ask("download", "POST", paths_raw="/projects/made/a.txt\nc.txt", name="two")
    ask("download", path="/projects/none", status=404, success=False)
    ask("download", user="bob", path="/projects/made/a.txt", status=403, success=False)
    ask("download", whole=False, status=400, success=False)

    picture = "/photo/Landscapes/Noon.png"
    ask("thumbnail", path=picture, size=100)
    ask("thumbnail", path=picture, size=100, status=304, headers={"If-None-Match": "*"})
    ask("thumbnail", "POST", path="/projects/notes.md", status=415, success=False)
    ask("thumbnail", path="/projects/none.png", status=404, success=False)
    ask("thumbnail", user="bob", path="/projects/notes.md", status=403, success=False)

    for path in ("/photo", "/home", "/projects/none"):
        ask("why", path=path)
    ask("why", "POST", user="bob", path="/projects")
    ask("why", path="/nosuch", success=False)


def rows():
    """What is chosen in a kept listing."""
    for name in ("one", "two"):
        ask("upload", "PUT", path=f"/projects/rows/{name}", body=b"text")
    kept = ask("list", action="folder", path="/projects/rows", keep="1")["data"]["listing"]
    finished(ask("operation", "POST", action="delete", path="/projects/rows/two", permanent="true")["data"]["taskid"])
    ask("upload", "PUT", path_raw="/projects/rows/new%FF", body=b"text")
    other = ask("list", action="folder", path="/projects/rows", keep="1")["data"]["listing"]
    ask("list", action="page", listing=kept)
    ask("list", action="carry", listing=kept, ranges="0-1", into=other)
    ask("operation", "POST", action="present", path="/projects/rows", listing=kept, ranges="0-1")
    ask("operation", "POST", action="delete", listing=kept, ranges="0-2", status=400, success=False)
    measured = ask("operation", "POST", action="measure", listing=kept, ranges="0-1", **{"except": "1"})
    expect(finished(measured["data"]["taskid"]).get("new_count") == 1, "what is new in the folder is not said")
    ask("download", listing=kept, ranges="0")


def links():
    ask("link", "POST", action="create", path_raw="/projects/not%FFtext", available=1, expires=4000000000)
    free = ask("link", "POST", action="create", path="/projects")["data"]["id"]
    word = ask("link", "POST", action="create", path="/projects/made/a.txt", password="word")["data"]["id"]
    ask("link", action="list")
    ask("preferences", "POST", action="set", values='{"mode":"grid","gone":null}')
    ask("preferences", action="get")
    ask("preferences", "POST", action="set", values="[]", status=400, success=False)
    ask("link", "POST", action="create", path="/projects/none", success=False)
    ask("link", "POST", action="create", path="/photo", available=9, status=400, success=False)

    visit = {"program": "share", "user": None}
    ask(**visit, FOLDER_SHARING=free)
    ask(**visit, FOLDER_SHARING=free, tunnel="//x", status=400, whole=False)
    ask(**visit, FOLDER_SHARING="none", status=404)
    ask(**visit, FOLDER_SHARING="none", action="state", status=404, success=False)
    ask(**visit, FOLDER_SHARING=free, action="nonsense", status=400, success=False, whole=False)
    ask(**visit, FOLDER_SHARING=free, action="state")
    ask(**visit, method="POST", FOLDER_SHARING=free, action="login")
    ask(**visit, FOLDER_SHARING=free, action="list", additional="size,time,type,icon", limit=20)
    ask(**visit, FOLDER_SHARING=free, action="list", path_raw="not%FFtext")
    ask(**visit, FOLDER_SHARING=free, action="list", path="none", success=False)
    ask(**visit, FOLDER_SHARING=free, action="download", path="made/a.txt")
    ask(**visit, method="POST", FOLDER_SHARING=free, action="download", path=["made/a.txt", "notes.md"])
    ask(**visit, FOLDER_SHARING=free, action="download", path="none", status=404, success=False)
    ask(**visit, FOLDER_SHARING=word, action="list", status=401, success=False)
    ask(**visit, method="POST", FOLDER_SHARING=word, action="login", password="wrong", status=403, success=False)
    ask(**visit, method="POST", FOLDER_SHARING=word, action="login", password="word", status=429, success=False)
    ask("link", "POST", action="revoke", id=word)
    ask("link", "POST", action="revoke", id=word, success=False)


def logIns():
    word = os.environ["ORVEL_TEST_ALICE"]
    ask("login", user="bob")
    ask("login", "POST", action="begin", who="alice", password=word)
    cookie = send("login", "POST", {"action": "begin", "user": "alice"}, "alice")[1]["Set-Cookie"].split(";")[0]
    ask("login", "POST", action="answer", text=word, headers={"Cookie": cookie})
    ask("login", "POST", action="begin", who="alice")
    ask("login", "POST", action="cancel")
    ask("login", "POST", action="answer", text="x", status=403, success=False)
    ask("login", "POST", action="begin", who="nobody-here", password="x", status=403, success=False)
    ask("sessions")
    ask("logout", "POST", scope="others")
    ask("logout", "POST")


# Of a network mount, an index, or a search that failed: nothing that a demo has.
UNSEEN = {"not_kept", "mount_type", "failure", "left_out", "share_raw", "current_raw", "code", "key"}


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
            expect((id(schema), member) in shown or member in UNSEEN, f"{where}.{member} never came")
            walk(inner, f"{where}.{member}", above | {id(schema)})
        walk(schema["items"], where, above) if "items" in schema else None

    for name, schema in schemas.items():
        if name.endswith("Reply") or name == "UploadFailure":
            walk(schema, name, frozenset())


checkText(described)
checkTable()
files()
links()
logIns()
checkRefusals()
checkCoverage()
for failure in failures:
    print("FAILED:", failure)
print(f"{len(answered)} actions served as described")
sys.exit(1 if failures else 0)
