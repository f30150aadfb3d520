"""Every word and field that the corpus lists is found, in an instance as people have it."""

import json
import os
import shutil
import unittest
from concurrent.futures import ThreadPoolExecutor

from instance import InstanceTestCase, wait_for

CORPUS = os.environ.get("FERROX_CORPUS", "")
SHARE = "corpus"
TYPE, ERROR = "KOVAMDContentType", "_KOVAExtractError"
INDEX_SECONDS = 900


def is_as(expected, value):
    """Fields that the index has as text hold numbers as people write them."""
    if not isinstance(expected, dict):
        return value == (str(expected) if isinstance(expected, int) and isinstance(value, str) else expected)
    try:
        return expected.get("min", float("-inf")) <= float(value) <= expected.get("max", float("inf"))
    except (TypeError, ValueError):
        return False


class CorpusTest(InstanceTestCase):
    def setUp(self):
        super().setUp()
        with open(f"{CORPUS}/expected.json", encoding="utf-8") as file:
            self.files = json.load(file)["files"]
        self.ctl("up")
        self.folder = self.instance.add_share(SHARE, "--no-index")
        shutil.copytree(f"{CORPUS}/files", self.folder, dirs_exist_ok=True)
        self.ctl("folder", "add", f"/{SHARE}")
        queue = self.instance.queue_path(self.folder)
        wait_for(lambda: self.instance.share_status(SHARE)["state"] == "idle" and not os.path.exists(queue),
                 "the corpus to be indexed", INDEX_SECONDS)

    def documents(self):
        names = {name for entry in self.files for name in entry["fields"]}
        found = self.instance.entries(SHARE, self.folder, "KOVAMDPath", TYPE, ERROR, *names)
        return {document["KOVAMDPath"]: document for document in found}

    def faults_of_fields(self, entry, document):
        expected = dict(entry["fields"], **{ERROR: entry.get("error")})
        if "type" in entry:
            expected[TYPE] = entry["type"]
        return [f"{name}: expected {value!r}, got {document.get(name)!r}" for name, value in expected.items()
                if not is_as(value, document.get(name))]

    def faults_of_words(self, entry):
        path = os.fsencode(f"{self.folder}/{entry['path']}")
        return [f"word {word!r}: not found" for word in entry["words"]
                if path not in self.instance.search("--share", SHARE, word)]

    def test_everything_listed_is_found(self):
        documents = self.documents()

        def faults_of(entry):
            document = documents.get(f"{self.folder}/{entry['path']}")
            found = ["no document"] if document is None else self.faults_of_fields(entry, document)
            return [f"{entry['path']}: {fault}" for fault in found + self.faults_of_words(entry)]
        with ThreadPoolExecutor(os.cpu_count()) as threads:
            faults = [fault for found in threads.map(faults_of, self.files) for fault in found]
        self.assertTrue(self.files)
        if faults:
            self.fail(f"{len(faults)} faults in {len(self.files)} files:\n" + "\n".join(faults))


if __name__ == "__main__":
    unittest.main()
