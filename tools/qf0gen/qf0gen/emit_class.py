"""Per class: the handle header, the implementation header and the typed accessors."""

from . import files
from .cpp import (by_value, collection_alias, collection_type, default_initializer, getter_return, handle_base,
                  impl_base, map_key_properties, member, member_type, ns_close, ns_open, op_call_args, op_params,
                  package_getter, param, result_decl, u16)

QZ = "qf::zero"


def _pkg(d):
    return f"::{d.namespace}::{d.meta_class}::getInstance()"


def _referenced_classes(cls):
    """The generated classes a class's properties and operations name, itself excluded."""
    types = [p.type for p in cls.properties]
    for op in cls.operations + cls.overrides:
        types += [a.type.type for a in op.args] + ([op.result.type] if op.result else [])
    refs = []
    for t in types:
        if t is not None and t.kind == "class" and t.package is not None and t is not cls and t not in refs:
            refs.append(t)
    return refs


def json_include(cls):
    """The whole of nlohmann's header, for a source whose class passes JSON values by value."""
    types = [p.type for p in cls.properties]
    for op in cls.operations + cls.overrides:
        types += [a.type.type for a in op.args] + ([op.result.type] if op.result else [])
    return ["#include <nlohmann/json.hpp>"] if any(t is not None and t.cpp == "qf::zero::JsonValue"
                                                   for t in types) else []


def referenced_impl_includes(d, cls):
    return [f'#include "{files.impl_header_of(d, t)}"' for t in _referenced_classes(cls)]


def _type_includes(d, cls, for_impl):
    """Headers for the types a class's members or operations name."""
    includes = set()
    member_types = [p.type for p in cls.properties]
    types = list(member_types)
    for op in cls.operations:
        types += [a.type.type for a in op.args if a.type.type] + ([op.result.type] if op.result and op.result.type else [])
    for t in types:
        if t.kind == "primitive" and hasattr(t, "includes"):
            includes.update(t.includes)
        if t.kind == "enum" or (for_impl and t.kind == "datatype"):
            includes.add(f'"{files.header(d, t)}"')
        if for_impl and any(q.type is t and q.held_as_text for q in cls.properties):
            includes.add('"qf/zero/core/json_text.h"')
        if for_impl and t.cpp == "qf::zero::JsonValue":
            # A member needs the whole type; a declaration of an operation does not.
            includes.add("<nlohmann/json.hpp>" if t in member_types else "<nlohmann/json_fwd.hpp>")
        if for_impl and t.cpp == "qf::zero::DateTime":
            includes.add("<boost/date_time/posix_time/ptime.hpp>")
        if t.cpp == "qf::zero::Model":
            includes.add('"qf/zero/core/model.h"')
    return includes


def doc_comment(doc, indent=""):
    """The description's documentation of an item as comment lines, one per line written."""
    if not doc:
        return []
    # A documented member stands apart from the one before it.
    return [""] * bool(indent) + [f"{indent}//{' ' + line if line else ''}" for line in doc.split("\n")]


def _operation_decl(op, in_handle):
    params = op_params(op)
    if op.is_static:
        return f"static {result_decl(op)} {op.name}({params});"
    if in_handle:
        return f"{result_decl(op)} {op.name}({params}) const;"
    const = " const" if op.is_const else ""
    base = _overridden(op)
    if base is not None:
        return f"{result_decl(op)} {op.name}({params}){const} override;"
    if op.is_abstract:
        return f"virtual {result_decl(op)} {op.name}({params}){const} = 0;"
    if op.is_virtual:
        return f"virtual {result_decl(op)} {op.name}({params}){const};"
    return f"{result_decl(op)} {op.name}({params}){const};"


def _overridden(op):
    """The virtual operation of a superclass that `op` overrides, if any."""
    cls = op.owner
    if cls.kind != "class" or cls.superclass is None:
        return None
    for base in cls.superclass.all_operations():
        if base.is_virtual and base.name == op.name and base.signature == op.signature:
            return base
    return None


# ---- the handle ------------------------------------------------------------------------------


