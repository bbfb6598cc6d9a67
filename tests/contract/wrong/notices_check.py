#!/usr/bin/python3
"""Runs the contract's tests on platforms that are wrong in one way each, and sees the right test fail.

    notices_check.py SAFE_PROGRAM MACHINE_PROGRAM [TEST...]"""

import os
import subprocess
import sys
import unittest

DEADLINE = 60  # seconds for one program

# What is wrong (see wrong_core.cpp), and a test that has to fail for it.
SAFE = {
    "list has a fixed capacity": "Lists.GrowFarBeyondTheirCapacity",
    "list leaves empty texts out": "Lists.AnEmptyTextIsAnEntry",
    "list answers beyond its end": "Lists.OutOfRangeIsNullAndNoMore",
    "failure without last error": "Lists.OutOfRangeIsNullAndNoMore",
    "hash tells case apart": "Hashes.TellKeysApartWithoutRegardToCase",
    "hash answers empty for missing": "Hashes.ANewOneHoldsNothing",
    "hash folds values": "Hashes.ValuesKeepTheirCase",
    "hash cuts values": "Hashes.LongKeysAndValuesAreKept",
    "hash fails to remove missing": "Hashes.RemovingAMissingKeyIsNoFailure",
    "hash removes nothing": "Hashes.RemovalsInBetweenLeaveTheOthers",
    "success sets last error": "Hashes.AnswerWhatWasSet",
    "key reader does not terminate": "KeyFiles.ALongValueIsCutAndTerminated",
    "key reader overruns": "KeyFiles.ALongValueIsCutAndTerminated",
    "key reader keeps blanks": "KeyFiles.BlanksAtTheEndsAreNoPartOfIt",
    "key reader finds the missing": "KeyFiles.WhatIsNotThereIsNoValue",
    "section loader reads all sections": "SectionFiles.AMissingSectionLoadsNothing",
    "section loader empties the hash": "SectionFiles.AMissingSectionLoadsNothing",
    "section writer has its own format": "SectionFiles.WritesEachEntryInItsFormat",
    "section writer fails with -1": "SectionFiles.WhatCannotBeWrittenAnswersZero",
    "key remover makes files": "KeyFiles.RemovingFromNoFileFailsAndMakesNone",
    "key remover removes nothing": "KeyFiles.AllOfAKeyAreRemoved",
    "temporary name is the process's": "SectionFiles.TemporaryNamesOfProcessesAndThreadsDiffer",
    "temporary name lies elsewhere": "SectionFiles.ATemporaryNameLiesBesideItsFile",
    "folder does not exist": "PlainFiles.ExistOrNot",
    "touch empties": "PlainFiles.TouchKeepsTheContentAndSetsTheTime",
    "touch leaves the time": "PlainFiles.TouchKeepsTheContentAndSetsTheTime",
    "rename copies": "PlainFiles.RenameIsOneStepForAReader",
    "rename closes the file": "SectionFiles.RewrittenUnderAnOwnNameKeepOwnerAndMode",
    "rename never fails": "PlainFiles.ARenameThatFailsLeavesBoth",
    "remove never fails": "PlainFiles.RemoveRemoves",
    "pid file of a dead process counts": "PlainFiles.APidFileOfAnotherProcess",
    "pid file of nothing is 0": "PlainFiles.APidFileThatNamesNone",
    "last error is everybody's": "LastError.IsEachThreadsOwn",
    "any number is an address": "Addresses.AreThoseOfTheSystem",
    "scopes belong to addresses": "Addresses.AreThoseOfTheSystem",
    "everything is supported": "UnknownKeys.OfSupportAreNotSupported",
}

