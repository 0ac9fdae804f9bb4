# Text a caller chooses cannot forge log records: every string field of every
# operation, sent with control characters and bytes outside ASCII, leaves
# the log made of whole records only.

import base64
import json
import re

from harness import SOURCE_DIR, free_port, make_attestation_key, mint, start_seeded

HOSTILE = "x\nFORGED zyrd[1] op [main] Exiting with status 0\r\x1b[2K\x00\u2028\u00e9\\"
RECORD = re.compile(r"^\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{3}Z zyrd\[\d+\] [a-z?]+ \[[^\]]*\] ")


def sample(kind, structures, text):
    # A value of metamodel type `kind` whose strings are all `text`.
    if isinstance(kind, str):
        return {"string": text, "secret": text, "long": 1, "boolean": True,
                "binary": base64.b64encode(text.encode()).decode(),
                "date_time": text}[kind]
    (form, inner), = kind.items()
    if form == "optional":
        return sample(inner, structures, text)
    if form in ("list", "set"):
        return [sample(inner, structures, text)]
    if form == "enumeration":
        return text
    return {f["name"]: sample(f["type"], structures, text) for f in structures[inner]}


def operations():
    metamodel = json.loads((SOURCE_DIR / "metadata/zyr_lumo_metadata.json").read_text())["metamodel"]
    structures = {s["id"]: s["fields"] for p in metamodel["packages"] for s in p["structures"]}
    for package in metamodel["packages"]:
        for service in package["services"]:
            for op in service["operations"]:
                yield service["id"] + "." + op["id"], op["params"], structures


def test_no_caller_text_forges_a_log_record(tmp_path, request):
    key_path, cert = make_attestation_key(tmp_path / "attest")
    env = start_seeded(tmp_path / "root", {"attestationCertificate": cert, "providers": [{
        "provider": "p1", "masterKeyId": "k",
        "servers": [{"name": "s1", "hostname": "127.0.0.1", "port": free_port()}]}]},
        request, config="<log><level>trivia</level></log>")
    token = mint(key_path)
    calls = 0
    for method, params, structures in operations():
        for provider in (HOSTILE, "p1"):
            values = {p["name"]: sample(p["type"], structures, HOSTILE) for p in params}
            if "provider" in values:
                values["provider"] = provider
            for caller in (env.admin, token):
                env.client.call(method, values, caller)
                calls += 1
    assert calls > 80
    lines = env.daemon.log.read_text(errors="replace").split("\n")
    assert lines[-1] == ""
    forged = [line for line in lines[:-1] if not RECORD.match(line) or "\r" in line]
    assert forged == []
    assert any("x\\x0aFORGED" in line for line in lines)  # the text is there, escaped