def handle_header(d, cls):
    ns = cls.package.namespace
    includes = sorted(_type_includes(d, cls, False))
    base_include = (f'"{files.handle_header_of(d, cls.superclass)}"' if cls.superclass
                    else '"qf/zero/core/model_element.h"')
    lines = [files.banner(d) + f"// {cls.name}: the handle of elements of class \"{cls.qualified_name}\".",
             "#pragma once", "", f'#include "{files.fwd_header(d)}"', f"#include {base_include}",
             '#include "qf/zero/core/meta/framework_package.h"', '#include "qf/zero/core/primitive_collection.h"',
             '#include "qf/zero/core/query.h"', '#include "qf/zero/core/reference_collection.h"']
    lines += [f"#include {i}" for i in includes if i.startswith('"')]
    lines += ["", "#include <boost/optional.hpp>", "", "#include <map>", "#include <memory>", "#include <string>",
              "#include <unordered_set>", "#include <vector>"]
    standard = ["<map>", "<memory>", "<string>", "<unordered_set>", "<vector>"]
    lines += [f"#include {i}" for i in includes if i.startswith("<") and i not in standard]
    lines += ["", ns_open(ns), ""] + doc_comment(cls.doc)
    lines += [f"class {cls.name} : public {handle_base(cls)} {{",
              f"  QF_ZERO_HANDLE({cls.name}, {handle_base(cls)})", "  class Builder;", "  class Constrainables;", ""]
    if not cls.is_abstract:
        lines.append(f"  static {cls.name} create(const {QZ}::Model& model, const {QZ}::Uuid& id = {{}});")
    lines.append(f"  static {QZ}::meta::Class metaClass();")
    readable = [p for p in cls.properties if p.public_accessor]
    if readable:
        lines.append("")
    for p in readable:
        lines += doc_comment(p.doc, "  ")
        lines.append(f"  {getter_return(p, True)} get{p.cap}() const;")
    if cls.operations:
        lines.append("")
    for op in cls.operations:
        lines += doc_comment(op.doc, "  ")
        lines.append(f"  {_operation_decl(op, True)}")
    base_constrainables = f"{handle_base(cls)}::Constrainables"
    lines += ["};", "",
              f"// The instances of {cls.name} (and, by default, of its subclasses) in a query.",
              f"class {cls.name}::Constrainables : public {base_constrainables} {{", " public:",
              f"  explicit Constrainables({QZ}::query::AbstractQuery& query,",
              f"                          {QZ}::query::SearchClassMatchMode mode =",
              f"                              {QZ}::query::SearchClassMatchMode::IncludeSubclasses);",
              f"  Constrainables({QZ}::query::AbstractQuery& query, {QZ}::meta::Class metaClass,",
              f"                 {QZ}::query::SearchClassMatchMode mode);",
              f"  std::vector<{cls.name}> getTypedInstances() const;", "};", "", ns_close(ns), "",
              "template <>",
              f"struct std::hash<{cls.cpp}> : std::hash<{QZ}::ModelElement> {{}};", ""]
    return "\n".join(line for i, line in enumerate(lines) if line or i == 0 or lines[i - 1])


# ---- the implementation ---------------------------------------------------------------------


def impl_header(d, cls):
    ns = cls.package.namespace
    base_include = (f'"{files.impl_header_of(d, cls.superclass)}"' if cls.superclass
                    else '"qf/zero/core/internal/element_impl.h"')
    includes = sorted(_type_includes(d, cls, True))
    if "<nlohmann/json.hpp>" in includes and "<nlohmann/json_fwd.hpp>" in includes:
        includes.remove("<nlohmann/json_fwd.hpp>")
    lines = [files.banner(d) + f"// {cls.name}::Impl: the state of a \"{cls.qualified_name}\" element: typed getters,",
             "// setters and mutable collections, the operations (implemented by hand), and the builders.",
             "// The old-value storage of change tracking is internal (internal/..._storage.h).", "#pragma once", "",
             f'#include "{files.handle_header_of(d, cls)}"', f"#include {base_include}"]
    lines += [f'#include "{files.handle_header_of(d, t)}"' for t in _referenced_classes(cls)]
    lines += [f'#include "{files.package_header(d)}"', '#include "qf/zero/core/builder.h"',
              '#include "qf/zero/core/proxy_id.h"']
    lines += [f"#include {i}" for i in includes if i.startswith('"')]
    lines += [""] + [f"#include {i}" for i in includes if i.startswith("<")]
    lines += ["", ns_open(ns), ""]
    lines += _impl_class(d, cls) + [""] + _builder_base(d, cls)
    if not cls.is_abstract:
        lines += [""] + _builder(cls)
    lines += ["", ns_close(ns), ""]
    return "\n".join(lines)


