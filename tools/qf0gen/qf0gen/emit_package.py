"""The package object: item handles, initialisation in two passes, registration, invokers."""

from . import files
from .cpp import by_value, ns_close, ns_open, package_getter, typeref, u16
from .description import KINDS, FrameworkType

QZ = "qf::zero"
META = "qf::zero::meta"


def _items(d):
    """(handle type, accessor, member) of every item the package keeps."""
    out = [(f"{META}::Package", f"get{(p.name[:1].upper() + p.name[1:]) or 'Root'}Package", f"{p.ident}Package_")
           for p in d.packages]
    for t in d.types.values():
        handle = {"class": "Class", "enum": "Enum", "datatype": "DataType", "primitive": "PrimitiveType"}[t.kind]
        out.append((f"{META}::{handle}", package_getter(t), f"{t.name}_"))
        if t.kind == "enum":
            out += [(f"{META}::EnumLiteral", f"get{t.name}_{lit}", f"{t.name}_{lit}_") for lit, _ in t.literals]
        for p in getattr(t, "properties", []):
            out.append((f"{META}::Property", package_getter(p), f"{t.name}_{p.name}_"))
        for op in getattr(t, "operations", []) if t.kind == "class" else []:
            out.append((f"{META}::Operation", package_getter(op), f"{t.name}_{op.ident}_operation_"))
    return out


def header(d):
    lines = [files.banner(d) + f"// {d.meta_class}: the metamodel package, with a handle to each of its items.",
             "#pragma once", "", f'#include "{files.fwd_header(d)}"', '#include "qf/zero/core/meta/abstract_meta_package.h"',
             "", "#include <mutex>", "", ns_open(d.namespace), "",
             "// The metamodel's items (packages, types, properties, operations), built once per process;",
             "// documents and reflection find the types by qualified name once it is registered.",
             f"class {d.meta_class} final : public {META}::AbstractMetaPackage {{", " public:",
             "  // The package, built and registered on first use.",
             f"  static {d.meta_class}& getInstance();", "",
             "  // Builds the metamodel once and registers its root package, types and serializers",
             "  // unless they are registered. Raises \"NoSuchType\" when a framework type it",
             "  // needs is not registered; nothing is built then.",
             "  void initialize();",
             "  // Unregisters what initialize registered. Items and elements stay valid.",
             "  void terminate();",
             "  bool isRegistered() const;", ""]
    for handle, getter, member in _items(d):
        lines.append(f"  const {handle}& {getter}() const noexcept {{ return {member}; }}")
    lines += ["", " private:", f"  {d.meta_class}() = default;", "  void resolveFrameworkTypes();",
              "  void createItems();", "  void linkItems();", "  void installInvokers();",
              "  void registerAll();", "  void unregisterAll();", ""]
    for handle, _, member in _items(d):
        lines.append(f"  {handle} {member};")
    framework = sorted({t.name for t in _framework_types(d)})
    lines += [f"  {META}::Type framework{name}_;" for name in framework]
    lines += ["  mutable std::mutex mutex_;", "  bool built_ = false;", "  bool registered_ = false;", "};", "",
              ns_close(d.namespace), ""]
    return "\n".join(lines)


def _framework_types(d):
    """The framework types the package looks up: those its members name, and Integer,
    the underlying type of every enumeration."""
    seen = {"Integer": FrameworkType("Integer")} if d.enums else {}
    for t in d.types.values():
        for p in getattr(t, "properties", []):
            if p.type.package is None:
                seen[p.type.name] = p.type
        for op in getattr(t, "operations", []):
            refs = [a.type for a in op.args] + ([op.result] if op.result else [])
            for r in refs:
                if r.type is not None and r.type.package is None:
                    seen[r.type.name] = r.type
    return list(seen.values())


def _type_member(t):
    return f"framework{t.name}_" if t.package is None else f"{t.name}_"


