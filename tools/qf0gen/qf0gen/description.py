"""Loads a metamodel description, checks it, and resolves every name in it.

Errors name the offending item ("class Branch, property tip: unknown type 'Comit'")
and stop the generator before it writes anything."""

import json
import os
import uuid

KINDS = {"optional": 0, "single": 1, "sequence": 2, "set": 4, "map": 6}

# The framework's own types, looked up by name when the package is initialised.
FRAMEWORK_TYPES = {
    "String": ("std::u16string", "primitive"),
    "Boolean": ("bool", "primitive"),
    "Integer": ("int", "primitive"),
    "UUID": ("qf::zero::Uuid", "primitive"),
    "DateTime": ("qf::zero::DateTime", "primitive"),
    "JsonValue": ("qf::zero::JsonValue", "primitive"),
    "HxArray": ("qf::zero::HxArray", "primitive"),
    "Model": ("qf::zero::Model", "model"),
    "ModelElement": ("qf::zero::ModelElement", "class"),
}


class DescriptionError(Exception):
    pass


def _fail(where, message):
    raise DescriptionError(f"{where}: {message}")


def _check_keys(where, data, allowed):
    unknown = sorted(set(data) - set(allowed))
    if unknown:
        _fail(where, f"unknown field(s) {', '.join(unknown)}")


def _doc(where, data):
    """A documentation text: one string, or a list of lines (JSON has no multi-line strings)."""
    doc = data.get("doc", "")
    if isinstance(doc, list) and all(isinstance(line, str) for line in doc):
        return "\n".join(doc)
    if not isinstance(doc, str):
        _fail(where, "doc is a string or a list of strings")
    return doc


def _named(kind, position, item):
    """Where a type is described: by its name, or by its position when it has none."""
    if not item.get("name"):
        _fail(f"{kind} {position + 1}", "needs a name")
    return f"{kind} {item['name']}"


class Package:
    def __init__(self, data, where):
        _check_keys(where, data, {"name", "uri", "parent", "imports", "namespace", "folder"})
        self.name = data.get("name", "")
        self.uri = data.get("uri") or _fail(where, "a package needs a uri")
        self.parent_name = data.get("parent")
        self.parent = None
        self.imports = data.get("imports", [])
        self.namespace = data.get("namespace")
        self.folder = data.get("folder", "")
        self.classes, self.enums, self.datatypes, self.primitives = [], [], [], []
        self.subpackages = []

    @property
    def qualified_name(self):
        prefix = self.parent.qualified_name if self.parent else ""
        if not prefix:
            return self.name
        return f"{prefix}.{self.name}" if self.name else prefix

    @property
    def ident(self):
        return self.qualified_name.replace(".", "_") or "Root"


class Type:
    """Common part of every named type: classes, enumerations, datatypes, primitives."""

    kind = None

    def __init__(self, name, package):
        self.name = name
        self.package = package

    @property
    def qualified_name(self):
        prefix = self.package.qualified_name if self.package else ""
        return f"{prefix}.{self.name}" if prefix else self.name

    @property
    def registered_name(self):
        return self.qualified_name

    @property
    def cpp(self):
        return f"::{self.package.namespace}::{self.name}"

    @property
    def ident(self):
        return self.name


class FrameworkType(Type):
    def __init__(self, name):
        super().__init__(name, None)
        self.cpp_type, self.kind = FRAMEWORK_TYPES[name]

    @property
    def cpp(self):
        return self.cpp_type


class PrimitiveType(Type):
    kind = "primitive"

    def __init__(self, data, package, where):
        _check_keys(where, data, {"name", "package", "cpp", "registeredAs", "valueTraits", "serializer", "includes"})
        super().__init__(data["name"], package)
        self.cpp_type = data.get("cpp") or _fail(where, "a primitive type needs its C++ type ('cpp')")
        self.registered_as = data.get("registeredAs", "qualified")
        if self.registered_as not in ("qualified", "bare"):
            _fail(where, "registeredAs is 'qualified' or 'bare'")
        self.value_traits = data.get("valueTraits", False)
        self.serializer = data.get("serializer")
        if self.serializer not in (None, "transient"):
            _fail(where, "the only primitive serializer is 'transient'")
        self.includes = data.get("includes", [])

    @property
    def registered_name(self):
        return self.qualified_name if self.registered_as == "qualified" else self.name

    @property
    def cpp(self):
        return self.cpp_type


