"""What race_proof.py does to files while they are searched for, and when the asker could not read which of them."""

import collections
import os
import time

from asking import ACCESS, acl_bytes, exchange
from instance import write

NEVER_ENDS = float("inf")


class Ground:
    """A share's folder with `open`, which everybody may read, and `shut`, which the asker may not enter; the tokens in files
    there, and the times at which they were hidden from the asker."""

    def __init__(self, share, rng):
        self.share, self.random = share, rng
        self.open, self.shut = f"{share}/open", f"{share}/shut"
        self.hidden_times, self.files = collections.defaultdict(list), {}
        os.mkdir(self.open)
        os.mkdir(self.shut, 0o700)

    def tokens(self):
        return sorted(self.files)

    def paths(self):
        return sorted({path for _, paths in self.files.values() for path in paths})

    def new(self, kind, number, *paths):
        """A token, which is in the files that are at the paths at some time."""
        token = f"zk{number:07d}q"
        self.files[token] = (kind, paths)
        return token

    def hide(self, token, since):
        self.hidden_times[token].append((since, NEVER_ENDS))

    def hide_all(self, since, until):
        for token in self.files:
            self.hidden_times[token].append((since, until))

    def hidden(self, token, begin, ended):
        """Whether the asker could not read the token's file at any moment of a request."""
        return any(since <= begin and ended <= until for since, until in self.hidden_times[token])

    def story(self, token):
        kind, paths = self.files[token]
        return f"{token}, {kind}, {paths}, hidden {self.hidden_times[token]}"

    def pause(self):
        time.sleep(self.random.choice((0, 0, 0, 0.0005, 0.002, 0.01)))


class Round:
    """Made before the index is brought up to date, carried out behind that."""

    def __init__(self, ground, number):
        self.ground, self.number = ground, number
        self.folder = f"{ground.open}/d{number}"
        self.path = f"{self.folder}/f{number}.txt"
        self.shut_path = f"{ground.shut}/f{number}.txt"
        os.mkdir(self.folder)
        self.make()

    def token(self, *paths):
        return self.ground.new(type(self).__name__, self.number, *paths)

    def readable(self):
        """A file with a token that can be read by now."""
        token = self.token(self.path, self.shut_path)
        write(self.path, text(token))
        return token

    def make(self):
        self.secret = self.readable()

    def act(self):
        self.close()
        self.ground.hide(self.secret, time.monotonic())


class RevokeFile(Round):
    def close(self):
        how = self.ground.random.randrange(3)
        if how == 0:
            os.chmod(self.path, 0o600)
        elif how == 1:
            os.setxattr(self.path, ACCESS, acl_bytes(6, 4, 4, {50001: 0}, mask=4))
        else:
            os.setxattr(self.path, ACCESS, acl_bytes(6, 4, 4, {}, {60001: 0}, mask=7))


class RevokeFolder(Round):
    """The file's name is hidden by that as well."""

    def make(self):
        super().make()
        named = f"{self.folder}/{self.secret}"
        os.rename(self.path, named + ".txt")

    def close(self):
        os.chmod(self.folder, self.ground.random.choice((0o700, 0o750, 0o600)))


class Moved(Round):
    def close(self):
        if self.ground.random.random() < 0.5:
            os.rename(self.path, self.shut_path)
        else:
            os.rename(self.folder, f"{self.ground.shut}/d{self.number}")


class LinkRemoved(Round):
    """The other name of the file is in a folder that is shut."""

    def make(self):
        super().make()
        os.link(self.path, self.shut_path)

    def close(self):
        os.unlink(self.path)


class OtherFileOverIt(Round):
    """What can be read at the path is not what the index has of it, as large and as old as it may be."""

    def close(self):
        status = os.stat(self.path)
        os.chmod(self.path, 0o600)
        self.ground.hide(self.secret, time.monotonic())
        self.ground.pause()
        write(self.path + ".new", text("zzzzzzzzzz"))
        os.utime(self.path + ".new", ns=(status.st_atime_ns, status.st_mtime_ns))
        os.rename(self.path + ".new", self.path)


class SwappedFiles(Round):
    """A file that could never be read has a name in an open folder for moments, under which something else can be read."""

    def make(self):
        self.secret = self.token(self.path, self.shut_path)
        write(self.path, text("publicpage"))
        write(self.shut_path, text(self.secret))
        os.chmod(self.shut_path, 0o600)
        self.ground.hide(self.secret, 0)

    def act(self):
        for _ in range(self.ground.random.choice((2, 2, 4, 6))):
            exchange(self.path, self.shut_path)
            self.ground.pause()
            if self.ground.random.random() < 0.3:
                os.utime(self.path)


class SwappedFolders(Round):
    """The same of folders: one that is shut takes an open one's place."""

    def make(self):
        self.other = f"{self.ground.open}/s{self.number}"
        self.secret = self.token(self.path, f"{self.other}/f{self.number}.txt")
        os.mkdir(self.other, 0o700)
        write(self.path, text("publicpage"))
        write(f"{self.other}/f{self.number}.txt", text(self.secret))
        self.ground.hide(self.secret, 0)

    def act(self):
        for _ in range(self.ground.random.choice((2, 2, 3, 6))):
            exchange(self.folder, self.other)
            self.ground.pause()
            if self.ground.random.random() < 0.3:
                write(f"{self.other}/new.txt", text("publicpage"))


class WrittenShutThenOpened(Round):
    """One file, in the same tick of the clock of its times: what it held while it was shut is gone when it can be read, and
    has the same size."""

    def make(self):
        self.secret = self.token(self.path)
        self.ground.hide(self.secret, 0)

    def act(self):
        with open(self.path, "wb", buffering=0, opener=lambda path, flags: os.open(path, flags, 0o600)) as file:
            for _ in range(self.ground.random.choice((1, 1, 3))):
                os.fchmod(file.fileno(), 0o600)
                os.pwrite(file.fileno(), text(self.secret).encode(), 0)
                self.ground.pause()
                os.pwrite(file.fileno(), text("publicpage").encode(), 0)
                os.fchmod(file.fileno(), 0o644)
                self.ground.pause()


class ShareShut(Round):
    """Everything is hidden for a moment."""

    def close(self):
        os.chmod(self.path, 0o600)
        folder = self.ground.random.choice((self.ground.share, self.ground.open))
        os.chmod(folder, 0o700)
        since = time.monotonic()
        time.sleep(self.ground.random.choice((0.005, 0.02)))
        self.ground.hide_all(since, time.monotonic())
        os.chmod(folder, 0o755)


def text(token):
    """As long for each token."""
    return f"a passage with {token} in it, and some more\n"


ROUNDS = (RevokeFile, RevokeFile, RevokeFolder, Moved, LinkRemoved, OtherFileOverIt, OtherFileOverIt, SwappedFiles, SwappedFiles,
          SwappedFolders, SwappedFolders, WrittenShutThenOpened, WrittenShutThenOpened, ShareShut)
