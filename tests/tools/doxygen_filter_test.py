"""The filter through which Doxygen reads the headers: which // comments become documentation
and which stay plain comments, the file's opening comment, code examples and markup in prose,
and that no header gains or loses a line (Doxygen's warnings would name wrong lines)."""

import glob
import os
import runpy
import unittest

ROOT = os.path.normpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
filter_lines = runpy.run_path(os.path.join(ROOT, "tools", "doxygen-filter"))["filter_lines"]


def run(text):
    return "\n".join(filter_lines(text.split("\n")))


class WhatBecomesDocumentation(unittest.TestCase):
    def test_comments_above_declarations_of_namespaces_classes_and_enums(self):
        source = """#pragma once

namespace a {

// A thing.
template <class T>
class Thing : public Base<std::function<void()>> {
 public:
  // Makes one.
  Thing();

  // Sums.
  int sum() const {
    // Not documentation: inside a body.
    int total = 0;
    return total;
  }

  // Stays: a blank line follows.

  // Stays: an access specifier follows.
 private:
  int x_;
};

enum class Kind {
  // The first.
  First,
  // The second, after a comma.
  Second,
};

const std::map<int, int> table = {
    // Stays: inside an initialiser.
    {1, 2},
};

inline int twice(int x) {
  // Stays: inside an inline function.
  return 2 * x;
}

// Documents the macro.
#define A_MACRO 1
// Stays: an include follows.
#include "b.h"
// Stays: a macro invocation follows, which Doxygen does not see.
FOUNDATION_MESSAGE(catalog, Refused)

}  // namespace a"""
        out = run(source)
        for documented in ("/// A thing.", "  /// Makes one.", "  /// Sums.", "  /// The first.",
                           "  /// The second, after a comma.", "/// Documents the macro."):
            self.assertIn(documented + "\n", out)
        for plain in ("    // Not documentation: inside a body.", "  // Stays: a blank line follows.",
                      "  // Stays: an access specifier follows.", "    // Stays: inside an initialiser.",
                      "  // Stays: inside an inline function.",
                      "// Stays: an include follows.", "// Stays: a macro invocation follows"):
            self.assertIn(plain, out)
            self.assertNotIn("/" + plain.strip(), out)

    def test_a_declaration_spanning_lines_keeps_its_inner_comments(self):
        out = run("void f(int a,\n       // the second\n       int b);\n// Next.\nvoid g();")
        self.assertIn("       // the second", out)
        self.assertIn("/// Next.", out)

    def test_existing_documentation_and_block_comments_pass_unchanged(self):
        source = "int a;\n/// Already.\nint b;\n//! Qt style.\nint c;\n/* a { brace\n   // in a block */\nint d;"
        self.assertEqual(run(source), source)


class FileCommentAndCode(unittest.TestCase):
    def test_the_opening_comment_documents_the_file_and_its_examples_are_code(self):
        out = run("""// Transaction: a scope.
//
//   {
//     Transaction t = model->beginTransaction();
//   }
//
// Savepoints:
//  - a list item whose
//    continuation is indented, not code.
#pragma once""").split("\n")
        self.assertEqual(out[0], "/// Transaction: a scope.")
        self.assertEqual(out[2], "/// \\code{.cpp} {")
        self.assertEqual(out[3], "///    Transaction t = model->beginTransaction();")
        self.assertEqual(out[4], "///  } \\endcode")
        self.assertEqual(out[8], "///    continuation is indented, not code. \\file")
        self.assertEqual(out[9], "#pragma once")

    def test_placeholders_in_prose_are_literal_but_not_in_code_or_backquotes(self):
        out = run("// Writes <build>/x and `<name>`; see \\ref.\n//\n//   f(<arg>);\nint f();")
        self.assertIn("/// Writes \\<build>/x and `<name>`; see \\\\ref.", out)
        self.assertIn("f(<arg>); \\endcode", out)


class RealHeaders(unittest.TestCase):
    def test_every_public_header_keeps_its_lines(self):
        headers = glob.glob(os.path.join(ROOT, "zero", "include", "**", "*.h"), recursive=True)
        headers += glob.glob(os.path.join(ROOT, "kiv", "include", "**", "*.h"), recursive=True)
        self.assertGreater(len(headers), 50)
        converted = 0
        for path in headers:
            with open(path, encoding="utf-8") as f:
                lines = f.read().split("\n")
            out = filter_lines(lines)
            with self.subTest(header=os.path.relpath(path, ROOT)):
                self.assertEqual(len(out), len(lines))
                self.assertFalse(any(line.lstrip().startswith("////") for line in out))
                # Only comment lines change.
                for before, after in zip(lines, out):
                    if before != after:
                        self.assertTrue(before.lstrip().startswith("//"), before)
            converted += sum(before != after for before, after in zip(lines, out))
        self.assertGreater(converted, 1000, "the headers' contracts no longer reach Doxygen")


if __name__ == "__main__":
    unittest.main()
