"""How the index depends on content extraction: it waits for it, uses it again, and does not trust it."""

import json
import os
import re
import signal
import sys
import unittest
from email.message import EmailMessage

from instance import BIN, InstanceTestCase, children, process_facts, wait_for, workers_of, write

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "corpus"))
import hostile  # noqa: E402
import listed  # noqa: E402

DAEMON = "kovacontentextractd"


def office_document(word):
    """The least that is a DOCX."""
    member = {"path": "docx", "member": "word/document.xml", "replace": ["zeppelin", word]}
    return listed.with_changed_member(hostile.seeds()["docx"], member)


def pdf(word):
    """The word has the length of the one in whose place it stands, so that the table of objects is right."""
    return hostile.seeds()["pdf"].replace(b"zeppelin", word.encode())


def mail(text, **attachments):
    message = EmailMessage()
    message["Subject"] = "hangar"
    message.set_content(text)
    for name, content in attachments.items():
        message.add_attachment(content, maintype="application", subtype="octet-stream", filename=name)
    return message


class ExtractionTest(InstanceTestCase):
    def indexed(self, **files):
        self.ctl("up")
        folder = self.instance.add_share("docs", "--no-index")
        for name, text in files.items():
            write(f"{folder}/{name}.txt", text)
        self.ctl("folder", "add", "/docs")
        return folder

    def docs(self):
        return self.instance.share_status("docs")

    def fields(self, folder, *names):
        return {os.path.basename(entry["KOVAMDPath"]): {name: entry.get(name) for name in names}
                for entry in self.instance.entries("docs", folder, "KOVAMDPath", *names)}

    def test_indexing_waits_until_content_can_be_read(self):
        folder = self.indexed(a="zeppelin")
        self.instance.wait_idle("docs", folder)
        self.instance.kill(DAEMON)
        socket = f"{self.instance.root}/var/run/{DAEMON}.sock"
        os.remove(socket)
        os.makedirs(f"{socket}/occupied")  # nothing can be served there
        write(f"{folder}.b", "balloon")
        os.rename(f"{folder}.b", f"{folder}/b.txt")  # never empty there: no content has to be read for that
        self.ctl("index", "docs")
        wait_for(lambda: self.docs()["state"] == "waiting for content extraction", "the daemon to notice")
        state = self.docs()
        self.assertRegex(state["detail"], "content cannot be read: .*" + re.escape(socket))
        self.assertEqual(0, state["failed"])
        self.assertEqual(["a.txt"], list(self.fields(folder)))
        os.removedirs(f"{socket}/occupied")
        wait_for(lambda: self.docs()["state"] == "idle", "indexing to go on by itself")
        self.assertEqual([os.fsencode(f"{folder}/b.txt")], self.instance.search("balloon"))

    def test_killed_daemon_and_workers_cost_no_file(self):
        folder = self.indexed(**{f"file{i}": "zeppelin " * 20000 for i in range(300)})
        for number in (signal.SIGKILL, signal.SIGTERM):
            wait_for(lambda: self.instance.status()["content_extraction"] is not None, "content to be read")
            os.kill(self.instance.pid(DAEMON), number)
        self.instance.wait_idle("docs", folder)
        errors = {name: fields for name, fields in self.fields(folder, "_KOVAExtractError").items()
                  if fields["_KOVAExtractError"]}
        self.assertEqual({}, errors)
        self.assertEqual(300, len(self.instance.search("zeppelin")))

    def test_blamed_file_is_tried_again_by_a_newer_reader_only(self):
        folder = self.indexed(older="zeppelin", same="balloon", fine="glider")
        self.instance.wait_idle("docs", folder)
        versions = self.fields(folder, "_KOVAExtractVersion")
        self.assertEqual({"_KOVAExtractVersion": 1}, versions["same.txt"])
        for name, version, error in (("older", 0, "crashed the reader"), ("same", 1, "crashed the reader")):
            change = {"_KOVAExtractVersion": version, "_KOVAExtractError": error}
            reply = self.instance.ask("kovaelasticd", {"command": "document_set_by_id", "data": {
                "id": "fileindex_docs", "doc_id": f"{folder}/{name}.txt", "data": change}})
            self.assertTrue(reply["success"], reply)
        self.assertIn(b"not read, or not all: 2 crashed the reader", self.commit_and_status())
        written = self.docs()["written"]
        self.ctl("index", "docs", "--wait")
        self.assertEqual({"older.txt": {"_KOVAExtractError": None}, "same.txt": {"_KOVAExtractError": "crashed the reader"},
                          "fine.txt": {"_KOVAExtractError": None}}, self.fields(folder, "_KOVAExtractError"))
        self.assertEqual(written + 1, self.docs()["written"])
        write(f"{folder}/same.txt", "balloon changed")
        self.ctl("index", "docs", "--wait")
        self.assertIsNone(self.fields(folder, "_KOVAExtractError")["same.txt"]["_KOVAExtractError"])

    def test_text_that_is_dropped_is_told(self):
        reason = "partly read: only the first 1 MiB of its text"
        folder = self.indexed(long="balloon " + "zeppelin " * 200000, short="balloon")
        self.instance.wait_idle("docs", folder)
        # What an index written before says of such a file, a comparison mends.
        reply = self.instance.ask("kovaelasticd", {"command": "document_set_by_id", "data": {
            "id": "fileindex_docs", "doc_id": f"{folder}/long.txt", "data": {"_KOVAExtractError": None}}})
        self.assertTrue(reply["success"], reply)
        self.ctl("index", "docs", "--wait")
        self.assertEqual({"long.txt": {"_KOVAExtractError": reason}, "short.txt": {"_KOVAExtractError": None}},
                         self.fields(folder, "_KOVAExtractError"))
        written = self.docs()["written"]
        self.ctl("index", "docs", "--wait")
        self.assertEqual(written, self.docs()["written"], "once")
        self.assertIn(b"partly read: 1 only the first 1 MiB of its text", self.commit_and_status())
        self.assertIn(f"content: {reason} (reader version 1)".encode(), self.ctl("show", f"{folder}/long.txt"))
        unread = [json.loads(line) for line in self.ctl("unread", "docs", "--json").splitlines()]
        self.assertEqual([(f"{folder}/long.txt", reason, True)],
                         [(line["path"], line["reason"], line["partly_read"]) for line in unread])
        self.assertEqual(2, len(self.instance.search("balloon")))

    def test_reader_that_is_not_installed_costs_nothing_and_is_used_once_it_is(self):
        programs = f"{self.instance.root}/readers"
        os.makedirs(programs)
        os.symlink(f"{BIN}/kovacontentworker", f"{programs}/kovacontentworker")
        self.instance.env["FERROX_LIBEXEC"] = programs
        folder = self.indexed(a="balloon")
        write(f"{folder}/a.pdf", pdf("zeppelin"))
        self.ctl("index", "docs", "--wait")
        state = self.commit_and_status()
        self.assertIn(b"not installed: kovacontentworker-pdf;", state)
        self.assertRegex(state, b"1 its reader, kovacontentworker-pdf, is not installed")
        self.instance.wait_idle("docs", folder)
        written = self.docs()["written"]
        self.ctl("index", "docs", "--wait")
        self.assertEqual(written, self.docs()["written"], "nothing has changed")
        os.symlink(f"{BIN}/kovacontentworker-pdf", f"{programs}/kovacontentworker-pdf")
        self.ctl("index", "docs", "--wait")
        self.assertEqual(written + 1, self.docs()["written"])
        self.assertEqual([os.fsencode(f"{folder}/a.pdf")], self.instance.search("zeppelin"))

    def test_type_that_the_content_tells_outlives_a_change_of_attributes(self):
        folder = self.indexed(a="balloon")
        write(f"{folder}/text.jpg", "zeppelin")
        self.ctl("index", "docs", "--wait")
        self.instance.wait_idle("docs", folder)
        os.chmod(f"{folder}/text.jpg", 0o600)
        self.ctl("search", "--fresh", "zeppelin")
        os.rename(f"{folder}/text.jpg", f"{folder}/moved.jpg")
        self.ctl("search", "--fresh", "zeppelin")
        self.assertEqual("text/plain", self.fields(folder, "KOVAMDContentType")["moved.jpg"]["KOVAMDContentType"])

    def test_what_was_read_of_a_file_is_told(self):
        folder = self.indexed(a="zeppelin\nover the sea " * 40)
        write(f"{folder}/page.html", "<title>Airships</title><p>balloon")
        for name in ("b\n.pdf", "c.pdf"):
            write(f"{folder}/{name}", b"%PDF-1.4 damaged")
        self.ctl("index", "docs", "--wait")
        shown = self.ctl("show", "/docs/a.txt", f"{folder}/page.html").decode()
        for expected in (f"{folder}/a.txt\n    content: read (reader version 1)\n    type: text/plain\n",
                         "    text: 880 B, was UTF-8", "        zeppelin over the sea zeppelin", " ...\n",
                         "    Title: Airships\n", "        balloon\n"):
            self.assertIn(expected, shown)
        self.assertEqual(b"zeppelin\nover the sea " * 40, self.ctl("show", "--text", f"{folder}/a.txt"))
        self.assertEqual("Airships", json.loads(self.ctl("show", "--json", "/docs/page.html"))["KOVAMDTitle"])
        self.assertIn(b"content: not read, or not all: damaged", self.ctl("show", "/docs/c.pdf"))
        self.assertEqual(b"", self.ctl("show", "/docs/none.txt", code=1))
        lines = [json.loads(line) for line in self.ctl("unread", "--json", "docs").splitlines()]
        self.assertEqual([(f"{folder}/{name}", "damaged") for name in ("b\n.pdf", "c.pdf")],
                         [(line["path"], line["reason"]) for line in lines])
        self.assertEqual(f"{folder}/b\\x0A.pdf\n    damaged\n{folder}/c.pdf\n    damaged\n", self.ctl("unread").decode())
        self.assertIn(b"all: fileindexctl unread docs", self.commit_and_status())

    def test_attachments_are_read_by_the_readers_of_their_kinds(self):
        outer = mail("zeppelin", **{"plan.docx": office_document("balloon"), "plan": pdf("airliner"), "cut.docx": b"PK\3\4"})
        outer.attach(mail("gyrocopter", **{"inner.docx": office_document("helicopter")}))
        outer.add_attachment(mail("ornithopter", **{"deep.docx": office_document("autogyro")}).as_bytes(),
                             maintype="application", subtype="octet-stream", filename="saved.eml")
        self.ctl("up")
        folder = self.instance.add_share("docs", "--no-index")
        write(f"{folder}/outer.eml", outer.as_bytes())
        self.ctl("folder", "add", "/docs")
        self.instance.wait_idle("docs", folder)
        found = {word for word in ("zeppelin", "balloon", "airliner", "gyrocopter", "helicopter", "ornithopter", "autogyro",
                                   "deep") if self.instance.search(word)}
        self.assertEqual({"zeppelin", "balloon", "airliner", "gyrocopter", "helicopter", "ornithopter", "deep"}, found)
        self.assertEqual({"outer.eml": {"_KOVAExtractError": "attachment: damaged", "KOVAMDTitle": "hangar"}},
                         self.fields(folder, "_KOVAExtractError", "KOVAMDTitle"))

    def commit_and_status(self):
        self.instance.ask("kovaelasticd", {"command": "commit", "data": {"id": "fileindex_docs"}})
        return self.ctl("status")

    def test_workers_have_no_rights(self):
        folder = self.indexed(a="zeppelin")
        self.instance.wait_idle("docs", folder)
        status = self.instance.status()["content_extraction"]
        self.assertEqual((1, 0), (status["files"], status["blamed"]))
        self.assertRegex(self.ctl("status"), b"content extraction: runs, process [0-9]+, 1 of at most [0-9]+ workers, 1 files")
        daemon = self.instance.pid(DAEMON)
        workers = workers_of(daemon)
        self.assertEqual(status["workers"], len(workers))
        for pid in children(daemon):  # also what workers are forked from
            facts = process_facts(pid)
            self.assertEqual("1", facts["NoNewPrivs"])
            self.assertEqual({"0" * 16}, {facts[kind] for kind in ("CapInh", "CapPrm", "CapEff", "CapAmb")})
            if pid in workers and "seccomp" not in status["missing"]:
                self.assertEqual("2", facts["Seccomp"])
            if os.geteuid() == 0:
                self.assertNotEqual(os.stat("/"), os.stat(f"/proc/{pid}/root/"))
                self.assertEqual("", facts["Groups"].strip())
                if "a user of its own" not in status["missing"]:
                    self.assertEqual(1, len(set(facts["Uid"].split() + facts["Gid"].split())))
                    self.assertGreater(int(facts["Uid"].split()[0]), 1 << 31)


if __name__ == "__main__":
    unittest.main()
