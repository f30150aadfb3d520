"""Wrong usages of every command: the exit code, and what the message must say for somebody to know what to do next."""

import concurrent.futures
import os
import unittest

from tool_test import ToolCase

# Code, a part of standard error, the words. Shares are photo and photos; /photo/trip and "/photos/a b" are indexed.
USAGES = (
    # No command, or none of that name.
    (2, "a command is missing; for example: fileindexctl search", ""),
    (2, 'no command "serach". Did you mean: search?', "serach invoice"),
    (2, "Did you mean: search?", "find invoice"),
    (2, "Did you mean: up?", "start"),
    (2, "Did you mean: status?", "stauts"),
    (2, "Did you mean: rebuild?", "rebuid photo"),
    (2, "Did you mean: unread?", "unred"),
    (2, "Did you mean: folder add?", "foldr add /photo"),
    (2, "Did you mean: folder add or share add?", "add /photo"),
    (2, "Did you mean: folder list or share list or token list?", "list"),
    (2, "Try 'fileindexctl help'", "xyzzy"),
    (2, "one of: add, set, delete, reindex, get, list", "folder"),
    (2, 'no command "folder ad". Did you mean: folder add?', "folder ad /photo"),
    (2, "Did you mean: share rename?", "share renam photo x"),
    (2, "one of: pause, resume, forget", "volume eject /mnt"),
    (2, "one of: enable, disable", "home"),
    (2, "Did you mean: home enable?", "home enabel"),
    (2, "one of: rename", "user"),
    (2, "one of: show", "queue"),
    (2, 'no command "nonsense"', "help nonsense"),
    (2, "Did you mean: search?", "help serch"),
    (2, "Did you mean: folder set?", "help folder st"),
    # Options before the command.
    (2, "unknown option --rot. Did you mean: --root?", "--rot /x status"),
    (2, "--root needs a folder", "--root"),
    (2, "--root needs a folder", "--root= status"),
    (2, "as in: fileindexctl status --json", "--json status"),
    (2, "as in: fileindexctl search --limit", "--limit=3 search x"),
    (2, "unknown option -x", "-x"),
    (2, "unknown option --", "-- status"),
    # Options of commands.
    (2, "unknown option --limt. Did you mean: --limit?", "search --limt 3 x"),
    (2, "--limit needs a value: --limit N", "search x --limit"),
    (2, "--limit takes a number from 1 to 1000, not \"0\"", "search --limit 0 x"),
    (2, "--limit takes a number from 1 to 1000, not \"many\"", "search --limit many x"),
    (2, "not \"99999999999999999999\"", "search --limit 99999999999999999999 x"),
    (2, "--offset takes a number", "search --offset -1 x"),
    (2, "--sort takes one of: relevance|date|name|size, not \"nme\". Did you mean: name?", "search --sort nme x"),
    (2, "--json takes no value", "search --json=yes x"),
    (2, "--fresh takes a number from 0 to 600", "search --fresh=soon x"),
    (2, "--fresh takes a number from 0 to 600", "search --fresh=601 x"),
    (2, "there is no user \"no-such-user\"; give an account, or numbers", "search --as no-such-user x"),
    (2, "give the groups' numbers as well, as in 4123456789:", "search --as 4123456789 x"),
    (2, "is not the number of a group", "search --as 5001:staff x"),
    (2, "root finds everything", "search --as 0:0 x"),
    (2, "root finds everything", "show --as root /photo"),
    (2, "unknown option --jsn. Did you mean: --json?", "status --jsn"),
    (2, "unknown option -j", "status -j"),
    (2, "unknown option --nosupervisor. Did you mean: --no-supervisor?", "up --nosupervisor"),
    (2, "unknown option --wiat. Did you mean: --wait?", "index photo --wiat"),
    (2, "unknown option --force", "rebuild photo --force"),
    (2, "unknown option -kinds. Did you mean: --kinds?", "folder add -kinds all /photo"),
    (2, "a name that begins with - stands behind --", "folder add -x"),
    (2, "not \"music\"", "folder add --kinds music /photo"),
    (2, "not \"foto\". Did you mean: photo?", "folder add --kinds document,foto /photo"),
    (2, "not \"\"", "folder add --kinds document,,photo /photo"),
    (2, "--name goes with one folder", "folder add --name x /photo/tree /photos"),
    (2, "--json goes with --dry-run", "folder add --json /photo/tree"),
    (2, "--json goes with --dry-run", "share add --json /usr"),
    (2, "unknown option --dryrun. Did you mean: --dry-run?", "share add --dryrun /usr"),
    (2, "--kinds is missing: document, audio, video, photo", "folder set /photo"),
    (2, "Example: fileindexctl folder set /photo/trips --kinds document,photo", "folder set /photo"),
    (2, "--sort takes one of: path|document|audio|video|photo, not \"size\"", "folder list --sort size"),
    (2, "--limit takes a number from 0 to 1000", "folder list --limit 1001"),
    (2, "unknown option --kind", "folder list --kind all"),
    (2, "--accounts takes one of: local|domain|ldap, not \"locl\". Did you mean: local?", "home enable --accounts locl"),
    (2, "--from needs a value", "share migrate photo /x --from"),
    (2, "unknown option --text", "unread --text"),
    (2, "unknown option --jason. Did you mean: --json?", "queue show --jason x"),
    # Words that are missing, or too many.
    (2, "QUERY is missing: what to look for", "search"),
    (2, "Example: fileindexctl search invoice 2024", "search --json"),
    (2, "FILE is missing: a file", "show"),
    (2, "FILE is missing: a share's queue file", "queue show"),
    (2, "PATH is missing: a folder in a share", "folder add"),
    (2, "PATH is missing", "folder set --kinds all"),
    (2, "PATH is missing", "folder delete"),
    (2, "PATH is missing", "folder reindex"),
    (2, "PATH is missing", "folder get"),
    (2, "SHARE is missing: the name of a share; 'fileindexctl share list' shows them", "index"),
    (2, "Example: fileindexctl rebuild photo", "rebuild --wait"),
    (2, "FOLDER is missing: the folder, as it is called on this machine", "share add"),
    (2, "SHARE is missing", "share remove"),
    (2, "NEW_NAME is missing: the share's new name", "share rename photo"),
    (2, "Example: fileindexctl share rename photo pictures", "share rename photo"),
    (2, "NEW_FOLDER is missing: where the share's folder is now", "share migrate photo"),
    (2, "SHARE is missing", "share pause"),
    (2, "SHARE is missing", "share resume"),
    (2, "SHARE is missing", "share forget"),
    (2, "SHARE is missing", "share check-recycle"),
    (2, "MOUNT_POINT is missing: the folder at which the volume is mounted", "volume pause"),
    (2, "MOUNT_POINT is missing", "volume forget"),
    (2, "OLD is missing: the user's name before", "user rename"),
    (2, "NEW is missing: the user's name now", "user rename ann"),
    (2, "\"b\" is one word too many; a name with blanks in it stands in quotes", "folder get a b"),
    (2, "\"photos\" is one word too many", "index photo photos"),
    (2, "\"c\" is one word too many", "share rename a b c"),
    (2, "\"now\" is one word too many\n", "up now"),
    (2, "one word too many", "down all"),
    (2, "one word too many", "prepare x"),
    (2, "one word too many", "pause 3 hours"),
    (2, "one word too many", "resume now"),
    (2, "one word too many", "status photo photos"),
    # Words of the wrong kind.
    (2, "HOURS takes a number from 0 to 8760, not \"soon\"", "pause soon"),
    (2, "HOURS takes a number", "pause 9000"),
    (2, "the new name are the same", "share rename photo photo"),
    (2, "cannot be a share's name; give a name without \"/\"", "share rename photo a/b"),
    (2, "cannot be a user's name", "user rename ann a/b"),
    (2, "the old and the new name are the same", "user rename ann ann"),
    (2, "also give the folder where it was", "share forget gone"),
    (2, "an empty path is no folder", ["folder", "get", ""]),
    # Names that do not exist, and things that are not what they should be.
    (3, 'no share "phto". Did you mean: photo?', "index phto"),
    (3, "'fileindexctl share list' shows the shares", "rebuild nonexistent"),
    (3, "Did you mean: photo?", "status foto"),
    (3, "Did you mean: photos?", "search --share potos x"),
    (3, "Did you mean: photo?", "share remove Photo"),
    (3, "no share \"nope\"", "share pause nope"),
    (3, "no share \"nope\"", "unread nope"),
    (3, "/photo/trap is no indexed folder. Did you mean: /photo/trip?", "folder get /photo/trap"),
    (3, "/phto/trip is neither in a share nor on the disk. Did you mean: /photo/trip?", "folder get /phto/trip"),
    (3, "lies in no share; 'fileindexctl share add /etc' makes it one", "folder add /etc"),
    (3, "/photo/trip is indexed already; 'fileindexctl folder set' changes its kinds", "folder add /photo/trip"),
    (3, "cannot be indexed: there is no such folder; make it first", "folder add --dry-run /photo/none"),
    (3, "there is no such folder; make it first", "share add /nonexistent"),
    (3, "is not a folder; only a folder can be a share", "share add /etc/passwd"),
    (3, "is the system's own", "share add --no-index /proc"),
    (3, "mount --bind", "share add --no-index /usr/share --name other"),
    (3, "No such file or directory; give the path of a share's queue file", "queue show /nonexistent"),
    (3, "is no queue file", "queue show /etc/passwd"),
    (3, "does not exist, and no folder was paused with it; give a mount point", "volume pause /nonexistent"),
    (3, "is no mount point; it lies on the volume", "volume resume /usr/share"),
    (3, "no folder of share \"photos2\"", "status photos2"),
    (3, "start it with 'fileindexctl up'", "search invoice"),
    (3, "start it with 'fileindexctl up'", "show /photo/trip"),
)


class WrongUsageTest(ToolCase):
    def test_every_wrong_usage_says_what_to_do(self):
        os.makedirs(f"{self.root}/vol/photos2")
        self.write_shares("photo", "photos", "photos2")

        def run(usage):
            words = usage[2]
            return self.run_tool(*(words.split() if isinstance(words, str) else words))

        with concurrent.futures.ThreadPoolExecutor(4) as pool:
            for (code, text, words), done in zip(USAGES, pool.map(run, USAGES)):
                with self.subTest(words=words):
                    self.assertIn(text, done.stderr.decode())
                    self.assertEqual((code, b""), (done.returncode, done.stdout), done.stderr)


if __name__ == "__main__":
    unittest.main()