def source(d):
    n = d.meta_class
    impl_headers = [f'#include "{files.impl_header_of(d, c)}"' for c in d.classes]
    lines = [files.banner(d) + f'#include "{files.package_header(d)}"', "", *impl_headers,
             *[f'#include "{files.header(d, e)}"' for e in d.enums],
             *[f'#include "{files.header(d, t)}"' for t in d.datatypes],
             '#include "qf/zero/core/messages.h"', '#include "qf/zero/core/meta/meta_registry.h"',
             '#include "qf/zero/core/meta/builtin_property_serializers.h"', '#include "qf/zero/core/meta/opaque_value_traits.h"',
             '#include "qf/zero/core/primitive_collection.h"', '#include "qf/zero/core/report_exception.h"', "",
             ns_open(d.namespace), "", f"using {META}::ValueFlags;", "",
             "// Never destroyed: elements may outlive every other static object, and their",
             "// classes must stay valid until the very end.",
             f"{n}& {n}::getInstance() {{", f"  static {n}* const instance = new {n}();",
             "  // Built and registered once, on first use; past that, the guard of a local static is",
             "  // one load, where a once flag costs a call on every look-up of a property.",
             "  static const bool initialized = (instance->initialize(), true);", "  (void)initialized;",
             "  return *instance;", "}", "",
             f"void {n}::initialize() {{", "  std::lock_guard lock(mutex_);", "  if (!built_) {",
             "    resolveFrameworkTypes();", "    createItems();", "    linkItems();", "    installInvokers();",
             "    built_ = true;", "  }", "  if (!registered_) {", "    registerAll();", "    registered_ = true;",
             "  }", "}", "",
             f"void {n}::terminate() {{", "  std::lock_guard lock(mutex_);", "  if (!registered_) return;",
             "  unregisterAll();", "  registered_ = false;", "}", "",
             f"bool {n}::isRegistered() const {{", "  std::lock_guard lock(mutex_);", "  return registered_;", "}", ""]
    lines += _resolve(d) + _create(d) + _link(d) + _register(d)
    lines += [ns_close(d.namespace), ""]
    return "\n".join(lines)


def _resolve(d):
    lines = [f"void {d.meta_class}::resolveFrameworkTypes() {{",
             f"  const auto& registry = {META}::MetaRegistry::getInstance();",
             f"  auto lookUp = [&](std::u16string_view name) {{",
             f"    {META}::Type type = registry.getType(name);",
             "    if (!type) qf::zero::reportException(qf0::messages::NoSuchType(std::u16string(name)));",
             "    return type;", "  };"]
    for t in sorted(_framework_types(d), key=lambda t: t.name):
        lines.append(f"  {_type_member(t)} = lookUp({u16(t.name)});")
    lines += ["}", ""]
    return lines


def _uuid(d, key):
    return f'"{d.item_uuid(key)}"'


def _create(d):
    lines = [f"void {d.meta_class}::createItems() {{"]
    for p in d.packages:
        lines.append(f"  {p.ident}Package_ = createPackage({u16(p.uri)}, {u16(p.name)}, {_uuid(d, p.uri)});")
        for uri in p.imports:
            lines.append(f"  {p.ident}Package_->getImportedPackageURIsMutable().push_back({u16(uri)});")
        if p.parent:
            lines.append(f"  {p.ident}Package_->setParentPackage({p.parent.ident}Package_);")
    for p in d.packages:
        for cls in p.classes:
            lines += _create_structured(d, cls, f"createClass({u16(cls.name)}, {u16(cls.qualified_name)}, "
                                                f"{'true' if cls.is_abstract else 'false'}, {_uuid(d, cls.qualified_name)})")
        for t in p.primitives:
            traits = (f"std::make_shared<{META}::OpaqueValueTraits<{t.cpp}>>()" if t.value_traits else "nullptr")
            lines += [f"  {t.name}_ = createPrimitiveType({u16(t.name)}, {u16(t.registered_name)}, {traits}, "
                      f"{_uuid(d, t.qualified_name)});", f"  {p.ident}Package_->addType({t.name}_);"]
        for e in p.enums:
            lines += [f"  {e.name}_ = createEnum({u16(e.name)}, {u16(e.qualified_name)}, {_uuid(d, e.qualified_name)});",
                      f"  {p.ident}Package_->addType({e.name}_);"]
            for lit, value in e.literals:
                lines += [f"  {e.name}_{lit}_ = createEnumLiteral({u16(lit)}, {value}, "
                          f"{_uuid(d, e.qualified_name + '.' + lit)});", f"  {e.name}_->addLiteral({e.name}_{lit}_);"]
        for t in p.datatypes:
            lines += _create_structured(d, t, f"createDataType({u16(t.name)}, {u16(t.qualified_name)}, "
                                              f"{_uuid(d, t.qualified_name)})")
    lines += ["}", ""]
    return lines


