"""Per class: reflective access through the raw hooks, and change tracking with typed
old-value slots."""

from . import files
from .emit_class import json_include, referenced_impl_includes
from .cpp import impl_base, map_key_properties, member, member_type, ns_close, ns_open, package_getter, value_type

QZ = "qf::zero"


def _pkg(d):
    return f"::{d.namespace}::{d.meta_class}::getInstance()"


def _wrap(p, expr):
    """A Value of property p from the C++ expression `expr` of its member type."""
    if p.is_reference:
        return f"{QZ}::Value::createElementValue({expr}, property)"
    if p.kind == "optional":
        return f"{expr} ? {QZ}::Value::createPrimitiveValue(property, *{expr}) : {QZ}::Value()"
    if p.held_as_text:
        return f"{QZ}::Value::createPrimitiveValue(property, {expr}.parse())"
    return f"{QZ}::Value::createPrimitiveValue(property, {expr})"


def _map_key(p):
    m = member(p)
    if p.kind == "optional":
        return f"{m} ? {QZ}::MapKey(*{m}) : {QZ}::MapKey()"
    return f"{QZ}::MapKey({m})"


def _dispatch(d, cls, props, body, fallback):
    """A switch on the property index that checks the property's identity."""
    lines = ["  const auto index = property ? property.getIndex() : 0;", "  switch (index) {"]
    for p in props:
        lines += [f"    case {p.index}:",
                  f"      if (property == {_pkg(d)}.{package_getter(p)}()) {{", *[f"        {b}" for b in body(p)],
                  "      }", "      break;"]
    lines += ["    default:", "      break;", "  }", fallback]
    return lines


def _no_such_property(cls, call):
    if cls.superclass is not None:
        return f"  return {impl_base(cls)}::{call};"
    return (f"  reportException(qf0::messages::NoSuchProperty(getMetaClass().getQualifiedName(),\n"
            f"                                                property ? property.getName() : std::u16string()));")


def _set_from_value(p):
    """The statements of basicSetValue for one property. A value held as text is written from
    the JSON value the Value holds, without copying that value out first."""
    if p.held_as_text:
        json_type = value_type(p.type)
        return [f"if (const auto* held = value.peek<{json_type}>()) {{",
                f"  basicSet{p.cap}(*held);",
                "  return;",
                "}",
                f"basicSet{p.cap}(value.getValue<{json_type}>());", "return;"]
    return [f"basicSet{p.cap}(value.getValue<{member_type(p)}>());", "return;"]


