"""Forward declarations, enumerations and datatypes."""

from . import files
from .cpp import member, member_type, ns_close, ns_open, op_params, param, result_decl, u16


def fwd(d):
    out = [files.banner(d), "// Forward declarations of every class, enumeration and datatype of the package,",
           "// and of the types its pointer values point to.", "#pragma once", ""]
    by_namespace = {}
    for t in list(d.types.values()):
        ns = t.package.namespace
        if t.kind in ("class", "datatype"):
            by_namespace.setdefault(ns, []).append(f"class {t.name};")
        elif t.kind == "enum":
            by_namespace.setdefault(ns, []).append(f"enum class {t.name} : int;")
    for ns, decls in d.forward_declarations.items():
        by_namespace.setdefault(ns, []).extend(decls)
    for ns, decls in by_namespace.items():
        out += [ns_open(ns)] + decls + [ns_close(ns), ""]
    return "\n".join(out)


def enum_header(d, e):
    body = ",\n".join(f"  {name} = {value}" for name, value in e.literals)
    return "\n".join([
        files.banner(d) + f"// The enumeration \"{e.qualified_name}\"; values are the literal values.",
        "#pragma once", "", ns_open(e.package.namespace), "",
        f"enum class {e.name} : int {{", body, "};", "", ns_close(e.package.namespace), ""])


def datatype_header(d, t):
    ns = t.package.namespace
    lines = [files.banner(d) + f"// The datatype \"{t.qualified_name}\": a value compared by value.", "#pragma once", "",
             f'#include "{files.fwd_header(d)}"', '#include "qf/zero/core/meta/property_serializer.h"', "",
             "#include <string>", "", ns_open(ns), "",
             "// A plain value: copies are independent, and two values are equal when all properties are.",
             f"class {t.name} {{", " public:"]
    for p in t.properties:
        getter_type = member_type(p) if p.type.cpp in ("bool", "int") else f"const {member_type(p)}&"
        lines += [f"  {getter_type} get{p.cap}() const noexcept {{ return {member(p)}; }}",
                  f"  void set{p.cap}({param(p)} value) {{ {member(p)} = value; }}"]
    for op in t.operations:
        const = " const" if op.is_const else ""
        lines.append(f"  {result_decl(op)} {op.name}({op_params(op)}){const};")
    lines += [f"  friend bool operator==(const {t.name}&, const {t.name}&) = default;", "", " private:"]
    for p in t.properties:
        init = {"bool": " = false", "int": " = 0"}.get(p.type.cpp, "")
        lines.append(f"  {member_type(p)} {member(p)}{init};")
    lines += ["};", "",
              f"// Reads and writes the properties of {t.name} values for the JSON documents;",
              "// raises \"NoSuchProperty\" for any other property.",
              f"class {t.name}DatatypeSerializer final : public qf::zero::meta::DatatypeSerializer {{",
              " public:",
              "  qf::zero::Value createDefault() const override;",
              "  qf::zero::Value getPropertyValue(const qf::zero::Value& datum,",
              "                                   const qf::zero::meta::Property& property) const override;",
              "  qf::zero::Value setPropertyValue(const qf::zero::Value& datum, const qf::zero::meta::Property& property,",
              "                                   const qf::zero::Value& value) const override;",
              "};", "", ns_close(ns), ""]
    return "\n".join(lines)


def datatype_source(d, t):
    ns = t.package.namespace
    pkg = f"{d.namespace}::{d.meta_class}::getInstance()"
    get_cases, set_cases = [], []
    for p in t.properties:
        get_cases.append(f"  if (property == package.get{t.name}_{p.name}()) "
                         f"return qf::zero::Value::createPrimitiveValue(property, typed.get{p.cap}());")
        set_cases.append(f"  if (property == package.get{t.name}_{p.name}()) {{\n"
                         f"    typed.set{p.cap}(value.getValue<{member_type(p)}>());\n"
                         f"    return qf::zero::Value::of(typed);\n  }}")
    no_such = (f"  qf::zero::reportException(qf0::messages::NoSuchProperty({u16(t.qualified_name)}, "
               "property ? property.getName() : std::u16string()));")
    return "\n".join([
        files.banner(d) + f'#include "{files.header(d, t)}"', "",
        f'#include "{files.package_header(d)}"', '#include "qf/zero/core/messages.h"',
        '#include "qf/zero/core/report_exception.h"', "", ns_open(ns), "",
        f"qf::zero::Value {t.name}DatatypeSerializer::createDefault() const {{ return qf::zero::Value::of({t.name}()); }}",
        "",
        f"qf::zero::Value {t.name}DatatypeSerializer::getPropertyValue(const qf::zero::Value& datum,",
        "                                                      const qf::zero::meta::Property& property) const {",
        f"  const auto& package = {pkg};",
        f"  const {t.name} typed = datum.getValue<{t.name}>();",
        *get_cases, no_such, "}", "",
        f"qf::zero::Value {t.name}DatatypeSerializer::setPropertyValue(const qf::zero::Value& datum,",
        "                                                      const qf::zero::meta::Property& property,",
        "                                                      const qf::zero::Value& value) const {",
        f"  const auto& package = {pkg};",
        f"  {t.name} typed = datum.getValue<{t.name}>();",
        *set_cases, no_such, "}", "", ns_close(ns), ""])
