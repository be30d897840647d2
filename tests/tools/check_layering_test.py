"""The layering check: a small tree laid out like the real one passes, and each kind of
include that points up the module order (or into an example's forbidden headers) fails,
naming the file, the line and the rule."""

import contextlib
import io
import os
import runpy
import subprocess
import sys
import tempfile
import unittest

SCRIPT = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..", "tools", "check-layering")
check_layering = runpy.run_path(SCRIPT)["main"]

# One or two files per module, each including what its module may, in the ways the real
# tree does: from an include root, beside the including file, through a private folder,
# generated headers that are not on disk, and the merge interface from below merge.
CLEAN = {
    "zero/include/foundation/core/except/message.h": "",
    "zero/src/foundation/message.cpp": '#include "foundation/core/except/message.h"\n',
    "zero/include/qf/zero/core/value.h": '#include "foundation/core/except/message.h"\n#include <string>\n',
    "zero/include/qf/zero/core/internal/element_impl.h": '#include "qf/zero/core/value.h"\n',
    "zero/src/core/transaction_state.h": "",
    "zero/src/core/value.cpp": '#include "qf/zero/core/value.h"\n#include "core/transaction_state.h"\n',
    "zero/include/qf/zero/io/packet.h": '#include "qf/zero/core/value.h"\n',
    "zero/src/io/codec.h": "",
    "zero/src/io/owned_thread.h": "",
    "zero/src/io/packet.cpp": '#include "qf/zero/io/packet.h"\n#include "codec.h"\n#include "io/owned_thread.h"\n',
    "kiv/include/kiv/messages/messages.h": '#include "foundation/core/except/message.h"\n',
    "kiv/include/kiv/merge/merge_strategy.h": '#include "kiv/metamodel/commit.h"\n',
    "kiv/include/kiv/merge/merge_tool.h": '#include "kiv/metamodel/delta.h"\n',
    "kiv/include/kiv/merge/three_way.h": '#include "kiv/merge/merge_tool.h"\n',
    "kiv/src/history/history_support.h": '#include "kiv/metamodel/commit_impl.h"\n',
    "kiv/src/history/commit.cpp": (
        '#include "kiv/metamodel/commit_impl.h"\n'
        '\n'
        '#include "history/history_support.h"\n'
        '#include "kiv/merge/merge_strategy.h"\n'
        '#include "kiv/messages/messages.h"\n'
        '#include "qf/zero/io/packet.h"\n'
        '/* Not an include:\n'
        '#include "kiv/metamodel/repository_impl.h"\n'
        '*/\n'
    ),
    "kiv/src/history/dependency.cpp": '#include "kiv/metamodel/dependency_impl.h"\n#include "kiv/metamodel/repository.h"\n',
    "kiv/src/merge/three_way.cpp": '#include "kiv/merge/three_way.h"\n#include "kiv/metamodel/commit_impl.h"\n',
    "kiv/src/workspace/workspace_support.h": "",
    "kiv/src/repository/repository.cpp": (
        '#include "kiv/metamodel/repository_impl.h"\n'
        '#include "kiv/merge/three_way.h"\n'
        '#include "workspace/workspace_support.h"\n'
    ),
    "zero/include/qf/zero/zero.h": '#include "qf/zero/io/packet.h"\n',
    "kiv/include/kiv/kiv.h": (
        '#include "qf/zero/zero.h"\n'
        '#include "kiv/merge/three_way.h"\n'
        '#include "kiv/metamodel/repository_impl.h"\n'
    ),
    "examples/demo/main.cpp": '#include "kiv/metamodel/commit.h"\n#include "qf/zero/io/packet.h"\n',
    "examples/demo/internal_notes.h": "",
    "examples/demo/notes.cpp": '#include "internal_notes.h"\n',
}


def run(files):
    """Writes a tree from CLEAN with files changed; returns the check's exit code and output."""
    tree = dict(CLEAN)
    tree.update(files)
    with tempfile.TemporaryDirectory() as root:
        for path, text in tree.items():
            full = os.path.join(root, path)
            os.makedirs(os.path.dirname(full), exist_ok=True)
            with open(full, "w", encoding="utf-8") as f:
                f.write(text)
        out = io.StringIO()
        with contextlib.redirect_stdout(out), contextlib.redirect_stderr(io.StringIO()):
            code = check_layering(["--root", root])
    return code, out.getvalue()


def appended(path, line):
    return {path: CLEAN[path] + line + "\n"}