# The same of wrong_machine.cpp.
MACHINE = {
    "lock is always free": "Locks.ShutOutOtherProcesses",
    "lock waits too long": "Locks.WaitAsLongAsTheyWereAskedTo",
    "lock does not wait": "Locks.WaitNoLongerThanTheyHaveTo",
    "unlock keeps the lock": "Locks.ShutOutOtherThreads",
    "unlock looks at the lowest byte": "Locks.TheLowestByteDoesNotCountWhenGivenBack",
    "any service is reloaded": "Services.ThatNobodyKnowsAreRefused",
    "any service is restarted": "Services.ThatNobodyKnowsAreRefused",
    "any service is enabled": "Services.ThatNobodyKnowsAreRefused",
    "DNS servers are turned round": "DnsServers.AreSetInTheirOrder",
    "DNS servers replace the list": "DnsServers.AreAppendedAlsoToAListWithoutRoom",
    "long events are refused": "Events.WithAnyTextAreWritten",
    "query says member": "InAWorkgroup.TheQueryNamesIt",
    "query needs both flags": "InAWorkgroup.TheQueryNamesIt",
    "there is always a status": "InAWorkgroup.WithoutAStatusThereIsNoReason",
    "a join leaves no status": "InAWorkgroup.AJoinOfNoDomainFailsAndSaysWhy",
    "a join never fails": "InAWorkgroup.ARecordWithoutATextIsRefused",
    "a test works without a membership": "InAWorkgroup.ThereIsNoMembershipToTest",
    "the trust switch is turned round": "TrustedDomains.AreSwitchedOnAndOff",
    "the workgroup is a domain": "InAWorkgroup.NoDomainsAreInSight",
    "nobody's users are fetched": "InAWorkgroup.NobodysUsersAreFetched",
    "the main configuration stays": "InAWorkgroup.AKeyOfTheMainConfigurationIsWrittenAndReadAgain",
    "the filter is not asked": "ScheduledTasks.AreListedWhenTheyPassTheFilter",
    "a new task has an id": "ScheduledTasks.ANewRecordHasNoId",
    "a new task keeps the old record": "ScheduledTasks.ARecordIsPreparedForANewTaskWhateverItHeld",
    "removing never fails": "ScheduledTasks.ARemovedOneIsGone",
    "a long command fails": "ScheduledTasks.ACommandIsKeptAndCutToTheBuffer",
    "any time can be": "ScheduledTasks.TimesThatCannotBeAreRefusedAndChangeNothing",
    "numbers are texts": "ScheduledTasks.ARecordKeepsItsSchedule",
    "a schedule lacks a value": "ScheduledTasks.ARecordKeepsItsSchedule",
}


def ways_in(source):
    """What a source of wrong platforms can do wrong."""
    with open(os.path.join(os.path.dirname(__file__), source), encoding="utf-8") as text:
        return {piece.partition('"')[0] for piece in text.read().split('IsWrong("')[1:]}


class Notices(unittest.TestCase):
    safe = machine = ""

    def run_test(self, program, test, wrong):
        environment = {**os.environ, "VORN_CONTRACT_MACHINE": "1", "VORN_WRONG": wrong}
        done = subprocess.run([program, f"--gtest_filter={test}"], env=environment, capture_output=True, text=True,
                              timeout=DEADLINE)
        self.assertIn("Running 1 test ", done.stdout, f"{test} is none")
        return done

    def check(self, program, table):
        for wrong, test in table.items():
            with self.subTest(wrong=wrong):
                right = self.run_test(program, test, "")
                self.assertEqual(0, right.returncode, right.stdout + right.stderr)
                done = self.run_test(program, test, wrong)
                self.assertEqual(1, done.returncode, done.stdout + done.stderr)
                self.assertIn(f"[  FAILED  ] {test}", done.stdout)

    def test_what_is_wrong_with_the_core(self):
        self.check(self.safe, SAFE)

    def test_what_is_wrong_with_the_machine(self):
        self.check(self.machine, MACHINE)

    def test_every_way_is_tried(self):
        self.assertEqual(ways_in("wrong_core.cpp"), set(SAFE))
        self.assertEqual(ways_in("wrong_machine.cpp"), set(MACHINE))


if __name__ == "__main__":
    Notices.safe, Notices.machine = sys.argv[1:3]
    unittest.main(argv=[sys.argv[0], *sys.argv[3:]])
