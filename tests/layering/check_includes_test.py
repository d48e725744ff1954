#!/usr/bin/env python3
"""Shows that the layering check finds what it is there to find."""
import pathlib
import tempfile
import unittest

import check_includes


class CheckIncludesTest(unittest.TestCase):
    def problems_of(self, file, line):
        with tempfile.TemporaryDirectory() as tree:
            path = pathlib.Path(tree) / "src" / file
            path.parent.mkdir(parents=True)
            path.write_text(line + "\n", encoding="utf-8")
            return check_includes.check(tree)

    def test_lower_layer_may_not_include_a_higher_one(self):
        self.assertEqual(len(self.problems_of("base/A.cpp", '#include "session/KVSessionManager.h"')), 1)

    def test_logic_may_not_include_an_adapter(self):
        self.assertEqual(len(self.problems_of("session/A.cpp", '#include "platform/linux/files/ReadFile.h"')), 1)

    def test_only_the_entry_may_include_an_adapter(self):
        self.assertEqual(self.problems_of("daemon/main.cpp", '#include "platform/linux/files/ReadFile.h"'), [])
        self.assertEqual(len(self.problems_of("daemon/A.cpp", '#include "platform/linux/files/ReadFile.h"')), 1)

    def test_third_party_header_in_the_logic_is_found(self):
        self.assertEqual(len(self.problems_of("support/A.cpp", "#include <nlohmann/json.hpp>")), 1)
        self.assertEqual(len(self.problems_of("base/A.h", "#include <xcb/xcb.h>")), 1)

    def test_third_party_header_in_an_adapter_is_fine(self):
        self.assertEqual(self.problems_of("platform/linux/x/A.cpp", "#include <nlohmann/json.hpp>"), [])

    def test_standard_and_system_headers_are_fine(self):
        self.assertEqual(self.problems_of("base/A.cpp", "#include <vector>\n#include <sys/mman.h>"), [])

    def test_file_outside_every_layer_is_found(self):
        self.assertEqual(len(self.problems_of("misc/A.cpp", "")), 1)


if __name__ == "__main__":
    unittest.main()
