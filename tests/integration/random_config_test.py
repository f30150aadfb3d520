"""Random changes of what is indexed, of shares, volumes and users, and of files, while the daemons work and are killed now
and then. At each checkpoint the documents must be those of a fresh instance that indexes the same files with the same
folders from nothing."""

import json
import os
import random
import shutil
import subprocess
import sys
import tempfile
import time
import unittest

from instance import CREATE, DELETE, MODIFY, RENAME, Instance, differences, event, wait_for, write

CHECKPOINTS = 3
CHANGES = 14
SEEDS = [int(seed) for seed in os.environ.get("FERROX_SEEDS", "1 2 3").split()]
NAMES = ["letter.txt", "song.mp3", "film.mkv", "view.jpg", "data.xyz", "README"]
KINDS = ["document", "audio", "video", "photo"]
FIELDS = ["KOVAMDPath", "KOVAMDParent", "KOVAMDFSName", "KOVAMDSearchFileName", "KOVAMDDisplayName", "KOVAMDKind",
          "KOVAMDExtension", "KOVAMDIsDir", "KOVAMDFSSize", "KOVAMDContentType", "KOVAMDTextContent", "_KOVAStamp",
          "_KOVANeedMeta", "_KOVAExtractError", "_KOVATextEncoding"]


class World:
    """Shares on two volumes, and an instance that indexes them; each change is told as a host tells it."""

    def __init__(self, test, seed):
        self.random, self.number, self.log = random.Random(seed), 0, []
        self.instance = Instance()
        other_device = "/dev/shm" if os.access("/dev/shm", os.W_OK) else None
        self.volumes = [os.path.realpath(tempfile.mkdtemp(prefix="fi-vol")),
                        os.path.realpath(tempfile.mkdtemp(prefix="fi-vol", dir=other_device))]
        self.shares = {name: f"{self.volumes[0]}/{name}" for name in ("docs", "media", "homes")}
        self.instance.ctl("up")
        for volume in self.volumes:
            self.instance.make_volume(test, volume)
        for name, path in self.shares.items():
            for place in ("", "anna", "anna/notes", "anna/notes/old", "bert", "bert/#recycle", "carl/work"):
                self.fill(f"{path}/{place}".rstrip("/"))
            self.ctl("share", "add", path, *self.random.choice([(), ("--no-index",)]))
        self.ctl("folder", "add", "/homes/anna")

    def stop(self):
        self.instance.stop()
        for volume in self.volumes:
            subprocess.run(["umount", "-l", volume], check=False)
            shutil.rmtree(volume, ignore_errors=True)

    def ctl(self, *words):
        self.log.append(" ".join(words))
        self.instance.ctl(*words)

    def fill(self, folder):
        for name in NAMES:
            write(f"{folder}/{name}", f"text {self.next()}")

    def next(self):
        self.number += 1
        return self.number

    def tell(self, share, *events):
        self.log += [json.dumps(e) for e in events]
        self.instance.queue(self.shares[share], *events)

    # What there is to choose from.

    def some_share(self):
        return self.random.choice(sorted(self.shares))

    def indexed_shares(self):
        return sorted({folder["path"].split("/")[1] for folder in self.instance.folders()})

    def some_folder(self, share):
        root = self.shares[share]
        folders = sorted(os.path.join(parent, name) for parent, names, _ in os.walk(root) for name in names
                         if "#recycle" not in os.path.join(parent, name))
        return self.random.choice(folders or [root])

    def kinds(self):
        return ",".join(kind for kind in KINDS if self.random.random() < 0.5) or "none"

    # Changes.

    def change(self):
        configuration = [self.folder_set, self.folder_set, self.folder_delete, self.folder_reindex]
        files = [self.modify_file, self.move_folder, self.move_file, self.remove, self.make_folder]
        events = [self.rename_share, self.migrate, self.pause, self.resume, self.forget, self.rename_user, self.homes,
                  self.recycle, self.kill, self.wait]
        kind = self.random.choice([configuration, files, events])
        for _ in range(self.random.randrange(1, 20) if kind is files else 1):
            self.random.choice(kind)()

    def folder_set(self):
        share = self.some_share()
        folder = self.random.choice([self.some_folder(share), self.shares[share]])
        path = "/" + share + folder[len(self.shares[share]):]
        known = any(configured["path"] == path for configured in self.instance.folders())
        self.ctl("folder", "set" if known else "add", path, "--kinds", self.kinds())

    def folder_delete(self):
        folders = self.instance.folders()
        if len(folders) > 1:
            self.ctl("folder", "delete", self.random.choice(folders)["path"])

    def folder_reindex(self):
        self.ctl("folder", "reindex", self.random.choice(self.instance.folders())["path"])

    def modify_file(self):
        share = self.some_share()
        path = f"{self.some_folder(share)}/{self.random.choice(NAMES)}"
        write(path, f"changed {self.next()}")
        self.tell(share, event(MODIFY, path), event(CREATE, path))

    def make_folder(self):
        share = self.some_share()
        path = f"{self.some_folder(share)}/new{self.next()}"
        self.fill(path)
        self.tell(share, event(CREATE, path, "", True))

    def move_folder(self):
        share = self.some_share()
        old, target = self.some_folder(share), self.some_folder(share)
        new = f"{target}/" + self.random.choice([f"moved{self.next()}", "anna", "bert"])
        if old != self.shares[share] and not (target + "/").startswith(old + "/") and not os.path.exists(new):
            self.move(share, new, old, self.fill)

    def move_file(self):
        share = self.some_share()
        old, new = (f"{self.some_folder(share)}/{self.random.choice(NAMES)}" for _ in range(2))
        if os.path.exists(old) and old != new:
            self.move(share, new, old, lambda path: write(path, f"back {self.next()}"))

    def move(self, share, new, old, make_again):
        is_folder = os.path.isdir(old)
        os.rename(old, new)
        events = [event(RENAME, new, old, is_folder)]
        if self.random.random() < 0.3:  # the old name is used again
            make_again(old)
            events.append(event(CREATE, old, "", is_folder))
        self.tell(share, *events)

    def remove(self):
        share = self.some_share()
        folder = self.some_folder(share)
        path = f"{folder}/{self.random.choice(NAMES)}"
        if os.path.exists(path):
            os.remove(path)
            self.tell(share, event(DELETE, path))
        elif folder != self.shares[share] and self.random.random() < 0.3:
            shutil.rmtree(folder)
            self.tell(share, event(DELETE, folder, "", True))

    def rename_share(self):
        old = self.random.choice([name for name in sorted(self.shares) if name != "homes"])
        new = f"share{self.next()}"
        self.ctl("share", "rename", old, new)
        self.shares[new] = f"{os.path.dirname(self.shares.pop(old))}/{new}"

    def migrate(self):
        share = self.some_share()
        old = self.shares[share]
        new = f"{self.random.choice(self.volumes)}/{self.next()}/{share}"
        os.makedirs(os.path.dirname(new))
        shutil.move(old, new)
        self.ctl("share", "migrate", share, new)
        self.shares[share] = new

    def pause(self):
        shares = self.indexed_shares()
        words = [("share", "pause", self.random.choice(shares)), ("volume", "pause", self.random.choice(self.volumes)),
                 ("pause", "1")]
        self.ctl(*self.random.choice(words))

    def resume(self):
        paused = [folder["path"].split("/")[1] for folder in self.instance.folders() if folder["paused"]]
        words = [("share", "resume", share) for share in paused[:1]]
        words += [("volume", "resume", volume) for volume in self.volumes] + [("resume",)]
        self.ctl(*self.random.choice(words))

    def forget(self):
        what, name = self.random.choice([("share", self.random.choice(self.indexed_shares())),
                                         ("volume", self.random.choice(self.volumes))])
        self.ctl(what, "pause", name)
        if what == "volume" and not any(folder["paused"] and folder["volume_to_be_clean"] == name
                                           for folder in self.instance.folders()):
            return
        self.ctl(what, "forget", name)
        if not self.instance.folders():
            self.ctl("folder", "add", "/" + self.some_share())
            self.ctl("up")

    def rename_user(self):
        homes = self.shares["homes"]
        old = self.random.choice([name for name in sorted(os.listdir(homes)) if os.path.isdir(f"{homes}/{name}")] or [""])
        new = f"user{self.next()}"
        if not old or old.startswith("#") or "homes" not in self.indexed_shares():
            return
        os.rename(f"{homes}/{old}", f"{homes}/{new}")
        if self.random.random() < 0.5:
            self.tell("homes", event(RENAME, f"{homes}/{new}", f"{homes}/{old}", True))
        self.ctl("user", "rename", old, new)

    def homes(self):
        bin_path = f"{self.some_folder('homes')}/#recycle"
        self.fill(bin_path)
        self.tell("homes", event(CREATE, bin_path, "", True))
        self.ctl("home", self.random.choice(["enable", "disable"]))

    def recycle(self):
        share = self.random.choice([name for name in sorted(self.shares) if name != "homes"])
        path = f"{self.instance.root}/etc/kova/shares.json"
        with open(path, encoding="utf-8") as file:
            table = json.load(file)
        entry = next(entry for entry in table if entry["name"] == share)
        if not entry.pop("recycle", ""):
            entry["recycle"] = "#recycle"
        self.log.append(f"recycle {entry}")
        bin_path = f"{self.shares[share]}/#recycle"
        self.fill(bin_path)
        with open(path + ".test", "w", encoding="utf-8") as file:
            json.dump(table, file)
        os.rename(path + ".test", path)
        if share in self.indexed_shares():
            self.ctl("share", "check-recycle", share)

    def kill(self):
        program = self.random.choice(["fileindexd", "fileindexd", "kovaelasticd"])
        self.log.append(f"kill {program}")
        self.instance.kill(program)
        self.ctl("up")

    def wait(self):
        time.sleep(self.random.random() * 0.5)

    # Checkpoints.

    def settle(self):
        self.ctl("up")
        self.ctl("resume")
        for share in self.indexed_shares():
            if any(f["paused"] for f in self.instance.folders() if f["path"].split("/")[1] == share):
                self.ctl("share", "resume", share)
        for share in self.indexed_shares():
            wait_for(lambda name=share: name in self.workers(), f"a worker for {share}")
            self.instance.wait_idle(share, self.shares[share])

    def workers(self):
        return [share["share"] for share in self.instance.status()["index_daemon"]["shares"]]

    def fresh_documents(self):
        fresh = Instance()
        try:
            fresh.ctl("up")
            os.makedirs(f"{fresh.root}/etc/kova", exist_ok=True)
            shutil.copy(f"{self.instance.root}/etc/kova/shares.json", f"{fresh.root}/etc/kova/shares.json")
            for folder in self.instance.folders():
                kinds = ",".join(kind for kind in KINDS if folder[kind]) or "none"
                share = folder["path"].split("/")[1]
                if os.path.isdir(self.shares[share] + folder["path"][1 + len(share):]):
                    fresh.ctl("folder", "add", folder["path"], "--kinds", kinds)
            shares = sorted({folder["path"].split("/")[1] for folder in fresh.folders()})
            for share in shares:
                fresh.wait_idle(share, self.shares[share])
            return {share: documents(fresh, share) for share in shares}
        finally:
            fresh.stop()


