#!/bin/bash
# usage: check_units.sh BUILD_FOLDER UNITS_FOLDER    Holds the units against systemd's own judgement, and, as root, has the
# daemons work in an instance with no other capabilities than their units leave them, the search engine as a user of its
# own with what a root's left behind. 77: systemd-analyze is missing.
set -euo pipefail
bin=$1/bin units=$2
work=$(mktemp -d)
trap 'FERROX_ROOT=$work/root "$bin/fileindexctl" down >/dev/null || true; rm -rf "$work"' EXIT
command -v systemd-analyze >/dev/null || { echo "skipped: there is no systemd-analyze"; exit 77; }

fail() { echo "$*"; exit 1; }
engine=50009 web=50008
daemons=(kovaelasticd kova-access fileindexd kovanotifyd kovacontentextractd kovawebd)
mkdir "$work/libexec" "$work/units"
ln -s "$bin"/* "$work/libexec"
for daemon in "${daemons[@]}"; do
  unit=$work/units/$daemon.service
  sed 's,@sbin_folder@/.*,/bin/true,' "$units/$daemon.service.in" >"$unit"
  case $daemon in kovaelasticd) worst=10 ;; kova-access) worst=20 ;; kovawebd) worst=15 ;; *) worst=40 ;; esac
  systemd-analyze security --offline=true --threshold=$worst --no-pager "$unit" >"$work/judgement" 2>&1 ||
    fail "$daemon is judged worse than $((worst / 10)).0: $(cat "$work/judgement")"
  grep -qx "StartLimitIntervalSec=0" "$unit" || fail "$daemon is given up after a few ends"
  capabilities=$(sed -n 's/^CapabilityBoundingSet=//p' "$unit" | tr 'A-Z ' 'a-z,' | sed 's/cap_/+/g')
  rm "$work/libexec/$daemon"
  ids= && grep -q '^User=kova-engine$' "$unit" && ids="--reuid $engine --regid $engine --clear-groups"
  grep -q '^User=kova-web$' "$unit" && ids="--reuid $web --regid $web --clear-groups"
  printf '#!/bin/sh\nexec setpriv %s --no-new-privs --bounding-set=-all%s --inh-caps=-all %s\n' "$ids" \
    "${capabilities:+,$capabilities}" "$bin/$daemon" >"$work/libexec/$daemon"
  chmod +x "$work/libexec/$daemon"
done

[[ $EUID == 0 ]] || { echo "skipped in part: only root has capabilities to lose"; exit 0; }
export FERROX_ROOT=$work/root
finds() { for _ in {1..100}; do "$bin/fileindexctl" search "$1" >/dev/null 2>&1 && return; sleep 0.1; done; fail "$1 is not found"; }
share=$work/docs
mkdir "$share"
echo lantern >"$share/a.txt"
chown -R 1000:1000 "$share"
chmod 0700 "$share"
"$bin/fileindexctl" up --no-supervisor >/dev/null
"$bin/fileindexctl" share add "$share" >/dev/null
finds lantern
"$bin/fileindexctl" down >/dev/null
"$bin/kovaelasticd" --prepare $engine
"$bin/kovawebd" --prepare $web
chmod 755 "$work"
export FERROX_LIBEXEC=$work/libexec
"$bin/fileindexctl" up --no-supervisor >/dev/null
for daemon in "${daemons[@]}"; do
  pid=$(cat "$work/root/var/run/$daemon.pid")
  ! grep -q '^CapBnd:.*1ffffffffff$' "/proc/$pid/status" || fail "$daemon runs with every capability"
done
grep -q "^Uid:.*$engine.*$engine.*$engine" "/proc/$(cat "$work/root/var/run/kovaelasticd.pid")/status" || fail "the engine is not a user of its own"
finds lantern
echo lighthouse >"$share/b.txt"
chmod 0600 "$share/b.txt"
finds lighthouse
"$bin/fileindexctl" share rename docs papers >/dev/null
finds lantern
"$bin/fileindexctl" folder delete /papers >/dev/null
