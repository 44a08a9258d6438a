"""The model of the queues' state machine holds, and its checks find faults.

usage: queue_model_test.py MODEL COMPILER
"""

import concurrent.futures
import os
import re
import subprocess
import sys
import tempfile
import unittest

MODEL, COMPILER = sys.argv[1:3]
del sys.argv[1:]

MEGABYTES = 2000
SECONDS = 400  # on a machine that does much else; a few without

ONE_PRODUCER = "CHILDREN=0 PRODUCER0=ROOT ITEMS0=2"

CONFIGURATIONS = {
    "one queue": "CHILDREN=0 PRODUCER0=ROOT ITEMS0=2 PRODUCER1=ROOT ITEMS1=2 SUSPENDED=ROOT",
    "one queue, sync": "CHILDREN=0 PRODUCER0=ROOT ITEMS0=2 SYNCED=ROOT SYNCS=1 SUBMITS_BEFORE SUSPENDED=ROOT",
    "one queue, two syncs": "CHILDREN=0 PRODUCER0=ROOT ITEMS0=1 SYNCED=ROOT SYNCS=2 SUSPENDED=ROOT",
    "two syncs to a child": "CHILDREN=1 PRODUCER0=ROOT ITEMS0=1 SYNCED=CHILD SYNCS=2",
    "target suspended": "CHILDREN=1 PRODUCER0=CHILD ITEMS0=2 PRODUCER1=ROOT ITEMS1=1 SUSPENDED=ROOT",
    "target suspended, sync": "CHILDREN=1 PRODUCER0=CHILD ITEMS0=1 SYNCED=CHILD SYNCS=1 SUBMITS_BEFORE SUSPENDED=ROOT",
    "two suspend": "CHILDREN=0 PRODUCER0=ROOT ITEMS0=2 SUSPENDED=ROOT SUSPENDERS=2",
    "walked": "CHILDREN=0 PRODUCER0=ROOT ITEMS0=2 PRODUCER1=ROOT ITEMS1=1 WALKED=ROOT",
    "walked, sync": "CHILDREN=0 PRODUCER0=ROOT ITEMS0=1 SYNCED=ROOT SYNCS=1 SUSPENDED=ROOT WALKED=ROOT",
    "target walked": "CHILDREN=1 PRODUCER0=CHILD ITEMS0=1 PRODUCER1=ROOT ITEMS1=1 WALKED=ROOT",
    "everything": "CHILDREN=1 PRODUCER0=ROOT ITEMS0=1 PRODUCER1=CHILD ITEMS1=1 SYNCED=CHILD SYNCS=1 SUSPENDED=CHILD",
}

FAULTS = {
    "RESUME_LEAVES_THE_QUEUE_PARKED": ONE_PRODUCER + " SUSPENDED=ROOT",
    "RESUME_LOOKS_ONCE": ONE_PRODUCER + " SUSPENDED=ROOT SUSPENDERS=2",
    "PARKS_WHATEVER_THE_COUNT": ONE_PRODUCER + " SUSPENDED=ROOT",
    "GIVES_UP_WITHOUT_COMPARING": ONE_PRODUCER,
    "EVERY_PUSH_ACTIVATES": ONE_PRODUCER,
    "OWNER_HOLDS_NO_REFERENCE": ONE_PRODUCER,
    "GRANTS_BEFORE_DETACHING": ONE_PRODUCER + " SYNCED=ROOT SYNCS=1",
    "GRANTS_TO_WHO_WAS_AWAKE": ONE_PRODUCER + " SYNCED=ROOT SYNCS=1",
    "TARGETS_SUSPENSION_WAITS_FOR_THE_CHILD": "CHILDREN=1 PRODUCER0=CHILD ITEMS0=2 SUSPENDED=ROOT",
    "SYNC_LOOKS_AT_SUSPENSION_ONCE": "CHILDREN=1 PRODUCER0=ROOT ITEMS0=1 SYNCED=CHILD SYNCS=1 SUSPENDED=CHILD",
    "NOBODY_LETS_WALK": ONE_PRODUCER + " WALKED=ROOT",
    "LEAVER_IS_WAITED_FOR": ONE_PRODUCER + " WALKED=ROOT",
}


def check(macros):
    """The checker's output for one configuration. A fault is found before optimising pays."""
    level = "-O0" if "FAULT" in macros else "-O2"
    with tempfile.TemporaryDirectory() as folder:
        def run(*command):
            done = subprocess.run(command, cwd=folder, capture_output=True, text=True, timeout=SECONDS)
            if done.returncode:
                raise RuntimeError(f"{command}: {done.stdout}{done.stderr}")
            return done.stdout

        run("spin", "-a", *(f"-D{each}" for each in macros.split()), MODEL)
        run(COMPILER, level, "-w", "-DSAFETY", f"-DMEMLIM={MEGABYTES}", "-o", "pan", "pan.c")
        return run("./pan", "-m10000")


class QueueModel(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        everything = CONFIGURATIONS | {name: f"{macros} FAULT_{name}" for name, macros in FAULTS.items()}
        with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
            cls.outputs = dict(zip(everything, pool.map(check, everything.values())))

    def test_holds(self):
        for name in CONFIGURATIONS:
            with self.subTest(name):
                output = self.outputs[name]
                self.assertIn("errors: 0\n", output)
                # All of it was searched.
                self.assertNotRegex(output, "max search depth too small|Search not completed")
                print(f"{name}: {re.search('[0-9]+ states, stored', output)[0]}")

    def test_finds_faults(self):
        for name in FAULTS:
            with self.subTest(name):
                self.assertIn("errors: 1\n", self.outputs[name])


if __name__ == "__main__":
    unittest.main()
