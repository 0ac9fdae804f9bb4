# A local zyrd environment (sourced by scripts/run-local and the benchmarks):
# a root directory with configuration and metadata, a PyKMIP server on a free
# loopback port with throwaway certificates and an active AES-256 master key,
# a provider "local" using it, and a test attestation key.
#
#   local_env_root ROOT [CONFIG-XML-BODY]  creates ROOT's configuration (once)
#                                          and metadata; exports ZYRD_ROOT
#   local_env_kmip                         starts the KMIP server; sets
#                                          kmip_port and key_id
#   local_env_cleanup                      stops it (call it from an EXIT trap)
#   local_env_seed BUILD-DIR               stores provider "local" and the
#                                          attestation certificate
#   local_env_token [TTL]                  prints a fresh attestation token

local_env_src=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
local_env_py=/usr/bin/python3
local_env_tool="$local_env_src/tools/pykmip_tool.py"
local_env_pids=()

local_env_cleanup() {
  local p
  for p in "${local_env_pids[@]}"; do
    kill -INT "$p" 2>/dev/null || true
    wait "$p" 2>/dev/null || true
  done
}

local_env_root() {
  root=$1
  mkdir -p "$root"
  root=$(cd "$root" && pwd)
  export ZYRD_ROOT="$root"
  config="$root/etc/tarsel/cpservices/zyrd/config.xml"
  if [[ ! -f "$config" ]]; then
    mkdir -p "$(dirname "$config")"
    printf '<config>\n  %s\n</config>\n' "${2:-<log><level>info</level></log>}" > "$config"
  fi
  # The API metadata, as the package installs it.
  local metadata="$root/usr/lib/tarsel/lumo/zyr_lumo_metadata.json"
  mkdir -p "$(dirname "$metadata")"
  cp "$local_env_src/metadata/zyr_lumo_metadata.json" "$metadata"
  kmip="$root/kmip"
  attest="$root/attestation"
}

local_env_kmip() {
  # Certificates and database stay under the root, so the master key survives
  # restarts; only the port changes.
  [[ -f "$kmip/pki/ca.pem" ]] || "$local_env_py" "$local_env_tool" pki "$kmip/pki"
  kmip_port=$("$local_env_py" -c \
    'import socket; s = socket.socket(); s.bind(("127.0.0.1", 0)); print(s.getsockname()[1])')
  "$local_env_py" "$local_env_tool" config "$kmip/pki" "$kmip_port" "$kmip/run"
  /usr/bin/pykmip-server -f "$kmip/run/server.conf" -l "$kmip/run/server.log" \
    >"$kmip/run/server.out" 2>&1 </dev/null &
  local pid=$!
  local_env_pids+=("$pid")
  local _
  for _ in $(seq 300); do
    (exec 3<>"/dev/tcp/127.0.0.1/$kmip_port") 2>/dev/null && break
    kill -0 "$pid" 2>/dev/null || { cat "$kmip/run/server.out" >&2; return 1; }
    sleep 0.1
  done
  if [[ ! -s "$kmip/master-key-id" ]]; then
    "$local_env_py" "$local_env_tool" admin "$kmip/pki" "$kmip_port" create 256 -- activate '$1' \
      | sed -n 1p > "$kmip/master-key-id"
  fi
  key_id=$(cat "$kmip/master-key-id")
}

local_env_seed() {
  local build_dir=$1
  [[ -f "$attest/attestation-key.pem" ]] ||
    "$local_env_src/tools/make-attestation-key" "$attest" >/dev/null
  "$local_env_py" - "$kmip" "$kmip_port" "$key_id" "$attest" <<'PY' |
import json, pathlib, sys
kmip, port, key_id = pathlib.Path(sys.argv[1]), int(sys.argv[2]), sys.argv[3]
attest = pathlib.Path(sys.argv[4])
pki = kmip / "pki"
print(json.dumps({
    "providers": [{
        "provider": "local", "masterKeyId": key_id, "connectionTimeout": 10,
        "servers": [{"name": "kmip-local", "hostname": "127.0.0.1", "port": port}],
        "trustedCertificates": [(pki / "ca.pem").read_text()],
        "clientCertificate": (pki / "client.pem").read_text(),
        "clientPrivateKey": (pki / "client.key").read_text()}],
    "attestationCertificate": (attest / "attestation-cert.pem").read_text()}))
PY
    "$local_env_src/tools/zyrd-seed" --cfgvault "$build_dir/cfgvault" -
}

local_env_token() {
  "$local_env_src/tools/mint-attestation-token" --key "$attest/attestation-key.pem" \
    --ttl "${1:-86400}"
}