def _impl_class(d, cls):
    lines = [f"// What a {cls.name} handle's -> reaches: typed getters and setters, mutable collections",
             "// and the operations. Changes are checked, and recorded for change reports and rollback.",
             f"class {cls.name}::Impl : public {impl_base(cls)} {{", " public:", "  class Storage;",
             "  template <class B>", "  class BuilderBase;"]
    if not cls.is_abstract:
        lines.append(f"  using BuilderImpl = {cls.name}::Builder;")
    for p in cls.properties:
        if p.many:
            lines.append(f"  using {collection_alias(p)} = {collection_type(p)};")
    lines += ["", "  Impl();", "  ~Impl() override;", f"  {QZ}::meta::Class getMetaClass() const override;"]
    for p in cls.properties:
        lines.append("")
        if p.many:
            lines += [f"  {getter_return(p)} get{p.cap}() const noexcept {{ return {member(p)}; }}",
                      f"  // Raises \"CannotModifyProxy\" on a proxy.",
                      f"  {collection_alias(p)}& get{p.cap}Mutable();"]
        else:
            lines += [f"  {getter_return(p)} get{p.cap}() const;", f"  void set{p.cap}({param(p)} value);"]
            if p.held_as_text:
                lines += [f"  // set{p.cap} with the value given as its text, which is not parsed again.",
                          f"  void set{p.cap}Text({QZ}::JsonText text);"]
    if cls.operations or cls.overrides:
        lines += ["", "  // Operations."]
    for op in cls.operations:
        lines.append(f"  {_operation_decl(op, False)}")
    for op in cls.overrides:
        const = " const" if op.is_const else ""
        lines.append(f"  {result_decl(op)} {op.name}({op_params(op)}){const} override;")
    if cls.declarations:
        lines += [""] + [f"  {decl}" for decl in cls.declarations]
    root = cls.superclass is None
    lines += ["", "  // The property with index `index` (inherited ones included); null when there is none.",
              f"  {QZ}::meta::Property propertyForSlot(int index) const override;",
              "  // Drops the outgoing references this element holds without owning them.",
              f"  {'virtual ' if root else ''}void convertReferencesToProxies(bool keepProxyIds, "
              f"boost::optional<{QZ}::ProxyId>& proxyId){' override' if not root else ''};"]
    raw = [p for p in cls.properties if not p.many]
    lines += ["", " protected:",
              "  // Reflection and change tracking, for the framework: reached through the element base.",
              f"  {QZ}::Value basicGetValue(const {QZ}::meta::Property& property) const override;",
              f"  void basicSetValue(const {QZ}::meta::Property& property, const {QZ}::Value& value) override;",
              f"  {QZ}::AbstractOwnedCollection* basicGetCollection(const {QZ}::meta::Property& property) const override;",
              *([f"  const {QZ}::JsonText* basicGetHeldText(const {QZ}::meta::Property& property) const override;",
                 f"  bool assignHeldText(const {QZ}::meta::Property& property, {QZ}::JsonText text, bool initializing) override;"]
                if any(p.held_as_text for p in raw) else []),
              *([f"  {QZ}::MapKey basicGetMapKey(const {QZ}::meta::Property& property) const override;"]
                if map_key_properties(cls) else []),
              f"  std::unique_ptr<{QZ}::ModelElement::Impl::Storage> createStorage() const override;",
              f"  void copyValue({QZ}::ModelElement::Impl::Storage* storage, int index) const override;",
              f"  void restoreFromStorage({QZ}::ModelElement::Impl::Storage* storage, bool collections) override;"]
    if raw:
        lines += ["  // Raw stores for reflection and rollback: no checks, no change tracking, no opposite."]
        lines += [f"  void basicSet{p.cap}({param(p)} value);" for p in raw]
    if cls.properties:
        lines += ["", " private:"]
        for p in raw:
            if p.held_as_text:
                lines.append(f"  void assign{p.cap}Text({QZ}::JsonText text, bool initializing);")
        for p in cls.properties:
            init = default_initializer(p)
            if p.many:
                lines.append(f"  {member_type(p)} {member(p)};")
            else:
                lines.append(f"  {member_type(p)} {member(p)}{{{init}}};")
    lines.append("};")
    return lines