class Enum(Type):
    kind = "enum"

    def __init__(self, data, package, where):
        _check_keys(where, data, {"name", "package", "literals"})
        super().__init__(data["name"], package)
        self.literals = []
        for literal in data.get("literals") or _fail(where, "an enumeration needs literals"):
            if not (isinstance(literal, list) and len(literal) == 2 and isinstance(literal[1], int)):
                _fail(where, f"a literal is [name, value], not {literal!r}")
            self.literals.append((literal[0], literal[1]))


class TypeRef:
    """The type of an operation argument or result: a type, maybe many or optional,
    or a verbatim C++ type."""

    def __init__(self, data, where, resolve):
        if isinstance(data, str):
            data = {"type": data}
        _check_keys(where, data, {"type", "many", "optional", "cpp"})
        self.cpp_override = data.get("cpp")
        self.type = resolve(data["type"], where) if "type" in data else None
        if self.type is None and self.cpp_override is None:
            _fail(where, "needs a type or a cpp type")
        self.many = data.get("many", False)
        self.optional = data.get("optional", False)

    @property
    def signature(self):
        name = self.type.name if self.type else self.cpp_override
        return name + ("[]" if self.many else "") + ("?" if self.optional else "")


class Argument:
    def __init__(self, data, where, resolve):
        _check_keys(where, data, {"name", "type", "many", "optional", "cpp", "direction"})
        self.name = data.get("name") or _fail(where, "an argument needs a name")
        self.type = TypeRef({k: v for k, v in data.items() if k in ("type", "many", "optional", "cpp")},
                            where, resolve)
        self.direction = data.get("direction", "in")
        if self.direction not in ("in", "out"):
            _fail(where, "direction is 'in' or 'out'")


class Operation:
    def __init__(self, data, owner, where, resolve):
        self.owner = owner
        self.name = data.get("name") or _fail(where, "an operation needs a name")
        where = f"{where}, operation {self.name}"
        _check_keys(where, data, {"name", "args", "result", "const", "static", "virtual", "abstract", "invoker",
                                  "doc"})
        self.doc = _doc(where, data)
        self.args = [Argument(a, f"{where}, argument {i + 1}", resolve) for i, a in enumerate(data.get("args", []))]
        self.result = TypeRef(data["result"], f"{where}, result", resolve) if data.get("result") else None
        self.is_const = data.get("const", False)
        self.is_static = data.get("static", False)
        self.is_abstract = data.get("abstract", False)
        self.is_virtual = data.get("virtual", False) or self.is_abstract
        self.has_invoker = data.get("invoker", True)
        if self.is_static and (self.is_const or self.is_virtual):
            _fail(where, "a static operation is neither const nor virtual")
        self.ordinal = 1  # among the owner's operations of the same name

    @property
    def signature(self):
        return f"{self.name}({','.join(a.type.signature for a in self.args)})"

    @property
    def ident(self):
        return self.name if self.ordinal == 1 else f"{self.name}_{self.ordinal}"


class Property:
    def __init__(self, data, owner, where, resolve):
        self.owner = owner
        self.name = data.get("name") or _fail(where, "a property needs a name")
        where = f"{where}, property {self.name}"
        _check_keys(where, data, {"name", "index", "kind", "type", "composite", "ordered", "unique", "readOnly",
                                  "setOnce", "transient", "publicAccessor", "publicMutator", "default", "opposite",
                                  "key", "doc", "heldAsText"})
        self.doc = _doc(where, data)
        self.where = where
        self.index = data.get("index")
        self.kind = data.get("kind", "single")
        if self.kind not in KINDS:
            _fail(where, f"kind is one of {', '.join(KINDS)}")
        self.type = resolve(data.get("type") or _fail(where, "a property needs a type"), where)
        self.composite = data.get("composite", False)
        self.ordered = data.get("ordered", self.kind == "sequence")
        self.unique = data.get("unique", not self.ordered)
        self.read_only = data.get("readOnly", False)
        self.set_once = data.get("setOnce", False)
        self.transient = data.get("transient", False)
        self.public_accessor = data.get("publicAccessor", True)
        self.public_mutator = data.get("publicMutator", True)
        self.default = data.get("default")
        self.held_as_text = data.get("heldAsText", False)
        if self.held_as_text is not False and (self.held_as_text is not True or self.kind != "single"
                                               or self.type.cpp != "qf::zero::JsonValue"):
            _fail(where, "heldAsText is true or false, and true only for a single JsonValue")
        self.opposite_name = data.get("opposite")
        self.key_name = data.get("key")
        self.opposite = None
        self.key = None
        if self.composite and self.type.kind != "class":
            _fail(where, "only references to classes can be composite")
        if self.kind == "map" and self.type.kind != "class":
            _fail(where, "a map holds elements of a class")
        if (self.kind == "map") != (self.key_name is not None):
            _fail(where, "a map needs a key property, and only a map has one")

    @property
    def many(self):
        return KINDS[self.kind] >= 2

    @property
    def is_reference(self):
        return self.type.kind == "class"

    @property
    def is_containment(self):
        return self.composite and self.is_reference

    @property
    def qualified_name(self):
        return f"{self.owner.qualified_name}.{self.name}"

    @property
    def ident(self):
        return self.name

    @property
    def cap(self):
        return self.name[0].upper() + self.name[1:]


