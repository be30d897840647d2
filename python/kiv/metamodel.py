"""User metamodels made at run time, or loaded from the generator's JSON description.

    mm = kiv.Metamodel("library", "/example/library/1")
    genre = mm.add_enum("Genre", ["Fiction", "Science"])
    book = mm.add_class("Book")
    book.add_property("title", "String")
    book.add_property("genre", genre)
    book.add_property("tags", "String", kind="set")
    shelf = mm.add_class("Shelf")
    shelf.add_property("books", book, kind="sequence", composite=True, opposite="shelf")
    book.add_property("shelf", shelf, kind="optional", opposite="books")
    mm.register()            # once per process per URI

A property's ``kind`` is "single", "optional", "sequence", "set" or "map" (a map needs
``key``, the name of the target's property that keys it). ``type`` is a primitive
type's name ("String", "Boolean", "Integer", "UUID", "DateTime", "JsonValue"), a class
or enumeration of this metamodel, or a registered type's qualified name.
"""

import json
import os

from . import _kiv


class ClassBuilder:
    """A class of a metamodel under construction."""

    def __init__(self, metamodel, name, meta_class, superclass):
        self.metamodel = metamodel
        self.name = name
        self.meta_class = meta_class
        self.superclass = superclass
        self._own = []

    def property_count(self):
        inherited = self.superclass.property_count() if self.superclass is not None else 0
        return inherited + len(self._own)

    def add_property(self, name, type, kind="single", composite=False, ordered=None, unique=None,
                     default=None, opposite=None, key=None):
        """Adds a property; returns its MetaProperty. Opposites and keys are linked by register()."""
        if isinstance(type, ClassBuilder):
            type = type.meta_class
        if ordered is None:
            ordered = kind == "sequence"
        if unique is None:
            unique = not ordered
        made = self.metamodel._package.add_property(
            self.meta_class, name, kind, type, composite, self.property_count() + 1, ordered, unique,
            None if default is None else str(default))
        self._own.append(name)
        if opposite is not None or key is not None:
            self.metamodel._links.append((made, type, opposite, key))
        return made


class Metamodel:
    """A package of enumerations and classes, registered with register()."""

    def __init__(self, name, uri):
        self.name = name
        self.uri = uri
        self._package = _kiv.MetaPackage(uri, name)
        self.classes = {}
        self.enums = {}
        self._links = []
        self._registered = False

    def add_enum(self, name, literals):
        """``literals``: names (valued 0, 1, ...) or (name, value) pairs."""
        pairs = [(item, index) if isinstance(item, str) else tuple(item) for index, item in enumerate(literals)]
        made = self._package.add_enum(name, pairs)
        self.enums[name] = made
        return made

    def add_class(self, name, superclass=None, abstract=False):
        made = self._package.add_class(name, abstract)
        if superclass is not None:
            made.set_superclass(superclass.meta_class)
        builder = ClassBuilder(self, name, made, superclass)
        self.classes[name] = builder
        return builder

    def register(self):
        """Links opposites and keys and registers the package; returns self."""
        if self._registered:
            return self
        for prop, target, opposite, key in self._links:
            if opposite is not None:
                prop.set_opposite(target.property(opposite))
            if key is not None:
                prop.set_key(target.property(key))
        self._package.register()
        self._registered = True
        return self

    def __getitem__(self, name):
        """A class of this metamodel by name, as a MetaClass."""
        return self.classes[name].meta_class

    @staticmethod
    def from_description(description):
        """A metamodel from the generator's JSON description: a dict, JSON text or a file path.

        Operations and C++-only settings of the description are ignored: a run-time class
        has no C++ code behind its operations. The result is registered.
        """
        if isinstance(description, (str, os.PathLike)) and not str(description).lstrip().startswith("{"):
            with open(description, encoding="utf-8") as source:
                description = json.load(source)
        elif isinstance(description, str):
            description = json.loads(description)
        packages = description.get("packages") or []
        if not packages:
            raise ValueError("a description needs a package")
        package = packages[0]
        metamodel = Metamodel(package["name"], package["uri"])
        for enum in description.get("enums", []):
            metamodel.add_enum(enum["name"], enum["literals"])
        pending = list(description.get("classes", []))
        # Superclasses first, whatever the order of the description.
        while pending:
            ready = [c for c in pending if c.get("super", "ModelElement") in ("ModelElement",) or
                     c.get("super") in metamodel.classes]
            if not ready:
                names = ", ".join(c["name"] for c in pending)
                raise ValueError(f"unknown superclass among: {names}")
            for cls in ready:
                superclass = metamodel.classes.get(cls.get("super", "ModelElement"))
                metamodel.add_class(cls["name"], superclass, cls.get("abstract", False))
                pending.remove(cls)

        def type_of(name):
            if name in metamodel.classes:
                return metamodel.classes[name]
            if name in metamodel.enums:
                return metamodel.enums[name]
            return name

        # Properties in the description's order, parents before children.
        ordered = []
        seen = set()

        def visit(cls):
            if cls["name"] in seen:
                return
            parent = cls.get("super")
            for other in description.get("classes", []):
                if other["name"] == parent:
                    visit(other)
            seen.add(cls["name"])
            ordered.append(cls)

        for cls in description.get("classes", []):
            visit(cls)
        for cls in ordered:
            builder = metamodel.classes[cls["name"]]
            for prop in cls.get("properties", []):
                builder.add_property(prop["name"], type_of(prop["type"]), kind=prop.get("kind", "single"),
                                     composite=prop.get("composite", False), ordered=prop.get("ordered"),
                                     unique=prop.get("unique"), default=prop.get("default"),
                                     opposite=prop.get("opposite"), key=prop.get("key"))
        return metamodel.register()