def storage_header(d, cls):
    base_include = (f'"{files.storage_header_of(d, cls.superclass)}"' if cls.superclass
                    else '"qf/zero/core/internal/storage.h"')
    ns = cls.package.namespace
    lines = [files.banner(d) + f"// {cls.name}::Impl::Storage: internal to the generated code; users never include it.",
             "#pragma once", "", f'#include "{files.impl_header_of(d, cls)}"', f"#include {base_include}", "",
             ns_open(ns), ""] + _storage_class(cls) + ["", ns_close(ns), ""]
    return "\n".join(lines)


def _single(cls):
    return [p for p in cls.properties if not p.many]


def _storage_class(cls):
    base = f"{cls.superclass.cpp}::Impl::Storage" if cls.superclass else f"{QZ}::ModelElement::Impl::Storage"
    lines = [f"// The old values of a {cls.name} in one transaction: typed slots for its single-valued",
             "// properties; collections and inherited properties are kept by the base.",
             f"class {cls.name}::Impl::Storage : public {base} {{", " public:",
             f"  using {base}::Storage;",
             f"  {QZ}::Value getOldValue(const {QZ}::meta::Property& property,",
             f"                          {QZ}::AccessTag tag = {QZ}::AccessTag::Default) const override;",
             f"  void revertUnchanged({QZ}::ModelElement::Impl* element) override;",
             f"  void mergeInto({QZ}::ModelElement::Impl::Storage& outer) override;"]
    if _single(cls):
        lines += ["", " private:", f"  friend class {cls.name}::Impl;"]
        lines += [f"  {member_type(p)} {member(p)}{{}};" for p in _single(cls)]
    lines.append("};")
    return lines


def _builder_value(p, value="value"):
    if p.is_reference:
        return f"{QZ}::Value::createElementValue({value}, property)"
    return f"{QZ}::Value::createPrimitiveValue(property, {value})"


def _builder_base(d, cls):
    base = (f"{cls.superclass.cpp}::Impl::BuilderBase<B>" if cls.superclass else f"{QZ}::ModelElement::Builder")
    count = len(cls.all_properties())
    lines = [f"// The builder operations of {cls.name}, shared by the builders of its subclasses.",
             "template <class B>", f"class {cls.name}::Impl::BuilderBase : public {base} {{", " public:",
             f"  explicit BuilderBase(const {QZ}::Model& model, int count = {count}) : {base}(model, count) {{}}"]
    for p in cls.properties:
        getter = f"{_pkg(d)}.{package_getter(p)}()"
        head = f"    const auto& property = {getter};"
        tail = ["    return static_cast<B&>(*this);", "  }"]
        if p.many:
            vt = p.type.cpp
            pt = vt if by_value(p.type) else f"const {vt}&"
            lines += [f"  B& doAdd{p.cap}({pt} value) {{", head,
                      f"    this->setOrAdd(property, {_builder_value(p)});", *tail]
            if not p.is_reference:
                lines += [f"  B& doAdd{p.cap}(std::initializer_list<{vt}> values) {{", head,
                          "    for (const auto& value : values) "
                          f"this->setOrAdd(property, {_builder_value(p)});", *tail]
            lines += [f"  B& doClear{p.cap}() {{", head,
                      f"    this->setOrAdd(property, {QZ}::Value::list({{}}, property));", *tail]
        else:
            value = _builder_value(p)
            if p.kind == "optional" and not p.is_reference:
                value = f"value ? {_builder_value(p, '*value')} : {QZ}::Value()"
            lines += [f"  B& doSet{p.cap}({param(p)} value) {{", head, f"    this->setOrAdd(property, {value});", *tail]
        if p.is_containment:
            verb = "Add" if p.many else "Set"
            lines += [f"  // The {p.type.name} is created inside this element, in the same step.",
                      f"  B& do{verb}{p.cap}(std::unique_ptr<{QZ}::ModelElement::Builder> child) {{", head,
                      "    this->setOrAdd(property, std::move(child));", *tail]
    lines.append("};")
    return lines