class StructuredType(Type):
    def __init__(self, data, package, where):
        super().__init__(data["name"], package)
        self.data = data
        self.where = where
        self.properties = []
        self.operations = []


class DataType(StructuredType):
    kind = "datatype"

    def __init__(self, data, package, where):
        _check_keys(where, data, {"name", "package", "properties", "operations"})
        super().__init__(data, package, where)


class Class(StructuredType):
    kind = "class"

    def __init__(self, data, package, where):
        _check_keys(where, data, {"name", "package", "super", "abstract", "properties", "operations", "overrides",
                                  "declarations", "doc"})
        super().__init__(data, package, where)
        self.doc = _doc(where, data)
        self.super_name = data.get("super", "ModelElement")
        self.superclass = None
        self.is_abstract = data.get("abstract", False)
        self.overrides = []
        self.declarations = data.get("declarations", [])

    def ancestors(self):
        result, current = [], self.superclass
        while current is not None:
            result.append(current)
            current = current.superclass
        return result

    def all_properties(self):
        inherited = self.superclass.all_properties() if self.superclass else []
        return inherited + self.properties

    def all_operations(self):
        inherited = self.superclass.all_operations() if self.superclass else []
        return inherited + self.operations

    @property
    def last_index(self):
        own = [p.index for p in self.properties]
        return max(own) if own else (self.superclass.last_index if self.superclass else 0)


