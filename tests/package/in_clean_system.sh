#!/bin/sh
# SPDX-License-Identifier: Apache-2.0
# scripts/package --test runs this as root in a minimal system, with the packages beside it:
# they can be installed and used there, and when they are removed nothing stays behind.
set -eu
here=$(dirname "$0")
root=/tmp/handset
pid=
trap '[ -z "$pid" ] || kill "$pid"' EXIT
export DEBIAN_FRONTEND=noninteractive LC_ALL=C.UTF-8

fail() {
    echo "FAILED: $*" >&2
    exit 1
}

# Every file, without what apt and dpkg keep about their own work.
files() {
    find / -xdev \( -path /proc -o -path /sys -o -path /dev -o -path "$here" -o -path /var/cache \
        -o -path /var/log -o -path /var/lib/apt \) -prune -o ! -path '/var/lib/dpkg/*-old' -print |
        sort
}

await() { # await COMMAND...: until it succeeds, for a minute
    for _ in $(seq 600); do
        "$@" >/dev/null 2>&1 && return 0
        sleep 0.1
    done
    fail "did not come about: $*"
}

files >"$here/before"
apt-get -qq update
apt-get -qq install --no-install-recommends "$here"/*.deb >"$here/apt.log" 2>&1 || {
    cat "$here/apt.log"
    fail "the packages cannot be installed"
}
for page in man1/kestctl.1 man1/kestlog.1 man5/kest_modem.conf.5 man8/kestmodem.8; do
    gzip -t "/usr/share/man/$page.gz" || [ -f /etc/dpkg/dpkg.cfg.d/excludes ]
done
for file in doc/kestmodem-tools/reading-logs.md doc/kestmodem-tools/json.md \
    zsh/vendor-completions/_kestlog kestmodem/wireshark/kestdiag.lua; do
    test -f "/usr/share/$file" || fail "there is no /usr/share/$file"
done

echo "-- the simulated handset serves"
kestsim --serve --rate 200 --root "$root" >"$here/serve.log" 2>&1 &
pid=$!
await grep -q 'control socket is ready' "$here/serve.log"
export KESTMODEM_ROOT="$root"
kestctl status | grep -q 'log WCDMA *ON' || fail "kestctl status"
kestctl save-ringbuf WCDMA
await test -s "$root"/data/modem_log/*/agdsp/0-*.log
kestctl flush
kill -INT "$pid"
wait "$pid" || fail "kestsim --serve: exit status $?"
pid=
kestlog ls "$root/data/modem_log" | grep 'ring buffer'
kestlog verify "$root/data/modem_log"
kestlog report "$root" -o - | grep -q '</html>' || fail "kestlog report"

echo "-- what it logged is played again"
kestsim --replay "$root" --speed max

echo "-- the service with the unit's commands and settings"
unit=$(dpkg -L kestmodem | grep '/kestmodem\.service$')
value() { sed -n "s/^$1=//p" "$unit"; }
export "$(value Environment)"
for dir in $(value StateDirectory); do
    mkdir -p "/var/lib/$dir"
done
value ExecStartPre | sh -e
$(value ExecStart) 2>"$here/service.log" &
pid=$!
await kestctl status
! setpriv --reuid 65534 --clear-groups kestctl status 2>/dev/null || fail "every user is served"
$(value ExecStop | sed 's/^-//')
[ "$(kestctl get-log-file-size)" = 5 ] || fail "the packaged settings do not count"
kill "$pid"
wait "$pid" || true
pid=
test -d /var/lib/kestmodem/data/modem_log

echo "-- removed again"
apt-get -qq purge kestmodem kestmodem-tools >>"$here/apt.log" 2>&1
apt-get -qq autoremove --purge >>"$here/apt.log" 2>&1
rm -r "$root"
files >"$here/after"
diff "$here/before" "$here/after" || fail "this is not as it was before (< gone, > left behind)"
echo "Nothing stays behind."