def documents(instance, share):
    """All documents of the share's index, by path."""
    entries = {entry["KOVAMDPath"]: entry for entry in instance.entries(share, "", *FIELDS)}
    for entry in entries.values():
        if entry["KOVAMDIsDir"]:  # what changes in a folder is told, not that the folder's own size and times change
            entry.update(KOVAMDFSSize=0, _KOVAStamp="")
    return entries


class RandomConfigTest(unittest.TestCase):
    maxDiff = 4000

    def test_index_ends_as_a_fresh_one(self):
        for seed in SEEDS:
            with self.subTest(seed=seed):
                print("seed", seed, file=sys.stderr)
                world = World(self, seed)
                try:
                    self.check(world)
                except Exception:
                    print("\n".join(world.log), file=sys.stderr)
                    raise
                finally:
                    world.stop()

    def check(self, world):
        for _ in range(CHECKPOINTS):
            for _ in range(CHANGES):
                world.change()
            world.settle()
            world.log.append("checkpoint")
            expected = world.fresh_documents()
            ids = world.instance.ask("kovaelasticd", {"command": "index_list", "data": {}})["data"]
            self.assertLessEqual({f"fileindex_{share}" for share in world.indexed_shares()},
                                 {index["id"] for index in ids})
            for share in world.indexed_shares():
                self.assertEqual({}, differences(expected.get(share, {}), documents(world.instance, share)), share)


if __name__ == "__main__":
    unittest.main()
