# SPDX-License-Identifier: GPL-2.0-or-later
"""Runs the built programs in a machine of their own: private mounts, processes, log and state.

A test file is a program. By hand:

    PYTHONPATH=tests/process FILEINDEXD_BIN_DIR=build/release/bin \
        python3 tests/process/lifecycle/start_stop_test.py [-v] [Class.test]
"""

from harness import control, namespace
from harness.checks import IndexTest
from harness.batch_load import LoadTest
from harness.machine import MachineTest, main

__all__ = ["IndexTest", "LoadTest", "MachineTest", "control", "main", "namespace"]