def reflection_source(d, cls):
    ns = cls.package.namespace
    n = cls.name
    single = [p for p in cls.properties if not p.many]
    many = [p for p in cls.properties if p.many]
    base = impl_base(cls)
    storage_base = f"{cls.superclass.cpp}::Impl::Storage" if cls.superclass else f"{QZ}::ModelElement::Impl::Storage"
    lines = [files.banner(d) + f'#include "{files.storage_header_of(d, cls)}"', "",
             *referenced_impl_includes(d, cls), '#include "qf/zero/core/messages.h"',
             '#include "qf/zero/core/model_impl.h"', '#include "qf/zero/core/report_exception.h"', *json_include(cls),
             "", ns_open(ns), "",
             "using qf::zero::reportException;", ""]
    lines += [f"{QZ}::Value {n}::Impl::basicGetValue(const {QZ}::meta::Property& property) const {{"]
    lines += _dispatch(d, cls, single, lambda p: [f"return {_wrap(p, member(p))};"],
                       _no_such_property(cls, "basicGetValue(property)"))
    lines += ["}", "", f"void {n}::Impl::basicSetValue(const {QZ}::meta::Property& property, const {QZ}::Value& value) {{"]
    lines += _dispatch(d, cls, single, _set_from_value,
                       ("  (void)value;\n" if cls.superclass is None else "")
                       + _no_such_property(cls, "basicSetValue(property, value)").replace("  return ", "  "))
    held = [p for p in single if p.held_as_text]
    if held:
        lines += ["}", "", f"const {QZ}::JsonText* {n}::Impl::basicGetHeldText(const {QZ}::meta::Property& property) const {{"]
        lines += _dispatch(d, cls, held, lambda p: [f"return &{member(p)};"],
                           f"  return {base}::basicGetHeldText(property);")
        lines += ["}", "", f"bool {n}::Impl::assignHeldText(const {QZ}::meta::Property& property, {QZ}::JsonText text, "
                  "bool initializing) {"]
        lines += _dispatch(d, cls, held, lambda p: [f"assign{p.cap}Text(std::move(text), initializing);", "return true;"],
                           f"  return {base}::assignHeldText(property, std::move(text), initializing);")
    keyed = map_key_properties(cls)
    if keyed:
        lines += ["}", "", f"{QZ}::MapKey {n}::Impl::basicGetMapKey(const {QZ}::meta::Property& property) const {{"]
        lines += _dispatch(d, cls, keyed, lambda p: [f"return {_map_key(p)};"],
                           f"  return {base}::basicGetMapKey(property);")
    lines += ["}", "",
              f"{QZ}::AbstractOwnedCollection* {n}::Impl::basicGetCollection(const {QZ}::meta::Property& property) const {{"]
    lines += _dispatch(d, cls, many, lambda p: [f"return const_cast<{p.cap}Collection*>(&{member(p)});"],
                       _no_such_property(cls, "basicGetCollection(property)"))
    lines += ["}", "", f"{QZ}::meta::Property {n}::Impl::propertyForSlot(int index) const {{", "  switch (index) {"]
    for p in cls.properties:
        lines += [f"    case {p.index}:", f"      return {_pkg(d)}.{package_getter(p)}();"]
    lines += ["    default:", f"      return {base}::propertyForSlot(index);", "  }", "}", ""]
    lines += [f"std::unique_ptr<{QZ}::ModelElement::Impl::Storage> {n}::Impl::createStorage() const {{",
              "  const auto metaClass = getMetaClass();",
              "  return std::make_unique<Storage>(getUuid(), getModel(), metaClass, metaClass->getSlotCount());", "}",
              "", f"void {n}::Impl::copyValue({QZ}::ModelElement::Impl::Storage* storage, int index) const {{"]
    if single:
        lines += ["  auto* typed = static_cast<Storage*>(storage);", "  switch (index) {"]
        for p in single:
            lines += [f"    case {p.index}:", f"      typed->{member(p)} = {member(p)};", "      return;"]
        lines += ["    default:", "      break;", "  }"]
    lines += [f"  {base}::copyValue(storage, index);", "}", "",
              f"void {n}::Impl::restoreFromStorage({QZ}::ModelElement::Impl::Storage* storage, bool collections) {{"]
    if single:
        lines += ["  if (!collections) {", "    auto* typed = static_cast<Storage*>(storage);"]
        for p in single:
            if p.held_as_text:
                lines.append(f"    if (typed->isChanged({p.index})) {member(p)} = typed->{member(p)};")
            else:
                lines.append(f"    if (typed->isChanged({p.index})) basicSet{p.cap}(typed->{member(p)});")
        lines.append("  }")
    lines += [f"  {base}::restoreFromStorage(storage, collections);", "}", ""]
    lines += _convert_references(cls)
    lines += _storage(d, cls, single, storage_base)
    lines += [ns_close(ns), ""]
    return "\n".join(lines)


def _convert_references(cls):
    n = cls.name
    lines = [f"void {n}::Impl::convertReferencesToProxies(bool keepProxyIds, boost::optional<{QZ}::ProxyId>& proxyId) {{"]
    dropped = [p for p in cls.properties
               if p.is_reference and not p.is_containment and not (p.opposite and p.opposite.is_containment)]
    for p in dropped:
        if p.many:
            lines.append(f"  {member(p)}.rawClear();")
        else:
            lines.append(f"  basicSet{p.cap}({{}});")
    if cls.superclass is not None:
        lines.append(f"  {impl_base(cls)}::convertReferencesToProxies(keepProxyIds, proxyId);")
    else:
        lines += ["  (void)keepProxyIds;", "  (void)proxyId;"]
    lines += ["}", ""]
    return lines


def _storage(d, cls, single, storage_base):
    n = cls.name
    lines = [f"{QZ}::Value {n}::Impl::Storage::getOldValue(const {QZ}::meta::Property& property,",
             f"                                        {QZ}::AccessTag tag) const {{"]
    if single:
        lines.append(f"  const auto& package = {_pkg(d)};")
        for p in single:
            lines.append(f"  if (property == package.{package_getter(p)}()) return {_wrap(p, member(p))};")
    lines += [f"  return {storage_base}::getOldValue(property, tag);", "}", "",
              f"void {n}::Impl::Storage::revertUnchanged({QZ}::ModelElement::Impl* element) {{"]
    if single:
        lines.append(f"  const auto* current = static_cast<const {n}::Impl*>(element);")
        for p in single:
            lines.append(f"  if (isChanged({p.index}) && {member(p)} == current->{member(p)}) setChanged({p.index}, false);")
    lines += [f"  {storage_base}::revertUnchanged(element);", "}", "",
              f"void {n}::Impl::Storage::mergeInto({QZ}::ModelElement::Impl::Storage& outer) {{"]
    if single:
        lines.append("  auto& typed = static_cast<Storage&>(outer);")
        for p in single:
            lines += [f"  if (isChanged({p.index}) && !typed.isChanged({p.index})) {{",
                      f"    typed.{member(p)} = std::move({member(p)});", f"    typed.setChanged({p.index}, true);", "  }"]
    lines += [f"  {storage_base}::mergeInto(outer);", "}", ""]
    return lines