def _builder(cls):
    return [f"// Collects the values of a new {cls.name}, then creates it with all of them at once.",
            f"class {cls.name}::Builder : public {cls.name}::Impl::BuilderBase<{cls.name}::Builder> {{", " public:",
            f"  explicit Builder(const {QZ}::Model& model = {{}})",
            f"      : {cls.name}::Impl::BuilderBase<{cls.name}::Builder>(model) {{}}",
            f"  {QZ}::IntrusivePtr<{QZ}::ModelElement::Impl> instantiate() override;",
            f"  // Creates the element with its values in one transaction (see ModelElement::Builder).",
            f"  {cls.name} create(const {QZ}::Uuid& id = {{}});", "};"]


# ---- typed accessors ----------------------------------------------------------------------------


def access_source(d, cls):
    ns = cls.package.namespace
    n = cls.name
    pkg = _pkg(d)
    lines = [files.banner(d) + f'#include "{files.impl_header_of(d, cls)}"', "",
             *referenced_impl_includes(d, cls), '#include "qf/zero/core/model_impl.h"', *json_include(cls), "",
             ns_open(ns), ""]
    lines += [f"{QZ}::meta::Class {n}::metaClass() {{ return {pkg}.{package_getter(cls)}(); }}", ""]
    if not cls.is_abstract:
        lines += [f"{n} {n}::create(const {QZ}::Model& model, const {QZ}::Uuid& id) {{",
                  f"  return Builder(model).create(id);", "}", "",
                  f"{QZ}::IntrusivePtr<{QZ}::ModelElement::Impl> {n}::Builder::instantiate() {{",
                  f"  return {QZ}::IntrusivePtr<{QZ}::ModelElement::Impl>(new {n}::Impl());", "}", "",
                  f"{n} {n}::Builder::create(const {QZ}::Uuid& id) {{",
                  f"  return {n}({QZ}::ModelElement::Builder::create(id).getImpl());", "}", ""]
    for p in cls.properties:
        if p.public_accessor:
            lines.append(f"{getter_return(p, True)} {n}::get{p.cap}() const {{ return getImpl()->get{p.cap}(); }}")
    for op in cls.operations:
        call = f"{op.name}({op_call_args(op)})"
        ret = "return " if op.result else ""
        if op.is_static:
            lines.append(f"{result_decl(op)} {n}::{op.name}({op_params(op)}) {{ {ret}{n}::Impl::{call}; }}")
        else:
            lines.append(f"{result_decl(op)} {n}::{op.name}({op_params(op)}) const {{ {ret}getImpl()->{call}; }}")
    lines += ["", f"{n}::Constrainables::Constrainables({QZ}::query::AbstractQuery& query,",
              f"                                  {QZ}::query::SearchClassMatchMode mode)",
              f"    : Constrainables(query, {n}::metaClass(), mode) {{}}", "",
              f"{n}::Constrainables::Constrainables({QZ}::query::AbstractQuery& query, {QZ}::meta::Class metaClass,",
              f"                                  {QZ}::query::SearchClassMatchMode mode)",
              f"    : {handle_base(cls)}::Constrainables(query, std::move(metaClass), mode) {{}}", "",
              f"std::vector<{n}> {n}::Constrainables::getTypedInstances() const {{",
              f"  std::vector<{n}> result;",
              f"  for (const {QZ}::ModelElement& element : getInstances()) result.push_back({QZ}::elementCast<{n}>(element));",
              "  return result;", "}", ""]
    lines += [f"{n}::Impl::Impl()"]
    inits = [f"{member(p)}(this, {pkg}.{package_getter(p)}())" for p in cls.properties if p.many]
    if inits:
        lines[-1] += "\n    : " + ",\n      ".join(inits)
    lines[-1] += " {}"
    lines += [f"{n}::Impl::~Impl() = default;", "",
              f"{QZ}::meta::Class {n}::Impl::getMetaClass() const {{ return {pkg}.{package_getter(cls)}(); }}", ""]
    for p in cls.properties:
        lines += _accessors(d, cls, p)
    lines += [ns_close(ns), ""]
    return "\n".join(lines)


