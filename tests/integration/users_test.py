"""What ordinary users of an instance of root's find, and what they can learn beside it. Needs root."""

import glob
import json
import os
import subprocess
import sys
import unittest

from instance import BIN, InstanceTestCase, process_facts, wait_for, write

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "rights"))

from asking import ACCESS, Child, Engine, User, acl_bytes, opens  # noqa: E402
from rights_world import USERS, World  # noqa: E402

TEAM = 50010
ANN, BOB = User(50001, [50001, TEAM]), User(50002, [50002])  # no accounts: the kernel and the service go by numbers
ENGINE = User(50009, [50009])


@unittest.skipUnless(os.geteuid() == 0, "takes on other users; needs root")
class UsersTest(InstanceTestCase):
    def setUp(self):
        super().setUp()
        os.chmod(self.instance.root, 0o755)
        subprocess.run([os.path.join(BIN, "kovaelasticd"), "--prepare", str(ENGINE.uid)], env=self.instance.env, check=True)
        self.ctl("up")

    def as_user(self, user, *words, program=os.path.join(BIN, "fileindexctl")):
        return subprocess.run([program, *words], env=self.instance.env, cwd="/", capture_output=True, timeout=120,
                              check=False, user=user.uid, group=user.groups[0], extra_groups=user.groups[1:])

    def by_root(self, user, command, *words):
        return self.instance.run(command, "--as", f"{user.uid}:{','.join(map(str, user.groups))}", *words)

    def for_user(self, user, command, *words):
        """A command as root runs it for a user, and the same, if users are let in, as that user runs it."""
        done = self.by_root(user, command, *words)
        if os.stat(f"{self.instance.root}/var/run/kovaelasticd.sock").st_mode & 0o006:
            own = self.as_user(user, command, *words)
            self.assertEqual((done.returncode, done.stdout if done.returncode == 0 else b""),
                             (own.returncode, own.stdout if done.returncode == 0 else b""), own.stderr)
        return done

    def found(self, user, *words):
        """The names of the files found, in order."""
        done = self.for_user(user, "search", "--json", *words)
        self.assertIn(done.returncode, (0, 1), done.stderr)
        result = json.loads(done.stdout)
        self.assertEqual((result["total"], []), (len(result["hits"]), result["left_out"]))
        return sorted(os.path.basename(hit["doc_id"]) for hit in result["hits"])

    def make_shares(self):
        """plans, of which each user may read another part, and vault, which neither may enter."""
        plans, vault = (f"{self.instance.root}/vol/{name}" for name in ("plans", "vault"))
        for path, uid, gid, mode in (("ann/a.txt", ANN.uid, TEAM, 0o600), ("bob/b.txt", BOB.uid, TEAM, 0o600),
                                     ("team/c.txt", 0, TEAM, 0o640), ("all.txt", 0, 0, 0o644), ("some.txt", 0, 0, 0o600)):
            write(f"{plans}/{path}", "lantern in " + path)
            os.chown(f"{plans}/{path}", uid, gid)
            os.chmod(f"{plans}/{path}", mode)
        for name, user in (("ann", ANN), ("bob", BOB)):
            os.chown(f"{plans}/{name}", user.uid, user.groups[0])
            os.chmod(f"{plans}/{name}", 0o700)
        os.setxattr(f"{plans}/some.txt", ACCESS, acl_bytes(6, 0, 0, users={BOB.uid: 4}, mask=4))
        write(f"{vault}/gold.txt", "lantern of gold")
        os.chmod(vault, 0o700)
        for share, file in ((plans, "some.txt"), (vault, "gold.txt")):
            self.ctl("share", "add", share)
            wait_for(lambda file=file: self.instance.search(f"lantern name:{file}"), file)
        return plans, vault

    def ask_as(self, user, command, **data):
        asker = {"uid": user.uid, "groups": list(user.groups)}
        reply = self.instance.ask("kovaelasticd", {"command": command, "data": {"as": asker, **data}})
        return reply["data"] if reply["success"] else reply["error"]

    def test_users_learn_of_their_shares_whether_all_is_in_and_how_they_are(self):
        self.ctl("up")
        plans, secret = self.instance.add_share("plans"), self.instance.add_share("secret")
        os.chmod(secret, 0o700)
        for name in ("plans", "secret"):
            wait_for(lambda: self.share_note(name), "the note")
        states = [{"share": "plans", "state": "ready"}]
        wait_for(lambda: self.ask_as(ANN, "shares") == states, "the state of the one that she may enter")
        self.assertEqual(1404, self.ask_as(ANN, "fresh", shares=["secret"])["code"])
        for i in range(5):
            write(f"{plans}/{i}.txt", f"lantern{i}")
            self.assertEqual({"behind": []}, self.ask_as(ANN, "fresh"))
            self.assertEqual(1, self.ask_as(ANN, "search", query=f"lantern{i}")["total"])
        self.ctl("pause")
        write(f"{plans}/later.txt", "beacon")
        write(f"{secret}/later.txt", "beacon")
        self.assertEqual({"behind": ["plans"]}, self.ask_as(ANN, "fresh"))
        self.instance.kill("kovanotifyd")
        self.assertEqual("it cannot be said now whether all changes are included", self.ask_as(ANN, "fresh")["msg"])

    def share_note(self, name):
        with open(f"{self.instance.root}/var/lib/kova/kovaelasticd/indices.json", encoding="utf-8") as file:
            return any(index.get("share", {}).get("share") == name for index in json.load(file).values())

    def test_files_of_the_service_tell_others_nothing(self):
        self.ctl("down")
        for folder in ("etc/kova", "var/packages/Ferrox/etc", "var/lib/kova/notifyd"):
            os.chmod(f"{self.instance.root}/{folder}", 0o755)  # as an earlier version left them
        self.ctl("up")
        folder = self.instance.add_share("plans")
        write(f"{folder}/a.txt", "lantern")
        wait_for(lambda: self.instance.search("lantern"), "the file")
        seen = self.as_user(ANN, "-rIl", "", self.instance.root, program="grep").stdout.decode().split()
        self.assertEqual([f"{folder}/a.txt"], seen)
        names = self.as_user(ANN, self.instance.root, "-path", f"{self.instance.root}/vol", "-prune", "-o", "-name",
                             "*plans*", "-print", program="find").stdout
        self.assertEqual(b"", names)
        for index in glob.glob(f"{self.instance.root}/var/lib/kova/fileindex/db/*/index.sqlite*"):
            self.assertEqual(0o600, os.stat(index).st_mode & 0o777, index)

    def test_two_users_find_their_own_in_one_share(self):
        plans, _ = self.make_shares()
        hers, his = ["a.txt", "all.txt", "c.txt"], ["all.txt", "b.txt", "some.txt"]
        for words in (["lantern"], ["--share", "plans", "lantern"], ["--sort", "name", "ext:txt"]):
            self.assertEqual((hers, his), (self.found(ANN, *words), self.found(BOB, *words)))
        self.assertEqual(["a.txt", "ann"], self.found(ANN, "ann"))
        self.assertEqual([], self.found(BOB, "ann"))
        for account in ("nobody", "65534"):
            shown = self.instance.run("search", "--as", account, "lantern").stdout
            self.assertEqual([b"all.txt"], [os.path.basename(line) for line in shown.splitlines() if line.startswith(b"/")])
        self.assertIn(b'no user "no-body"', self.instance.run("search", "--as", "no-body", "lantern").stderr)
        for share in ("vault", "nowhere"):  # one that they may not enter is none
            done = self.for_user(ANN, "search", "--share", share, "lantern")
            self.assertEqual((3, f'fileindexctl: there is no share "{share}" here\n'), (done.returncode, done.stderr.decode()))
        # Page by page, each beginning where the last one says.
        paged, offset = [], 0
        for _ in hers:
            page = json.loads(self.for_user(ANN, "search", "--json", "--limit", "1", "--offset", str(offset), "lantern").stdout)
            paged += [os.path.basename(hit["doc_id"]) for hit in page["hits"]]
            offset = page["next_offset"]
        self.assertEqual(hers, sorted(paged))
        # What is taken away is so at once; what is given, as soon as the index has it.
        os.chmod(f"{plans}/all.txt", 0o600)
        self.assertNotIn(b"all.txt", self.by_root(BOB, "search", "lantern").stdout)
        os.chmod(f"{plans}/bob", 0o755)
        os.chmod(f"{plans}/bob/b.txt", 0o644)
        wait_for(lambda: b"b.txt" in self.by_root(ANN, "search", "lantern").stdout, "a file that everybody may read now")

    def test_a_trusted_client_asks_for_users(self):
        self.make_shares()
        root, client = self.instance.root, User(1, [1])  # "daemon"
        # Accounts that no host has: one whom the name service knows, and one for whom it has no answer.
        write(f"{root}/bin/kova-accounts", f"""#!/bin/sh
case $2 in
  ann) shift 2; echo '{{"uid":{ANN.uid},"gids":[{ANN.uid},{TEAM}],"may_log_in":true,"rules":['$(for rule; do printf '%s"no"' "$comma"; comma=,; done)']}}';;
  hangs) exec sleep 60;;
  *) exec {BIN}/kova-accounts "$@";;
esac
""")
        os.chmod(f"{root}/bin/kova-accounts", 0o755)
        self.ctl("down")
        self.instance.env["FERROX_LIBEXEC"] = f"{root}/bin"
        self.ctl("up")

        def ask(name, command="search", user=client):
            data = {"as": {"user": name}, "query": "lantern ext:txt", "path": f"{root}/vol/plans/bob/b.txt"}
            engine = f"{root}/var/run/kovaelasticd.sock"
            return json.loads(Child(user, lambda: Engine(engine).ask(command, data)).result())

        def found(name):
            reply = ask(name)
            return sorted(os.path.basename(hit["doc_id"]) for hit in reply.get("data", {}).get("hits", [])) or reply.get("error", {}).get("code")

        self.assertEqual(1406, found("ann"))
        write(f"{root}/etc/kova/kova.json", '{"trusted_clients": ["daemon"], "least_user": 1}')
        wait_for(lambda: found("ann") == ["a.txt", "all.txt", "c.txt"], "the settings")
        # The engine waits half a second for what tells it whom to trust, and trusts nobody then.
        wait_for(lambda: ask("ann", "show")["error"]["code"] == 1405, "the refusal")
        wait_for(lambda: ask("ann", "fresh").get("data") == {"behind": []}, "all to be in")
        self.assertEqual(1406, ask("ann", user=BOB)["error"]["code"])
        for name in ("root", 0, "nobody", 65534, "no-such-user"):
            self.assertEqual({"code": 1406, "msg": f'"{name}" may not search by way of another program'}, ask(name)["error"])
        wait_for(lambda: found("hangs") == 1414, "the refusal")
        wait_for(lambda: found("ann") == ["a.txt", "all.txt", "c.txt"], "what she may read")
        # The share's rules, and settings that cannot be read.
        table = f"{root}/etc/kova/shares.json"
        with open(table, encoding="utf-8") as file:
            shares = json.load(file)
        next(share for share in shares if share["name"] == "plans")["valid_users"] = ["bob"]
        write(table, json.dumps(shares))
        wait_for(lambda: ask("ann", "shares").get("data") == [], "the rules")
        write(f"{root}/etc/kova/kova.json", '{"trusted_clients": ["daemon"], "least_user": "1"}')
        wait_for(lambda: ask("ann").get("error", {}).get("code") == 1406, "the settings")

    def test_the_name_service_is_asked(self):
        told = subprocess.run([f"{BIN}/kova-accounts", "uid", "0", "root", "ROOT", "nobody", "+root", "@no-such-group", "+daemon"],
                              capture_output=True, check=True).stdout
        told = json.loads(told)
        self.assertEqual((0, True, ["yes", "unknown", "no", "yes", "unknown", "no"]),
                         (told["uid"], told["may_log_in"], told["rules"]))
        self.assertIn(0, told["gids"])

    def test_root_is_told_what_stops_a_user(self):
        plans, vault = self.make_shares()
        rows = [(ANN, f"{plans}/bob/b.txt", f"may not enter {plans}/bob: the mode's bits for others\n"),
                (ANN, f"{plans}/some.txt", f"may not read {plans}/some.txt: the mode's bits for others, since no entry of the ACL"),
                (BOB, f"{plans}/team/c.txt", f"may not read {plans}/team/c.txt: the mode's bits for others\n"),
                (BOB, f"{vault}/gold.txt", f"may not enter {vault}: the mode's bits for others\n"),
                (ANN, f"{plans}/none.txt", f"may not read {plans}/none.txt: No such file")]
        for user, path, reason in rows:
            with self.subTest(path=path):
                done = self.for_user(user, "show", path)
                self.assertEqual(1, done.returncode, done.stderr)
                self.assertTrue(done.stdout.decode().startswith(f"{path} is not shown to user {user.uid}: {reason}"), done.stdout)
                self.assertNotIn(b"all the same", done.stdout)
        self.assertIn(b"lantern in ann/a.txt", self.for_user(ANN, "show", f"{plans}/ann/a.txt").stdout)
        self.assertEqual(b"lantern in ann/a.txt", self.for_user(ANN, "show", "--text", "/plans/ann/a.txt").stdout)
        table = f"{self.instance.root}/etc/kova/shares.json"
        with open(table, encoding="utf-8") as file:
            shares = json.load(file)
        for share in shares:
            share.update({"veto_files": "/zzz/ANN/", "hide_files": "/b.t?t/"} if share["name"] == "plans" else {})
        write(table, json.dumps(shares))
        for path, rule in ((f"{plans}/ann/a.txt", b"veto files = ANN"), (f"{plans}/bob/b.txt", b"hide files = b.t?t")):
            self.assertIn(b"hidden by %s of share plans\n" % rule, self.by_root(ANN, "show", path).stdout)
        self.assertNotIn(b"hidden by", self.by_root(ANN, "show", f"{plans}/some.txt").stdout)

    def test_the_engine_is_a_user_of_its_own_and_is_given_what_root_made_alone(self):
        """The indices of an engine of root's, of which one is elsewhere, and what others could have put in their place."""
        root, prepare = self.instance.root, [os.path.join(BIN, "kovaelasticd"), "--prepare", str(ENGINE.uid)]
        self.ctl("down")
        for folder, _, files in os.walk(f"{root}/var/lib/kova"):  # as an earlier version left it
            for name in [".", *files]:
                os.chown(f"{folder}/{name}", 0, 0)
        os.chmod(f"{root}/var/lib/kova/fileindex", 0o700)
        os.remove(f"{root}/var/run/kovaelasticd.sock")
        self.ctl("up")
        folder = self.instance.add_share("plans")
        for path in (f"{root}/elsewhere", f"{folder}/index"):
            request = {"command": "index_create", "data": {"id": os.path.basename(path), "path": path}}
            self.assertTrue(self.instance.ask("kovaelasticd", request)["success"])
        write(f"{folder}/a.txt", "lantern")
        wait_for(lambda: self.instance.search("lantern"), "the file")
        self.assertEqual(3, subprocess.run(prepare, env=self.instance.env, stderr=subprocess.DEVNULL, check=False).returncode)
        self.ctl("down")
        db = f"{root}/var/lib/kova/fileindex/db"
        (index,) = glob.glob(f"{db}/*")
        os.chmod(folder, 0o777)
        write(f"{root}/root's", "")
        os.link(f"{root}/root's", f"{index}/hard")
        os.symlink(f"{root}/root's", f"{index}/soft")
        subprocess.run(prepare, env=self.instance.env, check=True)
        os.symlink(root, f"{db}/later.index")
        os.mkdir(f"{db}/open.index", 0o777)
        os.chmod(f"{db}/open.index", 0o777)
        os.mkdir(f"{db}/by_root.index", 0o700)
        write(f"{index}/later", "")
        self.ctl("up")
        owners = {path: os.lstat(path).st_uid for path in
                 (index, f"{index}/index.sqlite", f"{db}/by_root.index", f"{root}/elsewhere/index.sqlite", f"{root}/root's",
                  root, f"{root}/var/lib/kova", f"{folder}/index", f"{db}/open.index", f"{index}/later")}
        self.assertEqual([ENGINE.uid] * 4 + [0] * 6, list(owners.values()), owners)
        self.assertEqual("0000000000000000", process_facts(self.instance.pid("kovaelasticd"))["CapPrm"])
        self.assertIn("a.txt", self.found(ANN, "lantern"))
        # The administrator's synonyms, which the engine may not read itself.
        write(f"{root}/etc/kova/synonyms.conf", "alone\ntorch => lantern\n")
        wait_for(lambda: "a.txt" in self.found(ANN, "torch"), "the synonyms")
        self.assertIn("synonyms.conf: line 1 has one word alone", self.ctl("status").decode())
        for daemon, kind, code in (("fileindexd", "status", None), ("fileindexd", "pause", 1406), ("kovanotifyd", "sync", None),
                                   ("kovanotifyd", "status", 1406), ("kova-access", "trust", None), ("kova-access", "open", 1406)):
            request = {"type": kind, "data": {}}
            reply = Child(ENGINE, lambda daemon=daemon, request=request: self.instance.ask(daemon, request)).result()
            self.assertEqual(code, None if reply["success"] else reply["error"]["code"], (daemon, kind, reply))
        self.assertFalse(Child(ANN, lambda: os.access(f"{root}/var/run/fileindexd.sock", os.W_OK, effective_ids=True)).result())

    def test_the_rules_that_are_named_are_those_of_the_kernel(self):
        share, outside = (f"{os.path.realpath(self.instance.root)}/vol/{name}" for name in ("rights", "outside"))
        os.makedirs(share)
        os.mkdir(outside)
        world = World(14, os.fsencode(share), os.fsencode(outside))
        world.make()
        os.chmod(share, 0o755)
        self.ctl("share", "add", share)
        self.instance.wait_idle("rights", share)
        paths = sorted(world.entries())
        shown = 0
        for user in USERS:
            lines = self.by_root(user, "show", "--json", *paths).stdout.decode().splitlines()
            allowed = Child(user, lambda: [opens(path) for path in paths]).result()
            self.assertEqual(len(paths), len(lines))
            for path, opened, told in zip(paths, allowed, map(json.loads, lines)):
                self.assertEqual(opened, "KOVAMDPath" in told, (user, path, told))
                shown += opened
                if not opened:
                    granted = [step["granted"] for step in told["way"]]
                    self.assertEqual((False, [True] * (len(granted) - 1) + [False]), (told["opens"], granted), told)
        self.assertTrue(0 < shown < len(paths) * len(USERS))


if __name__ == "__main__":
    unittest.main()
