#!/usr/bin/env bash
# Shows the protocol at work with the zarl tool: the message texts that the library
# builds, then a notification sent with `zarl notify` and received by `zarl listen`.
# Usage: scripts/demo.sh [BUILD_DIR]   (`make demo` builds the tool and runs this)
set -euo pipefail
cd "$(dirname "$0")/.."

ZARL=$(realpath "${1:-build/default}")/tools/zarl
if [ ! -x "$ZARL" ]; then
    echo "demo: $ZARL is missing; 'make demo' builds it" >&2
    exit 1
fi
zarl() { "$ZARL" "$@"; }

work=$(mktemp -d)
listener=
cleanup() {
    [ -n "$listener" ] && kill "$listener" 2>/dev/null
    rm -rf "$work"
}
trap cleanup EXIT

# Prints a title and the command, then runs it; a message text ends without a newline,
# so one is added for the terminal.
show() {
    printf '\n== %s\n$ %s\n' "$1" "$2"
    eval "$2"
    echo
}

# Prints the command, then runs it.
run() {
    printf '$ %s\n' "$1"
    eval "$1"
}

show "A request (string form: a newline follows the Requester attribute)" \
    "zarl request --subsystem Volume --request-name Mount --requester cli --sequence 17 \
--mount-point /shares/a --path docs --content '<Option Name = \"ro\"/>'"
show "A response (string form)" \
    "zarl response --subsystem Volume --request-name Mount --requester cli --sequence 17 \
--mount-point /shares/a --path docs --status ok --content '<Mounted/>'"
show "A response to GetStatus (list form: the items complete the start tag)" \
    "zarl response --subsystem Volume --request-name GetStatus --requester cli --sequence 18 \
--mount-point /shares/a --status ok --item ' Health = \"good\"' --item ' Usage = \"42%\">'"
show "A failed response (Status is always \"failed\")" \
    "zarl failed --subsystem Volume --request-name Mount --requester cli --sequence 19 \
--mount-point /shares/b --path docs --message 'mount point /shares/b is busy'"

printf '\n== A notification: a listener in the background, then Notify\n'
printf '$ zarl listen --count 1 --timeout 5 &\n'
zarl listen --count 1 --timeout 5 >"$work/listen.out" 2>"$work/listen.err" &
listener=$!
# Notify's datagram is lost if nobody listens yet: wait for the listener's ready line.
for _ in $(seq 100); do
    grep -q 'listening on' "$work/listen.err" && break
    if ! kill -0 "$listener" 2>/dev/null; then
        cat "$work/listen.err" >&2
        exit 1
    fi
    sleep 0.05
done
cat "$work/listen.err"
run "zarl notify --subsystem Volume --name Mounted --mount-point /shares/a/ --path docs \
--content '<Size>42</Size>'"
status=0
wait "$listener" || status=$?
listener=
printf '\n== What the listener printed (the mount point lost its trailing slash)\n'
cat "$work/listen.out"
if [ "$status" -ne 0 ]; then
    cat "$work/listen.err" >&2
    exit "$status"
fi
