"""What one ordinary user may use of the engine: counts of refusals, without times. Needs root."""

import os
import select
import signal
import sys
import unittest

from instance import InstanceTestCase, wait_for, write

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "rights"))

from asking import Child, Engine, User, parse, request  # noqa: E402

ANN = User(50001, [50001])
USER_BUSY = 1414


@unittest.skipUnless(os.geteuid() == 0, "takes on other users; needs root")
class LimitsTest(InstanceTestCase):
    def setUp(self):
        super().setUp()
        os.chmod(self.instance.root, 0o755)
        self.ctl("up")
        write(f"{self.instance.root}/vol/docs/a.txt", "lantern")
        self.ctl("share", "add", f"{self.instance.root}/vol/docs")
        wait_for(lambda: self.instance.search("lantern"), "the file")
        self.socket = f"{self.instance.root}/var/run/kovaelasticd.sock"
        os.chmod(self.socket, 0o666)

    def ask_at_once(self, count, told):
        """The codes of those that are answered at once, and how many others there are; then `told` is written to. How many
        of the others are answered in the end, with what there was time to look at."""
        body = request("search", {"shares": ["docs"], "query": "lantern"})
        engines = [Engine(self.socket) for _ in range(count)]
        for engine in engines:
            engine.send(body)
        waiting, codes = list(engines), []
        while ready := select.select([engine.socket for engine in waiting], [], [], 60 if len(codes) < 6 else 0.3)[0]:
            for engine in [engine for engine in waiting if engine.socket in ready]:
                waiting.remove(engine)
                codes.append(parse(engine.receive_or_nothing())["error"]["code"])
        os.write(told, b".")
        return codes, len(waiting), sum(parse(engine.receive_or_nothing())["success"] for engine in waiting)

    def test_a_user_has_ten_requests_in_sixteen_connections_and_root_is_answered(self):
        os.kill(self.instance.pid("kova-access"), signal.SIGSTOP)  # requests of users wait for it
        done, told = os.pipe()
        child = Child(ANN, lambda: self.ask_at_once(16, told))
        self.assertEqual(1, len(self.instance.search("lantern")))
        os.read(done, 1)
        os.kill(self.instance.pid("kova-access"), signal.SIGCONT)
        self.assertEqual(([USER_BUSY] * 6, 10, 10), child.result())

    def test_long_requests_and_further_connections_are_ended(self):
        def use_up():
            long_one = Engine(self.socket)
            long_one.send(request("search", {"query": "a" * 70000}))
            engines = [Engine(self.socket) for _ in range(40)]
            ping = [engine for engine in engines if engine.answers(request("ping", {}))]
            return long_one.receive_or_nothing(), len(ping)

        self.assertEqual((b"", 16), Child(ANN, use_up).result())
        self.assertEqual(1, len(self.instance.search("lantern")))


if __name__ == "__main__":
    unittest.main()