def _create_structured(d, t, creation):
    lines = [f"  {t.name}_ = {creation};", f"  {t.package.ident}Package_->addType({t.name}_);"]
    for p in t.properties:
        m = f"{t.name}_{p.name}_"
        lines += [f"  {m} = createProperty({u16(p.name)}, ValueFlags({KINDS[p.kind]}), "
                  f"{'true' if p.composite else 'false'}, {_uuid(d, p.qualified_name)});",
                  f"  setPropertyIndex({m}, {p.index});"]
        flags = [("setIsUnique", p.unique), ("setIsReadOnly", p.read_only), ("setIsSetOnce", p.set_once),
                 ("setIsTransient", p.transient)]
        for setter, value in flags:
            if value:
                lines.append(f"  {m}->{setter}(true);")
        if not p.public_accessor:
            lines.append(f"  {m}->setIsPublicAccessor(false);")
        if not p.public_mutator:
            lines.append(f"  {m}->setIsPublicMutator(false);")
        if p.default is not None:
            lines.append(f"  {m}->setDefaultValue({u16(p.default)});")
        lines.append(f"  {t.name}_->addProperty({m});")
    if t.kind != "class":
        return lines
    for op in t.operations:
        m = f"{t.name}_{op.ident}_operation_"
        key = f"{t.qualified_name}.{op.signature}"
        lines.append(f"  {m} = createOperation({u16(op.name)}, {_uuid(d, key)});")
        if op.is_abstract:
            lines.append(f"  {m}->setIsAbstract(true);")
        if op.is_static:
            lines.append(f"  {m}->setIsStatic(true);")
        for a in op.args:
            lines.append(f"  {{\n    {META}::Argument argument = createArgument({u16(a.name)}, "
                         f"{_uuid(d, key + '.' + a.name)});")
            if a.direction == "out":
                lines.append("    argument->setIsInput(false);")
            lines.append(f"    {m}->addArgument(argument);\n  }}")
        lines.append(f"  {t.name}_->addOperation({m});")
    return lines


def _bounds(target, many, optional):
    lower, upper = (0, -1) if many else ((0, 1) if optional else (1, 1))
    return [f"  {target}->setLower({lower});", f"  {target}->setUpper({upper});"]


def _link(d):
    lines = [f"void {d.meta_class}::linkItems() {{"]
    for cls in d.classes:
        sup = f"{cls.superclass.name}_" if cls.superclass else f"{QZ}::ModelElement::metaClass()"
        lines.append(f"  {cls.name}_->setSuperclass({sup});")
    for t in d.classes + d.datatypes:
        for p in t.properties:
            m = f"{t.name}_{p.name}_"
            lines.append(f"  {m}->setType({_type_member(p.type)});")
            lines += _bounds(m, p.many, p.kind == "optional")
            if p.ordered:
                lines.append(f"  {m}->setIsOrdered(true);")
            if p.opposite is not None:
                lines.append(f"  {m}->setOpposite({p.opposite.owner.name}_{p.opposite.name}_);")
            if p.key is not None:
                lines.append(f"  {m}->setQualifiedBy({p.key.owner.name}_{p.key.name}_);")
        for op in getattr(t, "operations", []) if t.kind == "class" else []:
            m = f"{t.name}_{op.ident}_operation_"
            if op.result is not None and op.result.type is not None:
                lines.append(f"  {m}->setType({_type_member(op.result.type)});")
                lines += _bounds(m, op.result.many, True)
            for i, a in enumerate(op.args):
                if a.type.type is not None:
                    lines.append(f"  {m}->getArguments()[{i}]->setType({_type_member(a.type.type)});")
                    if a.type.many:
                        lines.append(f"  {m}->getArguments()[{i}]->setUpper(-1);")
    for e in d.enums:
        lines.append(f"  {e.name}_->setUnderlyingType(frameworkInteger_);")
    lines += ["}", ""]
    return lines


