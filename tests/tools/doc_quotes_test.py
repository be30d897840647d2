"""Code the documentation quotes from a source file is still in that file: a fenced block
right after a line `<!-- quoted from PATH -->` must be consecutive lines of PATH (relative
to the root; the quote may drop their common indentation), so a page cannot drift from the
program it explains."""

import os
import re
import unittest

ROOT = os.path.normpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
DOCS = os.path.join(ROOT, "docs")
QUOTE = re.compile(r"<!-- quoted from (\S+) -->\n```[a-z]*\n(.*?)```", re.S)


def quotes(text):
    """(path, code) of every quoted block of a page."""
    return [(m.group(1), m.group(2)) for m in QUOTE.finditer(text)]


def is_quoted(source, code):
    """Whether the lines of code are consecutive lines of source, all indented alike there
    (a quote may leave out the indentation of the block it comes from)."""
    lines = code.rstrip("\n").split("\n")
    src = source.split("\n")
    for start, first in enumerate(src):
        if not first.endswith(lines[0]) or first[: len(first) - len(lines[0])].strip():
            continue
        indent = first[: len(first) - len(lines[0])]
        window = src[start:start + len(lines)]
        if len(window) == len(lines) and all(s == (indent + l if l else "") or (not l and not s.strip())
                                             for s, l in zip(window, lines)):
            return True
    return False


class DocQuotes(unittest.TestCase):
    def test_a_marked_block_must_be_in_its_file(self):
        page = "<!-- quoted from a.cpp -->\n```cpp\nint x = 1;\nint y = 2;\n```\n```cpp\nnot checked\n```\n"
        self.assertEqual(quotes(page), [("a.cpp", "int x = 1;\nint y = 2;\n")])
        source = "void f() {\n  int x = 1;\n\n  int y = 2;\n}\n"
        self.assertTrue(is_quoted(source, "int x = 1;\n\nint y = 2;\n"), "indentation left out")
        self.assertTrue(is_quoted(source, "  int x = 1;\n"), "indentation kept")
        self.assertFalse(is_quoted(source, "int x = 1;\nint y = 2;\n"), "a line left out")
        self.assertFalse(is_quoted(source, "int x = 1;\n\nint y = 3;\n"), "a line changed")
        self.assertFalse(is_quoted(source, "x = 1;\n"), "part of a line")

    def test_every_quote_in_the_docs_is_current(self):
        checked = 0
        for name in sorted(os.listdir(DOCS)):
            if not name.endswith(".md"):
                continue
            with open(os.path.join(DOCS, name), encoding="utf-8") as f:
                page = f.read()
            for path, code in quotes(page):
                with self.subTest(page=name, source=path):
                    with open(os.path.join(ROOT, path), encoding="utf-8") as f:
                        source = f.read()
                    self.assertTrue(is_quoted(source, code), f"docs/{name} quotes code {path} no longer has:\n{code}")
                    checked += 1
        self.assertGreater(checked, 0, "no quoted blocks found: the marker may have changed")


if __name__ == "__main__":
    unittest.main()
