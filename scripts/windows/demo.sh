#!/usr/bin/env bash
# The demonstration session with the Windows host: the installed
# dorvan-nebi-host.exe, run by Wine from a copy of the install tree's bin/
# (its DLLs beside it, nothing on any search path), against the Linux builds
# of the agent and cloud stand-ins on loopback ports. The user data folder,
# the archives in it and the log file have names outside ASCII.
#
#     scripts/windows/demo.sh LINUX_BIN WINDOWS_INSTALL DEMO_DIR
#
# LINUX_BIN holds quarl-agent-sim and nebi-cloud-sim; WINDOWS_INSTALL is the
# Windows install tree; DEMO_DIR is made anew. WINEPREFIX must name a Wine
# prefix whose server runs (scripts/test-windows sees to it). Exits non-zero
# when a step fails; stops the stand-ins in any case.
set -Eeuo pipefail

linux_bin=${1:?LINUX_BIN}
install_dir=${2:?WINDOWS_INSTALL}
demo_dir=${3:?DEMO_DIR}
: "${WINEPREFIX:?WINEPREFIX must be set}"

api_key=demo-api-key
api_secret=demo-api-secret

started_pids=()
stop_stand_ins() {
    for pid in "${started_pids[@]}"; do
        kill "$pid" 2>/dev/null || true
        wait "$pid" 2>/dev/null || true
    done
}
trap stop_stand_ins EXIT

fail() {
    echo "Windows demo FAILED: $*" >&2
    for log in "$demo_dir"/agent.log "$demo_dir"/cloud.log; do
        [ -f "$log" ] && { echo "--- last lines of $log" >&2; tail -n 15 "$log" >&2; }
    done
    exit 1
}

# Starts a stand-in in the background and waits until it says where it
# listens; sets port.
start_stand_in() {
    local log=$1
    shift
    : >"$log"
    "$@" >>"$log" 2>&1 &
    local pid=$!
    started_pids+=("$pid")
    port=""
    for _ in $(seq 1 100); do
        port=$(sed -n 's|.*listening on https\{0,1\}://127\.0\.0\.1:\([0-9]*\).*|\1|p' "$log")
        [ -n "$port" ] && return 0
        kill -0 "$pid" 2>/dev/null || fail "$(basename "$1") stopped at once"
        sleep 0.1
    done
    fail "$(basename "$1") did not start listening within 10 s"
}

rm -rf "$demo_dir"
# Names outside ASCII for everything the host and the connector write.
user_dir="$demo_dir/Zoë Ørsted ✓ 設定"
mkdir -p "$demo_dir/bin" "$user_dir"
cp "$install_dir"/bin/*.exe "$install_dir"/bin/*.dll "$demo_dir/bin/"

start_stand_in "$demo_dir/agent.log" "$linux_bin/quarl-agent-sim" --port 0 \
    --name "Mira Solberg" --email mira.solberg@example.com --role admin \
    --api-key "$api_key" --api-secret "$api_secret"
agent_port=$port
start_stand_in "$demo_dir/cloud.log" "$linux_bin/nebi-cloud-sim" --port 0 --data "$demo_dir/cloud" \
    --api-key "$api_key" --api-secret "$api_secret"
cloud_port=$port
ca_file=$(sed -n 's|.*CA certificate[^:]*: ||p' "$demo_dir/cloud.log")
[ -f "$ca_file" ] || fail "the cloud stand-in named no CA certificate"
echo "   local agent (Linux): http://127.0.0.1:$agent_port/api/v1; cloud (Linux): https://127.0.0.1:$cloud_port"

cat >"$demo_dir/bin/quarlconfig.json" <<EOF
{
    "quarlport": "$agent_port",
    "nebiprotocol": "https",
    "nebidomain": "127.0.0.1",
    "nebiport": "$cloud_port",
    "nebiclientappapiversion": "/api/clientapp/v1"
}
EOF

echo "   host (Windows, Wine): $demo_dir/bin/dorvan-nebi-host.exe"
status=0
# Wine hands the environment over; the paths in it must be Windows paths.
DORVAN_USER_DATA_DIR=$(winepath -w "$user_dir") \
DORVAN_LOG_FILE=$(winepath -w "$user_dir/connector-Ωmega.log") \
WINEPATH="" \
    wine "$demo_dir/bin/dorvan-nebi-host.exe" --ca "$(winepath -w "$ca_file")" session </dev/null || status=$?
[ "$status" -eq 0 ] || fail "the session ended with exit status $status (connector log: $user_dir/connector-Ωmega.log)"

# What the connector wrote under the non-ASCII names.
[ -s "$user_dir/connector-Ωmega.log" ] || fail "no connector log at $user_dir/connector-Ωmega.log"
[ -f "$user_dir/dorvannebiconnector/dorvannebiconnector.json" ] || fail "no connector configuration in $user_dir"
[ -d "$user_dir/Backup" ] || fail "no download folder in $user_dir"
echo "== What the cloud stand-in saw"
sed -n 's/^[0-9:.]* \(GET\|POST\|DELETE\) /   \1 /p' "$demo_dir/cloud.log"
echo "== The Windows demonstration passed. Logs: $demo_dir/{agent,cloud}.log, $user_dir/connector-Ωmega.log"