def _register(d):
    n = d.meta_class
    lines = [f"void {n}::registerAll() {{", f"  auto& registry = {META}::MetaRegistry::getInstance();",
             f"  auto& serializers = {META}::PropertySerializerRegistry::getInstance();"]
    for cls in d.classes:
        if not cls.is_abstract:
            lines.append(f"  registry.registerType({cls.name}_, {{}}, [](const {QZ}::Model& model) {{\n"
                         f"    return std::make_unique<{cls.cpp}::Builder>(model);\n  }});")
    for t in d.datatypes:
        lines += [f"  registry.registerType({t.name}_, []({QZ}::ModelElement::Impl* owner, const {META}::Property& property)",
                  f"      -> std::unique_ptr<{QZ}::AbstractOwnedCollection> {{",
                  f"",
                  f"    if (property->isSequence()) return std::make_unique<{QZ}::PrimitiveSequence<{t.cpp}>>(owner, property);",
                  f"    return std::make_unique<{QZ}::PrimitiveSet<{t.cpp}>>(owner, property);", "  });",
                  f"  serializers.registerDatatypeSerializer({t.name}_, std::make_unique<{t.cpp}DatatypeSerializer>());"]
    for e in d.enums:
        lines.append(f"  serializers.registerPropertySerializer({e.name}_, "
                     f"std::make_unique<{META}::DefaultPropertySerializer<{e.cpp}>>({e.name}_));")
    for t in d.primitives:
        if t.serializer == "transient":
            lines.append(f"  serializers.registerPropertySerializer({t.name}_, "
                         f"std::make_unique<{META}::TransientOnlyPropertySerializer<{t.cpp}>>());")
    lines += [f"  registerRootPackage({d.root.ident}Package_);", "}", "", f"void {n}::unregisterAll() {{",
              f"  auto& serializers = {META}::PropertySerializerRegistry::getInstance();"]
    for t in d.datatypes + d.enums + [p for p in d.primitives if p.serializer]:
        lines.append(f"  serializers.unregister({t.name}_);")
    lines += [f"  unregisterRootPackage({u16(d.root.uri)});", "}", ""]
    return lines


def invokers_source(d):
    n = d.meta_class
    lines = [files.banner(d) + f'#include "{files.package_header(d)}"', "",
             *[f'#include "{files.impl_header_of(d, c)}"' for c in d.classes],
             '#include "qf/zero/core/meta/invoker_support.h"', "", "#include <nlohmann/json.hpp>", "",
             ns_open(d.namespace), "",
             f"namespace invoker = {META}::invoker;", "",
             f"void {n}::installInvokers() {{"]
    for cls in d.classes:
        for op in cls.operations:
            if op.has_invoker:
                lines += _invoker(cls, op)
    lines += ["}", "", ns_close(d.namespace), ""]
    return "\n".join(lines)


def _invoker(cls, op):
    m = f"{cls.name}_{op.ident}_operation_"
    body = []
    call_args = []
    for i, a in enumerate(op.args):
        t = typeref(a.type)
        if a.direction == "out":
            body.append(f"auto {a.name} = invoker::argument<{t}>(arguments[{i}]);")
            call_args.append(a.name)
        else:
            call_args.append(f"invoker::argument<{t}>(arguments[{i}])")
    if op.is_static:
        body.insert(0, "(void)element;")
        call = f"{cls.cpp}::Impl::{op.name}({', '.join(call_args)})"
    else:
        body.insert(0, f"auto& self = invoker::target<{cls.cpp}::Impl>(element, {u16(op.name)});")
        call = f"self.{op.name}({', '.join(call_args)})"
    outs = [f"arguments[{i}] = invoker::result({a.name});" for i, a in enumerate(op.args) if a.direction == "out"]
    if op.result is None:
        body += [f"{call};", *outs, "return {};"]
    elif outs:
        body += [f"auto result = {call};", *outs, "return invoker::result(std::move(result));"]
    else:
        body.append(f"return invoker::result({call});")
    if not op.args:
        params = f"{QZ}::ModelElement::Impl& element, std::vector<{QZ}::Value>&"
    else:
        params = f"{QZ}::ModelElement::Impl& element, std::vector<{QZ}::Value>& arguments"
    return [f"  setInvoker({m}, std::make_unique<{META}::FunctionInvoker>([]({params}) -> {QZ}::Value {{",
            *[f"    {b}" for b in body], "  }));"]
