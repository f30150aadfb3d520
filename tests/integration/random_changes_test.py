"""Random changes of a folder, with the events that they cause, while the daemons work and are killed now and then. In the
end the index must be what is on the disk: every path, and of every file the present text."""

import os
import random
import sys
import time
import unittest

from instance import CREATE, DELETE, MODIFY, RENAME, Instance, event, on_disk, wait_for

ROUNDS = 15
SEEDS = [int(seed) for seed in os.environ.get("FERROX_SEEDS", "1 2").split()]


def write(path, text):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "w", encoding="ascii") as file:
        file.write(text)


class Folder:
    """A folder that changes at random; each change tells its event."""

    def __init__(self, path, seed):
        self.path, self.random, self.number = path, random.Random(seed), 0
        self.folders = [f"d{i}" for i in range(20)]
        for i in range(600):
            write(f"{path}/d{i % 20}/file{i}.txt", f"first {i}")

    def some_file(self):
        folder = f"{self.path}/{self.random.choice(self.folders)}"
        return f"{folder}/{self.random.choice(os.listdir(folder) or ['new.txt'])}"

    def change(self):
        self.number += 1
        kind = self.random.choice([self.rename_folder, self.modify, self.rename_file, self.delete, self.create])
        return kind()

    def rename_folder(self):
        old, new = self.random.choice(self.folders), f"n{self.number}"
        os.rename(f"{self.path}/{old}", f"{self.path}/{new}")
        self.folders[self.folders.index(old)] = new
        events = [event(RENAME, f"{self.path}/{new}", f"{self.path}/{old}", True)]
        if self.random.random() < 0.5:  # the old name is used again
            write(f"{self.path}/{old}/again.txt", f"again {self.number}")
            self.folders.append(old)
            events.append(event(CREATE, f"{self.path}/{old}", "", True))
        return events

    def modify(self):
        path = self.some_file()
        write(path, f"changed {self.number}")
        return [event(MODIFY, path)]

    def create(self):
        path = f"{self.path}/{self.random.choice(self.folders)}/new{self.number}.txt"
        write(path, f"new {self.number}")
        return [event(CREATE, path)]

    def rename_file(self):
        old = self.some_file()
        if not os.path.exists(old):
            return self.modify()
        new = f"{old[:-4]}.{self.number}.txt"
        os.rename(old, new)
        events = [event(RENAME, new, old)]
        if self.random.random() < 0.3:
            write(old, f"back {self.number}")
            events.append(event(CREATE, old))
        return events

    def delete(self):
        path = self.some_file()
        if not os.path.exists(path):
            return self.modify()
        os.remove(path)
        return [event(DELETE, path)]


class RandomChangesTest(unittest.TestCase):
    def test_index_ends_as_the_disk(self):
        for seed in SEEDS:
            with self.subTest(seed=seed):
                print("seed", seed, file=sys.stderr)
                self.check(seed)

    def check(self, seed):
        instance = Instance()
        try:
            instance.ctl("up")
            path = instance.add_share("docs")
            folder = Folder(path, seed)
            instance.ctl("index", "docs")
            for round_number in range(ROUNDS):
                events = [e for _ in range(folder.random.randrange(1, 50)) for e in folder.change()]
                instance.queue(path, *events)
                time.sleep(folder.random.random() * 0.4)
                if round_number % 2:
                    instance.kill(folder.random.choice(["fileindexd", "kovaelasticd"]))
                    instance.ctl("up")
            wait_for(lambda: instance.share_status("docs")["state"] != "starting", "the daemon to work")
            instance.wait_idle("docs", path)
            self.assertEqual(on_disk(path), instance.documents("docs", path))
            self.assertEqual({}, self.stale(instance, path))
        finally:
            instance.stop()

    @staticmethod
    def stale(instance, folder):
        """The files whose indexed text is not theirs."""
        query = {"qsl": {"prefix": {"KOVAMDPath": folder + "/"}}, "load_field": ["KOVAMDPath", "KOVAMDTextContent"]}
        reply = instance.ask("kovaelasticd", {"command": "document_get_by_query",
                                              "data": {"id": "fileindex_docs", "query": query}})
        wrong = {}
        for entry in reply["data"]:
            path = entry["KOVAMDPath"]
            if os.path.isfile(path):
                with open(path, encoding="ascii") as file:
                    text = file.read()
                if text != entry.get("KOVAMDTextContent", "").strip():
                    wrong[path] = (text, entry.get("KOVAMDTextContent"))
        return wrong


if __name__ == "__main__":
    unittest.main()
