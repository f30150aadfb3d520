#!/bin/bash
# usage: check_systemd.sh BUILD_FOLDER    Installs the build into a fresh small system, boots that in a container, and has
# the services started, killed, stopped and started at boot by systemd. As root, with debootstrap and systemd-container.
set -euo pipefail
build=$1
system=$(mktemp -d)
chmod 755 "$system"  # its "/", which all users enter
trap 'rm -rf "$system"' EXIT

libraries=libjsoncpp25,libsqlite3-0,libzstd1,libstemmer0d,libcld2-0,libuchardet0,libseccomp2,libmagic1,libzip4,libarchive13,libtag1v5-vanilla
libraries+=,libgmime-3.0-0,libpoppler-cpp0v5,libexiv2-27,libmediainfo0v5,libmicrohttpd12,libnettle8
debootstrap --variant=minbase --include="systemd,systemd-sysv,$libraries" bookworm \
  "$system" >"$build/systemd-image.log"
DESTDIR=$system cmake --install "$build" --prefix /usr >/dev/null
systemctl --root="$system" --quiet enable kovaelasticd.service kovanotifyd.service fileindex-prepare.service

cat >"$system/walk" <<'WALK'
#!/bin/bash
trap 'systemctl poweroff --no-block' EXIT
set -eux
expect() { [[ "$(systemctl is-active kovaelasticd.service kova-access.service kovanotifyd.service fileindexd.service | tr '\n' ' ')" == "$* " ]]; }
finds() { for _ in {1..50}; do fileindexctl search "$1" && return; sleep 0.1; done; false; }
as() { setpriv --reuid "$1" --regid "$1" --clear-groups "${@:2}"; }
finds_own() { for _ in {1..50}; do [[ "$(as "$1" fileindexctl search harbour | grep /own.txt)" == "/srv/docs/$1/own.txt" ]] && return; sleep 0.1; done; false; }
if [[ ! -e /srv/docs ]]; then
  mkdir -p /srv/docs
  echo lantern >/srv/docs/a.txt
  sleep 1
  expect active active active inactive
  [[ -e /tmp/ferrox_cfg_folder.lock ]]
  fileindexctl up
  fileindexctl share add /srv/docs
  expect active active active active
  finds lantern
  fileindexctl search --as 50001:50001 lantern
  [[ "$(stat -c %U "/proc/$(pidof kovaelasticd)")" == kova-engine ]]
  echo lighthouse >/srv/docs/b.txt
  finds lighthouse
  for user in 5001 5002; do
    mkdir -m 700 "/srv/docs/$user"
    echo harbour >"/srv/docs/$user/own.txt"
    chown -R "$user:$user" "/srv/docs/$user"
  done
  finds_own 5001
  finds_own 5002
  ! as 5001 fileindexctl search --share etc harbour
  ! as 5001 ls /etc/kova
  fileindexctl status
  fileindexctl status | tee /dev/stderr | grep "content extraction: runs"
  ! fileindexctl status | grep "lack a protection"
  systemctl kill -s KILL fileindexd.service
  sleep 3
  expect active active active active
  fileindexctl folder delete /docs
  expect active active active inactive
  fileindexctl folder add /docs
  expect active active active active
  echo "first boot done"
else
  expect active active active active
  finds lantern
  systemctl stop kovacontentextractd.service
  echo beacon >/srv/docs/c.txt
  finds beacon
  [[ "$(systemctl is-active kovacontentextractd.service)" == active ]]
  fileindexctl status
  fileindexctl down
  [[ "$(systemctl is-active kovacontentextractd.service)" == inactive ]]
  expect inactive inactive inactive inactive
  echo "second boot done"
fi
WALK
chmod +x "$system/walk"
cat >"$system/etc/systemd/system/walk.service" <<'UNIT'
[Unit]
After=fileindex-prepare.service
[Service]
ExecStart=/walk
StandardOutput=append:/walk.log
StandardError=append:/walk.log
[Install]
WantedBy=multi-user.target
UNIT
systemctl --root="$system" --quiet enable walk.service

for boot in first second; do
  timeout 120 systemd-nspawn --quiet --boot --directory="$system" --register=no --keep-unit >"$build/systemd-boot.log" 2>&1 || true
  grep -q "^$boot boot done" "$system/walk.log" || { cat "$system/walk.log"; exit 1; }
done
echo "systemd: started, killed, stopped, and started again at boot"
