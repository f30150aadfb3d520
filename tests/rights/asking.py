"""What the proofs of this folder share: an instance that every user may reach, users without accounts, ACLs, and the
engine's socket as such a user or as root on behalf of one."""

import argparse
import collections
import ctypes
import json
import os
import pickle
import socket
import struct
import subprocess
import sys
import time

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "integration"))

from instance import BIN, to_bytes  # noqa: E402
from live import LiveInstance  # noqa: E402

SKIPPED = 77  # the exit code of a program that cannot prove anything here
ACCESS, DEFAULT = "system.posix_acl_access", "system.posix_acl_default"
OWNER, USER, GROUP, NAMED_GROUP, MASK, OTHER = 1, 2, 4, 8, 16, 32  # tags of ACL entries
NO_NUMBER = 0xFFFFFFFF
NO_SHARE = 1404
AT_FDCWD, RENAME_EXCHANGE = -100, 2
LIBC = ctypes.CDLL(None, use_errno=True)

User = collections.namedtuple("User", "uid groups")  # the first of the groups is the primary one


def arguments(description, **numbers):
    """The program's numbers (name=default), from the command line; ends the program where it can prove nothing."""
    parser = argparse.ArgumentParser(description=description, formatter_class=argparse.RawDescriptionHelpFormatter)
    for name, default in numbers.items():
        parser.add_argument("--" + name.replace("_", "-"), type=int, default=default)
    parsed = parser.parse_args()
    if os.geteuid() != 0:
        print("skipped: only root can take on the ids of other users")
        sys.exit(SKIPPED)
    return parsed


def end(text, failures):
    """The summary line, and the exit code."""
    print(("FAILED: " if failures else "passed: ") + text, flush=True)
    sys.exit(1 if failures else 0)


class SharedInstance(LiveInstance):
    """An instance of root's in a folder that all users may enter; its engine is a user of its own, as on a server."""

    def __init__(self, root=None):
        super().__init__(root)
        os.chmod(self.root, 0o755)
        subprocess.run([os.path.join(BIN, "kovaelasticd"), "--prepare", "50009"], env=self.env, check=True)
        self.ctl("up")

        os.chmod(self.engine_socket(), 0o666)  # whatever it is on an installed system

    def engine_socket(self):
        return f"{self.root}/var/run/kovaelasticd.sock"

    def connect(self):
        return Engine(self.engine_socket())


class Engine:
    """A connection to the engine, with the ids of the calling process."""

    def __init__(self, path):
        self.socket = socket.socket(socket.AF_UNIX)
        self.socket.settimeout(60)
        try:
            self.socket.connect(path)
        except OSError:
            self.socket.close()
            raise
        self.stream = self.socket.makefile("rb")

    def close(self):
        self.stream.close()
        self.socket.close()

    def ask(self, command, data, user=None):
        """The reply's bytes. With a user: what root is told that this user would be."""
        return self.ask_bytes(request(command, data, user))

    def ask_bytes(self, body):
        self.send(body)
        reply = self.receive_or_nothing()
        if not reply:
            raise ConnectionError("the engine closed the connection")
        return reply

    def send(self, body):
        self.socket.sendall(struct.pack("=I", len(body)) + body)

    def receive_or_nothing(self):
        """The next reply; b"" when the engine has closed the connection."""
        try:
            length = self.stream.read(4)
            return self.stream.read(struct.unpack("=I", length)[0]) if len(length) == 4 else b""
        except ConnectionError:
            return b""

    def answers(self, body):
        try:
            self.send(body)
        except ConnectionError:
            return False
        return self.receive_or_nothing() != b""

    def pages(self, share, query, limit, user=None):
        """All that a query finds, page by page: the paths, as bytes, in order, and the total of the first page; None where
        there is no such share for the user."""
        offset, paths, total = 0, [], None
        while True:
            data = {"shares": [share], "query": query, "offset": offset, "limit": limit, "snippet": False}
            reply = parse(self.ask("search", data, user))
            if not reply["success"] and reply["error"]["code"] == NO_SHARE:
                return None
            assert reply["success"], (query, reply)
            result = reply["data"]
            total = result["total"] if total is None else total
            paths += [to_path(hit["doc_id"]) for hit in result["hits"]]
            if len(result["hits"]) < limit:
                return paths, total
            offset = result["next_offset"]


def request(command, data, user=None):
    if user:
        data = dict(data, **{"as": {"uid": user.uid, "groups": sorted(user.groups)}})
    return to_bytes({"command": command, "data": data})


def parse(reply):
    return json.loads(reply.decode("utf-8", "surrogateescape"))


def to_path(name):
    return name.encode("utf-8", "surrogateescape")


class Child:
    """What `work` returns in a process that has a user's ids and no capability; it runs beside the caller until result()
    is asked for."""

    def __init__(self, user, work):
        sys.stdout.flush()
        self.pipe, out = os.pipe()
        self.pid = os.fork()
        if self.pid:
            os.close(out)
            return
        code = 1
        try:
            take_ids(user)
            with os.fdopen(out, "wb") as stream:
                pickle.dump(work(), stream)
            code = 0
        except BaseException as error:  # the parent must not go on twice, whatever it is
            print(f"as {user}: {type(error).__name__}: {error}", file=sys.stderr)
        finally:
            os._exit(code)

    def result(self):
        with os.fdopen(self.pipe, "rb") as stream:
            written = stream.read()
        _, status = os.waitpid(self.pid, 0)
        assert status == 0, f"a child ended with status {status}"
        return pickle.loads(written)


def take_ids(user):
    """Leaving uid 0 takes all capabilities away."""
    os.setgroups(user.groups)
    os.setresgid(user.groups[0], user.groups[0], user.groups[0])
    os.setresuid(user.uid, user.uid, user.uid)


def opens(path):
    """Whether the calling process may open a file or folder and read it."""
    try:
        os.close(os.open(path, os.O_RDONLY | os.O_NONBLOCK | os.O_NOFOLLOW | os.O_NOCTTY))
    except OSError:
        return False
    return True


def acl_bytes(owner, group, other, users=None, groups=None, mask=None):
    """An ACL as the kernel takes it; `users` and `groups` are permissions by number. With named ones there is a mask."""
    entries = [(OWNER, owner, NO_NUMBER)]
    entries += [(USER, allowed, number) for number, allowed in sorted((users or {}).items())]
    entries += [(GROUP, group, NO_NUMBER)]
    entries += [(NAMED_GROUP, allowed, number) for number, allowed in sorted((groups or {}).items())]
    entries += [] if mask is None else [(MASK, mask, NO_NUMBER)]
    entries += [(OTHER, other, NO_NUMBER)]
    return struct.pack("<I", 2) + b"".join(struct.pack("<HHI", *entry) for entry in entries)


def exchange(first, second):
    """Gives two files or folders each other's name, at once."""
    if LIBC.renameat2(AT_FDCWD, os.fsencode(first), AT_FDCWD, os.fsencode(second), RENAME_EXCHANGE) != 0:
        raise OSError(ctypes.get_errno(), "renameat2")
