#!/usr/bin/env python3
"""qf0gen: generates the typed C++ classes of a qf::zero metamodel from its JSON
description.

  qf0gen.py DESCRIPTION --out DIR         writes DIR/include/... and DIR/src/...
  qf0gen.py DESCRIPTION --list            prints the files it would write
  qf0gen.py DESCRIPTION --skeleton CLASS  prints definitions of CLASS's operations,
                                          each raising "NotImplemented", to start from

Files whose content did not change are left untouched, so a rerun rebuilds nothing."""

import argparse
import os
import sys

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))

from qf0gen import description as desc  # noqa: E402
from qf0gen import emit_class, emit_package, emit_reflection, emit_types, files  # noqa: E402
from qf0gen.cpp import argument_decl, result_decl, snake  # noqa: E402


def outputs(d):
    """(relative path, text producer) of every generated file."""
    inc, src = "include/", "src/"
    out = [(inc + files.fwd_header(d), lambda: emit_types.fwd(d)),
           (inc + files.package_header(d), lambda: emit_package.header(d)),
           (src + f"{snake(d.meta_class)}.cpp", lambda: emit_package.source(d)),
           (src + f"{snake(d.meta_class)}_invokers.cpp", lambda: emit_package.invokers_source(d))]
    for e in d.enums:
        out.append((inc + files.header(d, e), lambda e=e: emit_types.enum_header(d, e)))
    for t in d.datatypes:
        out.append((inc + files.header(d, t), lambda t=t: emit_types.datatype_header(d, t)))
        out.append((src + files.source(t, "_datatype_serializer"), lambda t=t: emit_types.datatype_source(d, t)))
    for c in d.classes:
        out += [(inc + files.handle_header_of(d, c), lambda c=c: emit_class.handle_header(d, c)),
                (inc + files.impl_header_of(d, c), lambda c=c: emit_class.impl_header(d, c)),
                (inc + files.storage_header_of(d, c), lambda c=c: emit_class.storage_header(d, c)),
                (src + files.source(c, "_access"), lambda c=c: emit_class.access_source(d, c)),
                (src + files.source(c, "_reflection"), lambda c=c: emit_reflection.reflection_source(d, c))]
    return out


def write_if_changed(path, text):
    try:
        with open(path, encoding="utf-8") as f:
            if f.read() == text:
                return
    except FileNotFoundError:
        pass
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "w", encoding="utf-8") as f:
        f.write(text)


def skeleton(d, class_name):
    cls = next((c for c in d.classes if c.name == class_name), None)
    if cls is None:
        raise desc.DescriptionError(f"no class {class_name!r}")
    lines = [f'#include "{files.impl_header_of(d, cls)}"', "", '#include "qf/zero/core/messages.h"',
             '#include "qf/zero/core/report_exception.h"', "",
             f"namespace {cls.package.namespace} {{", ""]
    for op in cls.operations + cls.overrides:
        if op.is_abstract and op.owner is cls:
            continue
        const = " const" if op.is_const and not op.is_static else ""
        params = ", ".join(argument_decl(a).rsplit(" ", 1)[0] + f" /*{a.name}*/" for a in op.args)
        lines += [f"{result_decl(op)} {cls.name}::Impl::{op.name}({params}){const} {{",
                  f'  qf::zero::reportException(qf0::messages::NotImplemented(u"{cls.qualified_name}.{op.name}"));', "}", ""]
    lines.append(f"}}  // namespace {cls.package.namespace}")
    return "\n".join(lines)


def main(argv):
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("description")
    group = parser.add_mutually_exclusive_group(required=True)
    group.add_argument("--out")
    group.add_argument("--list", action="store_true")
    group.add_argument("--skeleton", metavar="CLASS")
    args = parser.parse_args(argv)
    try:
        d = desc.load(args.description)
        if args.list:
            print("\n".join(path for path, _ in outputs(d)))
        elif args.skeleton:
            print(skeleton(d, args.skeleton))
        else:
            rendered = [(path, make()) for path, make in outputs(d)]
            for path, text in rendered:
                write_if_changed(os.path.join(args.out, path), text)
    except (desc.DescriptionError, ValueError) as e:
        print(f"qf0gen: {e}", file=sys.stderr)
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
