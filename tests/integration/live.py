"""An instance whose notification daemon watches the disk, and what its index must hold, for the tests of the live road."""

import contextlib
import json
import os
import stat
import struct
import time

from instance import TIMEOUT, Instance, differences, write

WAYS = ("fanotify", "fanotify inode marks", "inotify", "periodic scan")
FIELDS = ("KOVAMDPath", "KOVAMDIsDir", "KOVAMDFSSize", "KOVAMDFSContentChangeDate", "_KOVAStamp", "_KOVAAccess",
          "KOVAMDTextContent")


class LiveInstance(Instance):
    """Starts with no daemon, too; `shares` are those that are compared, by name."""

    def __init__(self, root=None):
        super().__init__(root)
        self.shares, self.sync_seconds = {}, TIMEOUT

    def watch_by(self, *ways, scan_interval=5):
        """From the next start of the notification daemon on, only these ways of watching are tried."""
        write(f"{self.root}/etc/kova/kova.json",
              json.dumps({"notifyd": {"watch": list(ways), "scan_interval": scan_interval}}))

    def share(self, name, folder=None):
        """Registers a share, made below the root unless it has a folder elsewhere."""
        folder = folder or f"{os.path.realpath(self.root)}/vol/{name}"
        os.makedirs(folder, exist_ok=True)
        self.ctl("share", "add", folder)
        self.shares[name] = folder
        return folder

    def notifyd(self, command="status", **data):
        reply = self.ask("kovanotifyd", {"type": command, "data": data}, b"\0", self.sync_seconds)
        assert reply["success"], reply
        return reply["data"]

    def watches(self):
        """What the daemon says of each watched folder, by its path."""
        return {watch["path"]: watch for queue in self.notifyd()["queues"] for watch in queue["watches"]}

    def sync(self, may_lack=False):
        """All changes up to now are in the index when it returns. What the notification daemon says against that fails
        the test, or is returned when it is what the test is about. An index daemon that has lost another one meanwhile
        says so, and may be asked again."""
        problems = self.notifyd("sync", timeout_ms=self.sync_seconds * 1000)["problems"]
        data = {"shares": list(self.shares), "timeout_ms": self.sync_seconds * 1000}
        end = time.monotonic() + self.sync_seconds
        while True:
            reply = self.ask("fileindexd", {"type": "sync", "data": data}, b"\0", self.sync_seconds)
            if reply["success"]:
                assert may_lack or not problems, problems
                return problems
            assert time.monotonic() < end, (reply, problems)
            time.sleep(0.1)

    def indexed(self, share):
        """Of each document of the share below its folder, by path, what the index says of it."""
        entries = self.entries(share, self.shares[share], *FIELDS)
        return {entry["KOVAMDPath"]: facts(entry["KOVAMDIsDir"], entry["KOVAMDFSSize"],
                                           entry["KOVAMDFSContentChangeDate"], entry["_KOVAStamp"],
                                           entry.get("_KOVAAccess"), entry.get("KOVAMDTextContent", ""))
                for entry in entries}

    def differences(self):
        """Of all shares, per path, what is on the disk and what is in the index, each without what both have."""
        found = {}
        for share, folder in self.shares.items():
            found.update(differences(disk(folder), self.indexed(share)))
        return found


def disk(folder):
    """Of each file and folder below a folder, by path, what the index must say of it."""
    found = {}
    with os.scandir(folder) as entries:
        for entry in entries:
            status = entry.stat(follow_symlinks=False)
            if stat.S_ISLNK(status.st_mode):
                continue
            is_folder = stat.S_ISDIR(status.st_mode)
            found[entry.path] = facts(is_folder, status.st_size, status.st_mtime_ns // 10**9, stamp(status),
                                      access(entry.path, status), "" if is_folder else text(entry.path))
            if is_folder:
                found.update(disk(entry.path))
    return found


def stamp(status):
    return f"{status.st_size}.{status.st_mtime_ns}.{status.st_ctime_ns}.{status.st_ino}"


def access(path, status):
    """Who may do what with a file, as the index says it."""
    entries = []
    with contextlib.suppress(OSError):  # it has no ACL
        acl = os.getxattr(path, "system.posix_acl_access", follow_symlinks=False)
        for tag, allowed, number in struct.iter_unpack("<HHI", acl[4:]):
            if tag in (2, 4, 8):
                entries.append(f"{'u' if tag == 2 else 'g'}{'' if tag == 4 else number}={allowed}")
    mode = f"{status.st_uid}:{status.st_gid}:{stat.S_IMODE(status.st_mode):04o}"
    return ":".join([mode, ",".join(entries)] if entries else [mode])


def facts(is_folder, size, seconds, seen, rights, content):
    if is_folder:  # what changes in a folder is told, not that the folder's own size and times change
        return {"folder": True, "inode": seen.split(".")[3], "rights": rights}
    return {"folder": False, "rights": rights, "size": size, "mtime": seconds, "stamp": seen, "text": content}


def text(path):
    with open(path, encoding="utf-8") as file:
        return file.read()
