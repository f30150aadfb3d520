"""A random tree of files and folders with random rights, and random changes of it, for kernel_proof.py."""

import collections
import errno
import os
import random
import shutil
import stat

from asking import ACCESS, DEFAULT, User, acl_bytes, exchange

UIDS = [0, *range(50001, 50007)]
GIDS = [0, *range(60001, 60007)]
USERS = [User(50001, [60001]), User(50002, [60002, 60001]), User(50003, [60003, 60004, 60005]), User(50004, [60001, 60006]),
         User(50005, [60005, 60002, 60003, 60004]), User(50006, [60006]), User(50010, [60010]),
         User(50011, [60011, *range(60002, 60060)])]
FOLDER_MODES = (*[0o755] * 6, 0o711, 0o711, 0o750, 0o2775, 0o1777, 0o700, 0o705, 0o051, 0o311, 0o744, 0o2070)
FILE_MODES = (0o644, 0o644, 0o640, 0o604, 0o600, 0o460, 0o044, 0o004, 0o000, 0o4755, 0o2640, 0o222)
ROOT_MODES = (0o755, 0o755, 0o755, 0o755, 0o711, 0o750, 0o700)
DEPTH_MAX = 12


class World:
    """`share` and `outside` are folders, as bytes, on one file system; they are there, and empty."""

    def __init__(self, seed, share, outside):
        self.random, self.share, self.outside, self.number = random.Random(seed), share, outside, 0
        self.log = collections.deque(["made"], maxlen=200)

    def make(self):
        self.set_rights(self.share, ROOT_MODES)
        last = self.share
        for _ in range(22):
            deeper = self.random.random() < 0.6 and self.depth(last) < DEPTH_MAX
            last = self.new_folder(last if deeper else None)
        for _ in range(35):
            self.new_file()
        for _ in range(6):
            self.link()
        for path in list(self.entries()):
            if self.random.random() < 0.15:
                self.set_acl(path)

    def clear(self):
        for folder in (self.share, self.outside):
            for entry in os.scandir(folder):
                shutil.rmtree(entry.path) if entry.is_dir(follow_symlinks=False) else os.remove(entry.path)
            for name in os.listxattr(folder):
                os.removexattr(folder, name)
        os.chown(self.share, 0, 0)
        os.chmod(self.share, 0o755)

    # What is there.

    def entries(self, folder=None):
        """Of everything below the share's folder, by path, its status; symbolic links are left out."""
        found = {}
        for parent, folders, files in os.walk(folder or self.share):
            for name in sorted(folders) + sorted(files):
                status = os.lstat(os.path.join(parent, name))
                if not stat.S_ISLNK(status.st_mode):
                    found[os.path.join(parent, name)] = status
        return found

    def folders(self):
        below = [path for path, status in self.entries().items() if stat.S_ISDIR(status.st_mode)]
        return [self.share, *sorted(below)]

    def files(self, folder=None):
        return sorted(path for path, status in self.entries(folder).items() if stat.S_ISREG(status.st_mode))

    def any_file(self):
        """One in eight by a name outside of the share."""
        files = self.files(self.outside) if self.random.random() < 0.125 else []
        return self.pick(files or self.files())

    def any_folder(self):
        return self.pick(self.folders()[1:])

    def any_entry(self):
        return self.random.choice([self.any_file, self.any_folder])()

    def pick(self, paths):
        if not paths:
            raise FileNotFoundError(errno.ENOENT, "nothing is there")
        return self.random.choice(paths)

    def depth(self, path):
        return path.count(b"/") - self.share.count(b"/")

    def new_path(self, parent=None):
        self.number += 1
        parent = parent or self.pick([folder for folder in self.folders() if self.depth(folder) < DEPTH_MAX])
        name = self.random.choice((b"n%d.txt", b"n%d.txt", b"n %d\xff.txt", b"n%d\n.txt", "ü%d.txt".encode())) % self.number
        return parent + b"/" + name

    # Changes. One that makes no sense where it hits (a folder into itself) fails as it would for anybody.

    def change(self):
        """Makes one that succeeds."""
        while True:
            kind, = self.random.choices(list(self.WEIGHTS), self.WEIGHTS.values())
            try:
                kind(self)
                return
            except OSError:
                pass

    def set_rights(self, path, modes):
        os.chown(path, self.random.choice(UIDS), self.random.choice(GIDS), follow_symlinks=False)
        os.chmod(path, self.random.choice(modes))

    def chmod(self):
        path = self.any_entry()
        if self.random.random() < 0.3:
            mode = self.random.randrange(0o10000)
        else:
            mode = self.random.choice(FOLDER_MODES if os.path.isdir(path) else FILE_MODES)
        os.chmod(path, mode)
        self.note("chmod", oct(mode), path)

    def chmod_share(self):
        self.set_rights(self.share, ROOT_MODES)
        self.note("rights of the share's folder")

    def chown(self):
        path = self.any_entry()
        os.chown(path, self.random.choice([-1, *UIDS]), self.random.choice([-1, *GIDS]), follow_symlinks=False)
        self.note("chown", path)

    def set_acl(self, path=None):
        path = path or self.any_entry()
        os.setxattr(path, ACCESS, self.random_acl())
        self.note("setfacl", path)

    def random_acl(self):
        def allowed():
            return self.random.choice((0, 0, 1, 4, 4, 5, 5, 7))
        users = {self.random.choice(UIDS): allowed() for _ in range(self.random.randrange(3))}
        groups = {self.random.choice(GIDS): allowed() for _ in range(self.random.randrange(4))}
        mask = self.random.choice((0, 1, 4, 5, 7, 7))
        mask = mask if users or groups or self.random.random() < 0.3 else None
        return acl_bytes(allowed(), allowed(), allowed(), users, groups, mask)

    def remove_acl(self):
        having = [path for path in self.entries() if ACCESS in os.listxattr(path)]
        path = self.pick(having)
        os.removexattr(path, ACCESS)
        self.note("setfacl -b", path)

    def set_default_acl(self):
        """What is made in the folder from now on has it."""
        path = self.any_folder()
        os.setxattr(path, DEFAULT, self.random_acl())
        self.note("setfacl -d", path)
        self.new_file(path)
        self.new_folder(path)

    def new_file(self, parent=None):
        path = self.new_path(parent)
        with open(path, "wb") as file:
            file.write(b"everyone %d\n" % self.number)
        if parent is None or self.random.random() < 0.5:
            self.set_rights(path, FILE_MODES)
        self.note("new file", path)

    def new_folder(self, parent=None):
        path = self.new_path(parent)
        os.mkdir(path)
        if self.random.random() < 0.7:
            self.set_rights(path, FOLDER_MODES)
        self.note("new folder", path)
        return path

    def write(self):
        path = self.any_file()
        with open(path, "ab") as file:
            file.write(b"more\n")
        self.note("write", path)

    def save_anew(self):
        """As editors do: a new file over the old one, with rights of its own."""
        path = self.any_file()
        saved = os.path.dirname(path) + b"/.saved"
        with open(saved, "wb") as file:
            file.write(b"everyone anew\n")
        self.set_rights(saved, FILE_MODES)
        os.rename(saved, path)
        self.note("saved anew", path)

    def rename(self):
        old, new = self.any_entry(), self.new_path()
        os.rename(old, new)
        self.note("rename", old, new)

    def rename_over(self):
        old, new = self.any_file(), self.any_file()
        os.rename(old, new)
        self.note("rename over", old, new)

    def swap(self):
        first, second = self.any_entry(), self.any_entry()
        exchange(first, second)
        self.note("swap", first, second)

    def move_out_and_in(self):
        """The folder comes back where something else may be by then."""
        away = self.outside + b"/away"
        if os.path.lexists(away):
            new = self.new_path()
            os.rename(away, new)
            self.note("moved in", new)
        else:
            old = self.any_folder()
            os.rename(old, away)
            self.note("moved out", old)

    def link(self):
        old = self.any_file()
        self.number += 1
        new = self.outside + b"/l%d" % self.number if self.random.random() < 0.4 else self.new_path()
        os.link(old, new)
        self.note("link", old, new)

    def symlink(self):
        path = self.new_path()
        os.symlink(self.any_file(), path)
        self.note("symlink", path)

    def fifo(self):
        path = self.new_path()
        os.mkfifo(path, 0o644)
        self.note("fifo", path)

    def delete(self):
        path = self.any_file()
        os.remove(path)
        self.note("delete", path)

    def remove_folder(self):
        path = self.any_folder()
        if len(self.entries(path)) > 20:
            raise OSError(errno.EBUSY, "too much below it")
        shutil.rmtree(path)
        self.note("rmtree", path)

    def note(self, *words):
        self.log.append(words)

    WEIGHTS = {chmod: 24, chmod_share: 2, chown: 12, set_acl: 16, remove_acl: 3, set_default_acl: 3, new_file: 8,
               new_folder: 5, write: 3, save_anew: 3, rename: 12, rename_over: 2, swap: 4, move_out_and_in: 3, link: 7,
               symlink: 1, fifo: 1, delete: 5, remove_folder: 1}
