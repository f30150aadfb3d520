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
#: What people type to search for a field.
QUERY_WORDS = {
    "KOVAMDTitle": "title", "KOVAMDAuthors": "author", "KOVAMDContributors": "author", "KOVAMDComposer": "composer",
    "KOVAMDAlbum": "album", "KOVAMDMusicalGenre": "genre", "KOVAMDComment": "comment", "KOVAMDDescription": "description",
    "KOVAMDKeywords": "keyword", "KOVAMDCopyright": "copyright", "KOVAMDCodecs": "codec", "KOVAMDOrganizations": "publisher",
    "KOVAMDAcquisitionMake": "camera", "KOVAMDAcquisitionModel": "camera", "KOVAMDCity": "place", "KOVAMDCountry": "place",
    "KOVAMDNamedLocation": "place", "KOVAMDPeopleDisplayName": "person", "KOVAMDAuthorAddresses": "from",
    "KOVAMDRecipients": "to", "KOVAMDRecipientAddresses": "to", "KOVAMDEncodingApplications": "program",
    "KOVAMDPixelWidth": "width", "KOVAMDPixelHeight": "height", "KOVAMDNumberOfPages": "pages", "KOVAMDISOSpeed": "iso",
    "KOVAMDAudioTrackNumber": "track", "KOVAMDRecordingYear": "year", "KOVAMDDurationSecond": "duration",
}


def is_as(expected, value):
    """Fields that the index has as text hold numbers as people write them."""
    if not isinstance(expected, dict):
        return value == (str(expected) if isinstance(expected, int) and isinstance(value, str) else expected)
    try:
        return expected.get("min", float("-inf")) <= float(value) <= expected.get("max", float("inf"))
    except (TypeError, ValueError):
        return False


def query_of(name, value):
    """The search for a field's value; nothing where it has none, or no word is for it."""
    if value is None or name not in QUERY_WORDS:
        return None
    if isinstance(value, dict):
        low, high = (f"{value[bound]:.0f}" if bound in value else "" for bound in ("min", "max"))
        value = f"{low}..{high}" if low and high else f">={low}" if low else f"<={high}"
    elif isinstance(value, str):
        value = '"' + value.replace('"', " ") + '"'
    return f"{QUERY_WORDS[name]}:{value}"


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

    def faults_of_searches(self, entry):
        path = os.fsencode(f"{self.folder}/{entry['path']}")
        queries = [query_of(name, value) for name, value in entry["fields"].items()]
        return [f"search for {query!r}: not found" for query in entry["words"] + list(filter(None, queries))
                if path not in self.instance.search("--share", SHARE, query)]

    def test_everything_listed_is_found(self):
        documents = self.documents()

        def faults_of(entry):
            document = documents.get(f"{self.folder}/{entry['path']}")
            found = ["no document"] if document is None else self.faults_of_fields(entry, document)
            return [f"{entry['path']}: {fault}" for fault in found + self.faults_of_searches(entry)]
        with ThreadPoolExecutor(os.cpu_count()) as threads:
            faults = [fault for found in threads.map(faults_of, self.files) for fault in found]
        self.assertTrue(self.files)
        if faults:
            self.fail(f"{len(faults)} faults in {len(self.files)} files:\n" + "\n".join(faults))


if __name__ == "__main__":
    unittest.main()
