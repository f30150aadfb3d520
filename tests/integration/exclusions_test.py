"""What patterns leave out is not in the index, also when it was there before, and comes back when they go; with real
daemons, which are killed meanwhile."""

import json
import os
import unittest

from instance import wait_for, write
from live import LiveInstance


class ExclusionsTest(unittest.TestCase):
    def setUp(self):
        self.instance = LiveInstance()
        self.addCleanup(self.instance.stop)
        self.instance.ctl("up")
        self.docs = self.instance.share("docs")

    def names(self):
        """Of the documents, without the share's folder, those with content marked with "+"."""
        self.instance.sync()
        entries = self.instance.entries("docs", self.docs, "KOVAMDPath", "KOVAMDIsDir", "KOVAMDTextContent")
        return sorted(entry["KOVAMDPath"][len(self.docs) + 1:] + ("+" if entry.get("KOVAMDTextContent") else "")
                      for entry in entries if not entry["KOVAMDIsDir"])

    def write(self, *names):
        for name in names:
            write(f"{self.docs}/{name}", f"the words of {os.path.basename(name)}")

    def test_ignore_files_hold_live_and_for_what_was_there_before(self):
        self.write("a.txt", "p/a.txt", "p/a.log", "p/q/b.log", "p/node_modules/x/i.js", "p/.git/config", "p/.env")
        before = ["a.txt+", "p/.env", "p/a.log+", "p/a.txt+", "p/q/b.log+"]
        self.assertEqual(before, self.names())

        rules = f"{self.docs}/p/.indexignore"
        write(rules, "*.log\n#: name only\n/a.txt\n!.env\n")
        self.write("p/q/c.log", "c.log")
        self.assertEqual(["a.txt+", "c.log+", "p/.env", "p/.indexignore+", "p/a.txt"], self.names())
        shown = self.instance.run("show", f"{self.docs}/p/q/c.log")
        self.assertIn(f'"*.log" (line 1 of {rules})', shown.stderr.decode())
        shown = self.instance.run("show", f"{self.docs}/p/node_modules/x/i.js")
        self.assertIn('"node_modules/" (default)', shown.stderr.decode())
        shown = self.instance.run("show", f"{self.docs}/p/.env")
        self.assertIn('".env" (default)', shown.stdout.decode())

        write(rules, "q/\n")
        self.assertEqual(["a.txt+", "c.log+", "p/.env", "p/.indexignore+", "p/a.log+", "p/a.txt+"], self.names())
        os.rename(f"{self.docs}/p/q", f"{self.docs}/r")
        os.rename(f"{self.docs}/p/.indexignore", f"{self.docs}/r/.indexignore")
        write(f"{self.docs}/r/.indexignore", "b.*\n")
        self.assertEqual(["a.txt+", "c.log+", "p/.env", "p/a.log+", "p/a.txt+", "r/.indexignore+", "r/c.log+"], self.names())
        os.remove(f"{self.docs}/r/.indexignore")
        self.assertEqual(["a.txt+", "c.log+", "p/.env", "p/a.log+", "p/a.txt+", "r/b.log+", "r/c.log+"], self.names())

    def test_refused_ignore_files_are_told_of(self):
        self.write("a.txt")
        large, foreign = f"{self.docs}/.indexignore", f"{self.docs}/b/.indexignore"
        write(large, "*.txt\n" + "#" * 65536)
        write(f"{self.docs}/link", "*.txt\n")
        os.makedirs(f"{self.docs}/b")
        os.link(f"{self.docs}/link", foreign)
        self.assertIn("a.txt+", self.names())
        refused = {entry["path"]: entry["reason"] for entry in self.instance.share_status("docs")["refused_patterns"]}
        self.assertEqual({large: "it is larger than 64 KiB", foreign: "it has further names (hard links)"}, refused)
        self.assertIn(b"larger than 64 KiB", self.instance.run("unread", "docs").stdout)
        write(large, "*.txt\n")
        self.assertNotIn("a.txt+", self.names())
        self.assertEqual([foreign], [entry["path"] for entry in self.instance.share_status("docs")["refused_patterns"]])

    def test_patterns_of_the_administrator_survive_kills_and_renames(self):
        self.write("p/a.txt", "p/a.log", "p/b.log", "p/node_modules/i.js", "c.log")
        self.assertEqual(["c.log+", "p/a.log+", "p/a.txt+", "p/b.log+"], self.names())
        self.instance.kill("fileindexd")
        write(f"{self.docs}/p/.indexignore", "!a.log\n!node_modules\nb.log\n")
        self.instance.ctl("folder", "set", "/docs", "--exclude", "*.log", "--exclude-content", "*.txt")
        self.instance.ctl("up")
        self.assertEqual(["p/.indexignore+", "p/a.txt"], self.names())
        self.assertIn(b"left out: *.log", self.instance.ctl("folder", "list"))

        self.instance.ctl("share", "rename", "docs", "papers")
        self.docs = self.instance.shares["papers"] = os.path.dirname(self.docs) + "/papers"
        del self.instance.shares["docs"]
        write(f"{self.docs}/d.log", "more")
        self.instance.sync()
        shown = self.instance.run("show", f"{self.docs}/d.log")
        self.assertIn('"*.log" (folder set of', shown.stderr.decode())

        self.instance.ctl("folder", "set", "/papers", "--no-exclude", "--exclude", "!node_modules/")
        self.instance.kill("fileindexd")
        self.instance.ctl("up")
        self.instance.sync()
        found = {os.path.basename(path) for path in self.instance.documents("papers", self.docs)}
        self.assertTrue({b"i.js", b"a.log", b"d.log"} <= found, found)
        self.assertNotIn(b"b.log", found)

        write(f"{self.instance.root}/etc/kova/kova.json", json.dumps({"exclusions": {"exclude": ["/c.log"]}}))
        self.assertIn(b"/c.log", self.instance.ctl("config", "show"))
        wait_for(lambda: f"{self.docs}/c.log".encode() not in self.instance.documents("papers", self.docs), "c.log to go")


if __name__ == "__main__":
    unittest.main()
