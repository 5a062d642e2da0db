# SPDX-License-Identifier: GPL-2.0-or-later
"""How much the tests do: what fits into a quarter of an hour, or all."""

import os

IS_LONG = os.environ.get("FILEINDEXD_TEST_SCALE") == "long"