def _accessors(d, cls, p):
    n = cls.name
    m = member(p)
    getter = f"{_pkg(d)}.{package_getter(p)}()"
    if p.many:
        return [f"{n}::Impl::{collection_alias(p)}& {n}::Impl::get{p.cap}Mutable() {{", "  checkNotProxy();",
                f"  return {m};", "}", ""]
    lines = []
    if p.is_reference:
        lines += [f"{getter_return(p)} {n}::Impl::get{p.cap}() const {{",
                  f"  return {m}.isProxy() ? {QZ}::elementCast<{p.type.cpp}>(residentOf({m})) : {m};", "}"]
    elif p.held_as_text:
        lines += [f"{getter_return(p)} {n}::Impl::get{p.cap}() const {{ return {m}.parse(); }}"]
    else:
        lines += [f"{getter_return(p)} {n}::Impl::get{p.cap}() const {{ return {m}; }}"]
    if p.is_reference:
        value = f"{QZ}::Value::createElementValue(value, property)"
    elif p.kind == "optional":
        value = f"value ? {QZ}::Value::createPrimitiveValue(property, *value) : {QZ}::Value()"
    else:
        value = f"{QZ}::Value::createPrimitiveValue(property, value)"
    if p.held_as_text:
        text_value = f"{QZ}::Value::createPrimitiveValue(property, text.parse())"
        lines += ["", f"void {n}::Impl::set{p.cap}({param(p)} value) {{ set{p.cap}Text({QZ}::JsonText(value)); }}", "",
                  f"void {n}::Impl::set{p.cap}Text({QZ}::JsonText text) {{ assign{p.cap}Text(std::move(text), false); }}",
                  "", f"void {n}::Impl::assign{p.cap}Text({QZ}::JsonText text, bool initializing) {{", "  checkNotProxy();",
                  f"  if ({m} == text) return;", f"  const auto& property = {getter};",
                  "  if (!canStoreDirectly(property, initializing)) {",
                  f"    assignValue(property, {text_value}, initializing);", "    return;", "  }", f"  {QZ}::Transaction transaction = beginDirectStore(property);",
                  f"  {m} = std::move(text);", "  transaction.commit();", "}", "",
                  f"void {n}::Impl::basicSet{p.cap}({param(p)} value) {{", f"  {m} = {QZ}::JsonText(value);", "}", ""]
        return lines
    lines += ["", f"void {n}::Impl::set{p.cap}({param(p)} value) {{", "  checkNotProxy();",
              f"  if ({m} == value) return;", f"  const auto& property = {getter};"]
    if p.is_reference or p.kind == "optional":
        lines += [f"  assignValue(property, {value}, false);", "}", ""]
    else:
        # The typed value needs no Value wrapper, unless a check of assignValue's needs it.
        lines += ["  if (!canStoreDirectly(property)) {", f"    assignValue(property, {value}, false);",
                  "    return;", "  }", f"  {QZ}::Transaction transaction = beginDirectStore(property);",
                  f"  {m} = value;", "  transaction.commit();", "}", ""]
    lines += [f"void {n}::Impl::basicSet{p.cap}({param(p)} value) {{"]
    if p.is_reference and not p.is_containment:
        lines += [f"  relinkIncoming({m}, value, {getter});"]
    lines += [f"  {m} = value;", "}", ""]
    return lines