class Layering(unittest.TestCase):
    def test_a_tree_that_keeps_the_order_passes(self):
        self.assertEqual(run({}), (0, ""))

    def test_each_include_against_the_order_fails_naming_file_line_and_rule(self):
        upward = "upward include"
        cases = [
            # (what, changed files, reported location, fragments of the reason)
            ("foundation reaches into core",
             appended("zero/src/foundation/message.cpp", '#include "qf/zero/core/value.h"'),
             'zero/src/foundation/message.cpp:2: #include "qf/zero/core/value.h"',
             [upward, "qf::zero foundation may not include qf::zero core"]),
            ("core reaches into a private header of io",
             appended("zero/src/core/value.cpp", '#include "io/owned_thread.h"'),
             'zero/src/core/value.cpp:3: #include "io/owned_thread.h"',
             [upward, "qf::zero core may not include qf::zero io"]),
            ("the framework names kiv, even through the merge interface",
             appended("zero/src/io/packet.cpp", '#include "kiv/merge/merge_strategy.h"'),
             'zero/src/io/packet.cpp:4: #include "kiv/merge/merge_strategy.h"',
             ["qf::zero includes kiv"]),
            ("history includes the implementation header of a repository class",
             appended("kiv/src/history/dependency.cpp", '#include "kiv/metamodel/repository_impl.h"'),
             'kiv/src/history/dependency.cpp:3: #include "kiv/metamodel/repository_impl.h"',
             [upward, "kiv history may not include kiv repository", "implementation header"]),
            ("messages include a generated handle",
             appended("kiv/include/kiv/messages/messages.h", '#include "kiv/metamodel/commit.h"'),
             'kiv/include/kiv/messages/messages.h:2: #include "kiv/metamodel/commit.h"',
             [upward, "kiv messages may not include kiv metamodel"]),
            ("history includes a merge header beyond the merge interface",
             appended("kiv/src/history/commit.cpp", '#include "kiv/merge/three_way.h"'),
             'kiv/src/history/commit.cpp:10: #include "kiv/merge/three_way.h"',
             [upward, "kiv history may not include kiv merge"]),
            ("workspace includes a private header of repository",
             {"kiv/src/repository/repository_support.h": "",
              "kiv/src/workspace/workspace.cpp": '#include "repository/repository_support.h"\n'},
             'kiv/src/workspace/workspace.cpp:1: #include "repository/repository_support.h"',
             [upward, "kiv workspace may not include kiv repository"]),
            ("an example includes an internal header",
             appended("examples/demo/main.cpp", '#include "qf/zero/core/internal/element_impl.h"'),
             'examples/demo/main.cpp:3: #include "qf/zero/core/internal/element_impl.h"',
             ["internal header in an example"]),
            ("a module includes its library's umbrella header",
             appended("kiv/src/repository/repository.cpp", '#include "kiv/kiv.h"'),
             'kiv/src/repository/repository.cpp:4: #include "kiv/kiv.h"',
             [upward, "kiv repository may not include the kiv umbrella header"]),
            ("a source outside every module",
             {"kiv/src/tools/dump.cpp": '#include "kiv/messages/messages.h"\n'},
             'kiv/src/tools/dump.cpp:1: #include "kiv/messages/messages.h"',
             ["file outside every module"]),
        ]
        for what, files, where, fragments in cases:
            with self.subTest(what):
                code, out = run(files)
                self.assertEqual(code, 1)
                lines = out.splitlines()
                self.assertEqual(len(lines), 1, out)
                self.assertTrue(lines[0].startswith(where + ": "), lines[0])
                for fragment in fragments:
                    self.assertIn(fragment, lines[0])

    def test_every_offence_is_reported_not_only_the_first(self):
        files = appended("zero/src/foundation/message.cpp", '#include "qf/zero/io/packet.h"')
        files.update(appended("kiv/src/history/history_support.h", '#include "kiv/metamodel/repository_impl.h"'))
        code, out = run(files)
        self.assertEqual(code, 1)
        self.assertEqual(len(out.splitlines()), 2, out)

    def test_the_command_line_prints_each_offence_and_exits_1(self):
        with tempfile.TemporaryDirectory() as root:
            path = os.path.join(root, "kiv", "src", "messages", "messages.cpp")
            os.makedirs(os.path.dirname(path))
            with open(path, "w", encoding="utf-8") as f:
                f.write('#include "kiv/metamodel/commit.h"\n')
            done = subprocess.run([sys.executable, SCRIPT, "--root", root], capture_output=True, text=True)
        self.assertEqual(done.returncode, 1)
        self.assertIn("kiv/src/messages/messages.cpp:1:", done.stdout)
        self.assertIn("1 include(s)", done.stderr)


if __name__ == "__main__":
    unittest.main()
