"""Everything that is managed, on live daemons, with the documents of the index checked after each step; and what must not
be done."""

import json
import os
import signal
import subprocess
import time
import unittest

from instance import BIN, CREATE, InstanceTestCase, event, on_disk, wait_for, write


class ManagementWalkTest(InstanceTestCase):
    def setUp(self):
        super().setUp()
        self.vol = f"{os.path.realpath(self.instance.root)}/vol"

    def share_without_folders(self, name):
        return self.instance.add_share(name, "--no-index")

    def expect_documents(self, share, folder, *indexed):
        """The index holds the indexed folders of the share at `folder`, all below them, and nothing else."""
        self.instance.wait_idle(share, folder)
        expected = [os.fsencode(path) for path in indexed if path != folder]
        expected += [path for parent in indexed for path in on_disk(parent)]
        self.assertEqual(set(expected), set(self.instance.documents(share, "")) - {os.fsencode(folder)})

    def expect_found(self, word, *paths, left_out=()):
        self.assertEqual({os.fsencode(path) for path in paths}, set(self.instance.search(word, left_out=left_out)), word)

    def indices(self):
        reply = self.instance.ask("kovaelasticd", {"command": "index_list", "data": {}})
        return {index["id"]: index["paused"] for index in reply["data"]}

    def files_below(self, folder):
        return [os.path.join(parent, name) for parent, _, names in os.walk(f"{self.instance.root}/{folder}")
                for name in names if not name.endswith(".lock")]

    def test_walk(self):
        self.ctl("up")
        docs, media = self.share_without_folders("docs"), self.share_without_folders("media")
        write(f"{docs}/letters/anna.txt", "zeppelin for anna")
        write(f"{docs}/letters/berta.txt", "zeppelin for berta")
        write(f"{docs}/letters/view.jpg", "no real picture")
        write(f"{docs}/plans/roof.txt", "zeppelin over the roof")
        write(f"{docs}/private/secret.txt", "zeppelin, secret")
        write(f"{media}/films/list.txt", "all films with a zeppelin")
        anna, berta, roof = f"{docs}/letters/anna.txt", f"{docs}/letters/berta.txt", f"{docs}/plans/roof.txt"
        films = f"{media}/films/list.txt"

        self.ctl("folder", "add", "/docs/letters", f"{docs}/plans/")
        self.ctl("folder", "add", "/media/films")
        self.expect_documents("docs", docs, f"{docs}/letters", f"{docs}/plans")
        self.expect_documents("media", media, f"{media}/films")
        self.expect_found("zeppelin", anna, berta, roof, films)
        self.expect_found("secret")

        self.switch_a_kind(docs, roof, films, anna, berta)
        papers = self.rename_and_move(docs)
        self.instance.make_volume(self, f"{self.vol}2")
        self.pause_and_resume(papers, films)
        self.forget_a_volume(papers)
        self.homes_and_bins()
        self.delete_all(papers)

    def switch_a_kind(self, docs, roof, films, anna, berta):
        def written():
            return self.instance.share_status("docs")["written"]
        before = written()
        self.ctl("folder", "set", "/docs/letters", "--kinds", "audio,video,photo", "--name", "Post")
        self.expect_documents("docs", docs, f"{docs}/letters", f"{docs}/plans")
        self.expect_found("zeppelin", roof, films)
        self.expect_found("name:berta.txt", berta)
        self.assertEqual(2, written() - before, "the two documents were done again, nothing else")
        self.ctl("folder", "set", "/docs/letters", "--kinds", "document,audio,video")
        self.instance.wait_idle("docs", docs)
        self.expect_found("zeppelin", anna, berta, roof, films)
        self.assertEqual(5, written() - before, "two documents and a picture")
        self.ctl("folder", "set", "/docs/letters", "--kinds", "all")
        self.instance.wait_idle("docs", docs)
        self.assertEqual(6, written() - before, "the picture")
        self.ctl("folder", "set", "/docs/letters", "--kinds", "all")
        self.instance.wait_idle("docs", docs)
        self.assertEqual(6, written() - before, "no kind was changed")

    def rename_and_move(self, docs):
        """What is read and found meanwhile, test_what_moves_is_not_read_again looks at."""
        queues = [self.instance.queue_path(docs), self.instance.queue_path(f"{self.vol}/papers")]
        self.ctl("share", "rename", "docs", "papers")
        papers = f"{self.vol}/papers"
        self.expect_documents("papers", papers, f"{papers}/letters", f"{papers}/plans")
        moved = f"{self.vol}2/papers"
        os.makedirs(f"{self.vol}2")
        os.rename(papers, moved)
        self.ctl("share", "migrate", "papers", moved)
        self.expect_documents("papers", moved, f"{moved}/letters", f"{moved}/plans")
        self.assertEqual([], [path for path in [docs, *queues] if os.path.exists(path)])
        return moved

    def pause_and_resume(self, papers, films):
        for stop, go, word in ((("share", "pause", "papers"), ("share", "resume", "papers"), "otter"),
                               (("volume", "pause", f"{self.vol}2"), ("volume", "resume", f"{self.vol}2/"), "badger")):
            self.ctl(*stop)
            self.assertEqual({"fileindex_papers": True, "fileindex_media": False}, self.indices())
            self.assertEqual({"/papers/letters": True, "/papers/plans": True, "/media/films": False},
                             {folder["path"]: folder["paused"] for folder in self.instance.folders()})
            self.assertEqual([{"folders": 2, "paused": True, "share": "papers"}], self.instance.status()["resting_shares"])
            new = f"{papers}/letters/{word}.txt"
            write(new, word)
            self.instance.queue(papers, event(CREATE, new))
            write(f"{self.vol}/media/films/{word}.txt", word)
            self.instance.queue(f"{self.vol}/media", event(CREATE, f"{self.vol}/media/films/{word}.txt"))
            self.instance.wait_idle("media", f"{self.vol}/media")
            self.expect_found(word, f"{self.vol}/media/films/{word}.txt", left_out=["papers"])
            self.expect_found("roof", left_out=["papers"])
            self.expect_refused(None, "index", "papers", "--wait", text="share resume")
            before = self.instance.folders()
            self.ctl("folder", "set", "/papers/letters", "--kinds", "all")  # stays paused, and called as before
            self.assertEqual(sorted(map(str, before)), sorted(map(str, self.instance.folders())))
            self.ctl(*go)
            self.expect_documents("papers", papers, f"{papers}/letters", f"{papers}/plans")
            self.expect_found(word, new, f"{self.vol}/media/films/{word}.txt")
            self.expect_found("list", films)
        names = {folder["path"]: folder["name"] for folder in self.instance.folders()}
        self.assertEqual({"/papers/letters": "Post", "/papers/plans": "plans", "/media/films": "films"}, names)

    def forget_a_volume(self, papers):
        self.ctl("volume", "pause", f"{self.vol}2")
        self.ctl("volume", "forget", f"{self.vol}2")
        self.assertEqual({"fileindex_media": False}, self.indices())
        self.assertEqual(["/media/films"], [folder["path"] for folder in self.instance.folders()])
        self.assertEqual([], [path for path in self.files_below("var/lib/kova/fileindex") if "papers" in path])
        self.ctl("folder", "add", "/papers/letters", "/papers/plans")
        self.expect_documents("papers", papers, f"{papers}/letters", f"{papers}/plans")

    def homes_and_bins(self):
        homes = self.share_without_folders("homes")
        for user in ("carla", "annabel"):
            write(f"{homes}/{user}/notes/diary.txt", f"capybara of {user}")
        self.ctl("folder", "add", "/homes/carla", "/homes/annabel/notes")
        self.expect_documents("homes", homes, f"{homes}/carla", f"{homes}/annabel/notes")
        write(f"{homes}/carla/#recycle/old.txt", "capybara in the bin")
        self.instance.queue(homes, event(CREATE, f"{homes}/carla/#recycle/old.txt"))
        for old, new, text in (("nope", "x", "neither"), ("carla", "anna", "still there")):
            self.expect_refused(None, "user", "rename", old, new, text=text)
        for words in (["home", "enable"], ["home", "disable", "--accounts", "ldap"], ["share", "check-recycle", "homes"],
                      ["folder", "reindex", "/homes/carla"], ["prepare"]):
            self.ctl(*words)
        self.instance.wait_idle("homes", homes)
        self.expect_found("capybara", f"{homes}/carla/notes/diary.txt", f"{homes}/annabel/notes/diary.txt")
        self.ctl("suggest-refresh", "homes")
        self.assertIn(b'for "capybara"', self.instance.run("search", "--share", "homes", "capybaar").stdout)

    def delete_all(self, papers):
        self.ctl("folder", "delete", "/papers/letters")
        self.expect_documents("papers", papers, f"{papers}/plans")
        pid = self.instance.pid("fileindexd")
        self.ctl("folder", "delete", *(folder["path"] for folder in self.instance.folders()))
        self.assertEqual([], self.instance.folders())
        wait_for(lambda: not os.path.exists(f"/proc/{pid}/exe"), "the index daemon to stop")
        self.assertIsNone(self.instance.status()["index_daemon"])
        self.assertEqual({}, self.indices())
        self.assertEqual([], self.files_below("var/lib/kova/fileindex"))
        self.assertEqual([], self.files_below("var/lib/kova/notifyd/queues"))
        with open(f"{self.instance.root}/var/packages/Ferrox/etc/fileindex.status", encoding="utf-8") as file:
            self.assertFalse(json.load(file).get("share"))
        self.assertEqual([], self.instance.search("zeppelin"))
        self.ctl("folder", "add", "/papers/plans")
        self.expect_documents("papers", papers, f"{papers}/plans")

    # What must not be done, and what goes wrong.

    def expect_refused(self, code, *words, text=""):
        before = self.instance.folders()
        done = self.instance.run(*words)
        self.assertEqual(3, done.returncode, done.stderr)
        self.assertIn(f"(error {code})" if code else text, done.stderr.decode())
        self.assertIn(text, done.stderr.decode())
        self.assertEqual(before, self.instance.folders())

    def test_bad_input_changes_nothing(self):
        self.ctl("up")
        photo = self.share_without_folders("photo")
        photos = self.share_without_folders("photos")
        gone = self.share_without_folders("gone")
        for folder in (f"{photo}/trip", f"{photo}/other", f"{photos}/trip"):
            os.makedirs(folder)
        os.symlink("trip", f"{photo}/link")
        write(f"{photo}/file.txt", "")
        os.rmdir(gone)
        os.mkdir(f"{self.vol}/taken")
        self.ctl("folder", "add", "/photo/trip")
        rows = [
            (901, "folder set", ["folder", "add", "/photo/trip/"]),
            (903, "", ["folder", "add", "/photo/../photos/trip"]),
            (903, f"it is a link to {photo}/trip", ["folder", "add", "/photo/other", "/photo/link"]),
            (903, "there is no such folder", ["folder", "add", "/gone"]),
            (None, "is a file", ["folder", "add", "/photo/file.txt"]),
            (None, "neither", ["folder", "add", "/phot/trip"]),
            (902, "folder list", ["folder", "delete", "/photo/trip", "/photo/other"]),
            (902, "folder list", ["folder", "get", "/photo"]),
            (800, "share list", ["share", "pause", "phot"]),
            (None, "no folder of share", ["share", "pause", "photos"]),
            (None, "not paused", ["share", "forget", "photo"]),
            (None, "already", ["share", "rename", "photo", "photos"]),
            (None, "no share", ["share", "rename", "nonexistent", "photo"]),
            (None, "exists already", ["share", "rename", "photo", "taken"]),
            (None, "does not exist", ["share", "rename", "gone", "here"]),
            (None, "already", ["share", "migrate", "photo", photo]),
            (None, "", ["share", "migrate", "photo", f"{self.vol}/nowhere"]),
            (800, "homes", ["user", "rename", "a", "b"]),
            (None, "nothing is left", ["share", "forget", "nonexistent", "/nowhere"]),
            (None, "no indexed folder", ["folder", "reindex", "/photo/other"]),
            (None, "no folder of share", ["share", "check-recycle", "photos"]),
            *((None, f"{self.vol} is no mount point; it lies on the volume /", ["volume", verb, self.vol])
              for verb in ("pause", "resume", "forget")),
            (None, "does not exist", ["volume", "pause", f"{self.vol}/pho"]),
            (800, "share list", ["suggest-refresh", "nonexistent"]),
        ]
        for code, text, words in rows:
            with self.subTest(words=words):
                self.expect_refused(code, *words, text=text)
        self.assertEqual(["photo"], [share["share"] for share in self.instance.status()["index_daemon"]["shares"]])
        os.mkdir(f"{self.instance.root}/var/packages/Ferrox/etc/fileindex.folders.new")  # stops root's writing, too
        self.expect_refused(505, "folder", "add", "/photo/other", text="not done: save the folders; tell the index daemon")

    def test_daemons_that_do_not_run(self):
        docs = self.share_without_folders("docs")
        self.expect_refused(913, "folder", "add", "/docs", text="'fileindexctl up'")
        media = f"{self.vol}/media"
        os.makedirs(media)
        shares = self.ctl("share", "list")
        self.expect_refused(913, "share", "add", media, text="'fileindexctl up'")
        self.ctl("up")
        os.mkdir(f"{self.instance.root}/var/packages/Ferrox/etc/fileindex.folders.new")  # stops root's writing, too
        self.expect_refused(505, "share", "add", media, text="the share was not added")
        os.rmdir(f"{self.instance.root}/var/packages/Ferrox/etc/fileindex.folders.new")
        self.assertEqual((shares, {}, []), (self.ctl("share", "list"), self.indices(), self.files_below("var/lib/kova/notifyd/queues")))
        self.ctl("folder", "add", "/docs")
        self.ctl("share", "add", media)
        self.expect_documents("docs", docs, docs)
        self.instance.kill("fileindexd")
        for words in (["folder", "delete", "/docs"], ["share", "pause", "docs"], ["volume", "pause", "/"]):
            self.expect_refused(502, *words, text="fileindexctl up")
        write(f"{docs}/a.txt", "ibex")
        self.ctl("folder", "set", "/docs", "--kinds", "none")  # starts the index daemon
        self.ctl("folder", "set", "/docs", "--kinds", "document")
        self.ctl("index", "docs", "--wait")
        self.expect_found("ibex", f"{docs}/a.txt")
        self.instance.kill("kovaelasticd")
        self.expect_refused(913, "folder", "delete", "/docs", text="fileindexctl up")
        self.expect_refused(913, "share", "rename", "docs", "papers", text="fileindexctl up")
        self.assertTrue(os.path.isdir(docs))

    def test_changes_at_once_all_land_and_a_killed_one_tears_nothing(self):
        self.ctl("up")
        docs = self.share_without_folders("docs")
        for number in range(40):
            os.makedirs(f"{docs}/d{number}")

        def add(number):
            return subprocess.Popen([os.path.join(BIN, "fileindexctl"), "folder", "add", f"/docs/d{number}"],
                                    env=self.instance.env, stdout=subprocess.DEVNULL, stderr=subprocess.PIPE)
        running = [add(number) for number in range(20)]
        for process in running:
            self.assertEqual((b"", 0), (process.communicate(timeout=100)[1], process.returncode))
        self.assertEqual({f"/docs/d{number}" for number in range(20)}, {f["path"] for f in self.instance.folders()})
        for number in range(20, 40):
            process = add(number)
            time.sleep((number - 20) * 0.002)
            process.send_signal(signal.SIGKILL)
            process.communicate()
            self.assertGreaterEqual(len(self.instance.folders()), 20)
        present = [int(f["path"][len("/docs/d"):]) for f in self.instance.folders()]
        missing = [number for number in range(40) if number not in present]
        if missing:
            self.ctl("folder", "add", *(f"/docs/d{number}" for number in missing))
        # Also those whose sender was killed when they were saved, but not yet told of.
        self.expect_documents("docs", docs, *(f"{docs}/d{number}" for number in range(40)))

    def test_share_that_samba_renames_and_moves(self):
        testparm, sections = f"{self.instance.root}/testparm", f"{self.instance.root}/etc/samba/smb.conf"
        write(testparm, f"#!/bin/sh\ncat {sections}\n")
        os.chmod(testparm, 0o755)
        write(f"{self.instance.root}/etc/kova/kova.json", json.dumps({"samba": {"shares": True, "testparm": testparm}}))
        pets, animals = f"{self.vol}/pets", f"{self.vol}2/animals"
        write(f"{pets}/cat.txt", "lynx")
        write(sections, f"[pets]\n\tpath = {pets}\n\tread only = No\n")
        self.ctl("up")
        self.ctl("folder", "add", "/pets")
        self.expect_documents("pets", pets, pets)
        for verb in (["remove", "pets"], ["rename", "pets", "animals"], ["migrate", "pets", f"{self.vol}2/pets"]):
            os.makedirs(f"{self.vol}2/pets", exist_ok=True)
            self.expect_refused(None, "share", *verb, text="kept by the file-sharing service")
        os.rmdir(f"{self.vol}2/pets")

        os.rename(pets, f"{self.vol}/animals")
        write(sections, f"[animals]\n\tpath = {self.vol}/animals\n\tread only = No\n")
        self.ctl("share", "rename", "pets", "animals")
        self.expect_documents("animals", f"{self.vol}/animals", f"{self.vol}/animals")
        os.rename(f"{self.vol}/animals", animals)
        write(sections, f"[animals]\n\tpath = {animals}\n\tread only = No\n")
        self.expect_refused(None, "share", "migrate", "animals", animals, text="--from")
        self.ctl("share", "migrate", "animals", animals, "--from", f"{self.vol}/animals")
        self.expect_documents("animals", animals, animals)
        self.expect_found("lynx", f"{animals}/cat.txt")

    def test_what_moves_is_not_read_again(self):
        self.ctl("up")
        docs, homes = self.share_without_folders("docs"), self.share_without_folders("homes")
        for folder in (f"{docs}/letters", f"{docs}/plans/old", f"{homes}/anna"):
            for number in range(40):
                write(f"{folder}/{number}.txt", f"ibex {number}")
        self.ctl("folder", "add", "/docs", "/homes/anna")
        papers, moved = f"{self.vol}/papers", f"{self.vol}/2/papers"
        os.mkdir(f"{self.vol}/2")
        steps = (  # what is done on the disk first, the command, and the folders that are indexed then
            ([], [], docs, f"{homes}/anna"),
            ([f"{docs}/plans", f"{docs}/drafts"], [], docs, f"{homes}/anna"),
            ([], ["share", "rename", "docs", "papers"], papers, f"{homes}/anna"),
            ([papers, moved], ["share", "migrate", "papers", moved], moved, f"{homes}/anna"),
            ([], ["share", "pause", "papers"], None, None), ([], ["share", "resume", "papers"], moved, f"{homes}/anna"),
            ([], ["pause"], None, None),  # else the folder may be taken for deleted before its new name is told
            ([f"{homes}/anna", f"{homes}/carla"], ["user", "rename", "anna", "carla"], None, None),
            ([], ["resume"], moved, f"{homes}/carla"),
            ([], ["volume", "pause", self.vol], None, None), ([], ["volume", "resume", self.vol], moved, f"{homes}/carla"))
        for disk, command, *indexed in steps:
            with self.subTest(disk=disk, command=command):
                if command[:2] == ["volume", "pause"]:
                    self.instance.make_volume(self, self.vol)
                if disk:
                    os.rename(*disk)
                if command:
                    self.ctl(*command)
                if indexed[0]:
                    self.instance.run("search", "--fresh", "ibex")
                    self.expect_documents(os.path.basename(indexed[0]), indexed[0], indexed[0])
                    self.expect_documents("homes", homes, indexed[1])
                self.assertEqual(120, self.instance.status()["index_daemon"]["read"])

    def test_interrupted_rename_is_finished_by_the_same_command(self):
        self.ctl("up")
        docs = self.share_without_folders("docs")
        write(f"{docs}/a.txt", "lemur")
        self.ctl("folder", "add", "/docs")
        self.expect_documents("docs", docs, docs)
        names = ["docs", "n0", "n1", "n2", "n3", "n4", "n5"]
        for round_number, (old, new) in enumerate(zip(names, names[1:])):
            rename = ["share", "rename", old, new]
            try:
                subprocess.run([os.path.join(BIN, "fileindexctl"), *rename], env=self.instance.env, capture_output=True,
                               timeout=round_number * 0.0015, check=True)
            except subprocess.TimeoutExpired:  # it was killed
                done = self.instance.run(*rename)  # refused only when nothing was left to do
                self.assertTrue(done.returncode == 0 or b"there is no share" in done.stderr, done.stderr)
            self.expect_documents(new, f"{self.vol}/{new}", f"{self.vol}/{new}")
            self.expect_found("lemur", f"{self.vol}/{new}/a.txt")
            self.assertEqual({f"fileindex_{new}"}, set(self.indices()))
            self.assertEqual(1, self.instance.status()["index_daemon"]["read"], "the file, when it was new")


if __name__ == "__main__":
    unittest.main()