class Description:
    def __init__(self, data, source_name):
        self.source_name = source_name
        _check_keys("description", data, {"metaPackage", "forwardDeclarations", "packages", "primitiveTypes",
                                          "enums", "datatypes", "classes"})
        meta = data.get("metaPackage") or _fail("description", "needs 'metaPackage'")
        _check_keys("metaPackage", meta, {"class", "namespace", "includeDir"})
        for key in ("class", "namespace", "includeDir"):
            if not meta.get(key):
                _fail("metaPackage", f"needs {key!r}")
        self.meta_class = meta["class"]
        self.namespace = meta["namespace"]
        self.include_dir = meta["includeDir"].rstrip("/")
        self.forward_declarations = data.get("forwardDeclarations", {})
        self.packages = [Package(p, f"package {p.get('name', '')!r}") for p in data.get("packages", [])]
        if not self.packages:
            _fail("description", "needs at least one package")
        by_name = {p.name: p for p in self.packages}
        for package in self.packages[1:]:
            parent = by_name.get(package.parent_name)
            if package.parent_name is None or parent is None:
                _fail(f"package {package.name!r}", f"unknown parent {package.parent_name!r}")
            package.parent = parent
            parent.subpackages.append(package)
        self.root = self.packages[0]
        if self.root.parent_name is not None:
            _fail("packages", "the first package is the root and has no parent")
        for package in self.packages:
            if package.namespace is None:
                package.namespace = package.parent.namespace if package.parent else self.namespace
        self.types = {}

        named = [p for p in self.packages if p.name]
        default_package = named[0].name if named else None

        def package_of(item, where):
            name = item.get("package", default_package)
            if name not in by_name:
                _fail(where, f"unknown package {name!r}")
            return by_name[name]

        def add(type_, where):
            if type_.name in self.types or type_.name in FRAMEWORK_TYPES:
                _fail(where, f"the type name {type_.name!r} is taken")
            self.types[type_.name] = type_
            return type_

        for i, item in enumerate(data.get("primitiveTypes", [])):
            where = _named("primitive type", i, item)
            t = add(PrimitiveType(item, package_of(item, where), where), where)
            t.package.primitives.append(t)
        for i, item in enumerate(data.get("enums", [])):
            where = _named("enumeration", i, item)
            t = add(Enum(item, package_of(item, where), where), where)
            t.package.enums.append(t)
        for i, item in enumerate(data.get("datatypes", [])):
            where = _named("datatype", i, item)
            t = add(DataType(item, package_of(item, where), where), where)
            t.package.datatypes.append(t)
        self.classes = []
        for i, item in enumerate(data.get("classes", [])):
            where = _named("class", i, item)
            t = add(Class(item, package_of(item, where), where), where)
            t.package.classes.append(t)
            self.classes.append(t)
        self._resolve_members()
        self._check_indexes()
        self._link()

    def resolve(self, name, where):
        if name in self.types:
            return self.types[name]
        if name in FRAMEWORK_TYPES:
            return FrameworkType(name)
        _fail(where, f"unknown type {name!r}")

    @property
    def datatypes(self):
        return [t for t in self.types.values() if t.kind == "datatype"]

    @property
    def enums(self):
        return [t for t in self.types.values() if t.kind == "enum"]

    @property
    def primitives(self):
        return [t for t in self.types.values() if t.kind == "primitive"]

    def _resolve_members(self):
        for owner in self.classes + self.datatypes:
            for item in owner.data.get("properties", []):
                owner.properties.append(Property(item, owner, owner.where, self.resolve))
            seen = {}
            for item in owner.data.get("operations", []):
                operation = Operation(item, owner, owner.where, self.resolve)
                seen[operation.name] = seen.get(operation.name, 0) + 1
                operation.ordinal = seen[operation.name]
                owner.operations.append(operation)
            signatures = [o.signature for o in owner.operations]
            for s in signatures:
                if signatures.count(s) > 1:
                    _fail(owner.where, f"two operations {s}")
        for cls in self.classes:
            if cls.super_name == "ModelElement":
                continue
            superclass = self.types.get(cls.super_name)
            if superclass is None or superclass.kind != "class":
                _fail(cls.where, f"unknown superclass {cls.super_name!r}")
            cls.superclass = superclass
        for cls in self.classes:
            # Every class on a cycle is checked here, before anything walks its ancestors.
            current, seen = cls.superclass, set()
            while current is not None and current not in seen:
                if current is cls:
                    _fail(cls.where, "the superclass chain is a cycle")
                seen.add(current)
                current = current.superclass
        for cls in self.classes:
            inherited = {o.name: o for o in (cls.superclass.all_operations() if cls.superclass else [])}
            for name in cls.data.get("overrides", []):
                base = inherited.get(name)
                if base is None or not base.is_virtual:
                    _fail(cls.where, f"overrides {name!r}, which no superclass declares virtual")
                cls.overrides.append(base)
            if not cls.is_abstract:
                done = {o.name for c in [cls] + cls.ancestors() for o in c.overrides}
                for o in cls.all_operations():
                    if o.is_abstract and o.name not in done:
                        _fail(cls.where, f"a concrete class must override the abstract operation {o.name!r}")

    def _check_indexes(self):
        for owner in [c for c in self.classes if c.superclass is None] + self.datatypes:
            self._number(owner, 0)

    def _number(self, owner, start):
        expected = start + 1
        for p in owner.properties:
            if p.index is None:
                p.index = expected
            if p.index != expected:
                _fail(p.where, f"index {p.index}, expected {expected} (indexes continue after the superclass's)")
            expected += 1
        if owner.kind == "class":
            for sub in [c for c in self.classes if c.superclass is owner]:
                self._number(sub, expected - 1)

    def _link(self):
        for cls in self.classes:
            for p in cls.properties:
                target = p.type
                if p.opposite_name is not None:
                    if target.kind != "class":
                        _fail(p.where, "only a reference has an opposite")
                    p.opposite = next((q for q in target.all_properties() if q.name == p.opposite_name), None)
                    if p.opposite is None:
                        _fail(p.where, f"{target.name} has no property {p.opposite_name!r}")
                if p.key_name is not None:
                    p.key = next((q for q in target.all_properties() if q.name == p.key_name), None)
                    if p.key is None or p.key.many or p.key.is_reference:
                        _fail(p.where, f"{target.name} has no single-valued attribute {p.key_name!r}")
        for cls in self.classes:
            for p in cls.properties:
                if p.opposite is not None and p.opposite.opposite is not p:
                    _fail(p.where, f"the opposite {p.opposite.qualified_name} must name this property back")

    # ---- identities ---------------------------------------------------------------------

    @property
    def uuid_namespace(self):
        return uuid.uuid3(uuid.UUID(int=0), self.root.uri)

    def item_uuid(self, key):
        """The fixed name-based UUID of a metamodel item, from a key that names it."""
        return str(uuid.uuid3(self.uuid_namespace, key))


def load(path):
    with open(path, encoding="utf-8") as f:
        try:
            data = json.load(f)
        except json.JSONDecodeError as e:
            raise DescriptionError(f"{path}: not JSON: {e}") from None
    # The file name only: generated files must not depend on where the tree lies.
    return Description(data, os.path.basename(path))
