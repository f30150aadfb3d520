"""What ordinary users of an instance of root's find, and what they can learn beside it. Needs root."""

import glob
import os
import subprocess
import unittest

from instance import BIN, InstanceTestCase, wait_for, write

ANN, BOB = 50001, 50002  # no accounts: the kernel and the service go by numbers


@unittest.skipUnless(os.geteuid() == 0, "takes on other users; needs root")
class UsersTest(InstanceTestCase):
    def setUp(self):
        super().setUp()
        os.chmod(self.instance.root, 0o755)

    def as_user(self, uid, *words, groups=(), program=os.path.join(BIN, "fileindexctl")):
        return subprocess.run([program, *words], env=self.instance.env, cwd="/", capture_output=True, timeout=120,
                              check=False, user=uid, group=uid, extra_groups=list(groups))

    def test_files_of_the_service_tell_others_nothing(self):
        for folder in ("etc/kova", "var/packages/Ferrox/etc", "var/lib/kova/notifyd/queues"):
            os.makedirs(f"{self.instance.root}/{folder}")  # as an earlier version left them
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


if __name__ == "__main__":
    unittest.main()
