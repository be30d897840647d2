"""How metamodel types and members are spelled in C++."""

import re

PASSED_BY_VALUE = {"bool", "int"}


def snake(name):
    """File name of a class: LocalRepository -> local_repository, IMergeTool -> imerge_tool."""
    s = re.sub(r"([A-Z]+)([A-Z][a-z])", r"\1_\2", name)
    s = re.sub(r"([a-z0-9])([A-Z])", r"\1_\2", s)
    return s.lower()


def u16(text):
    escaped = text.replace("\\", "\\\\").replace('"', '\\"')
    return f'u"{escaped}"'


def value_type(t):
    """The C++ type of one value of metamodel type t."""
    return t.cpp


def by_value(t):
    return value_type(t) in PASSED_BY_VALUE or t.kind == "enum"


def key_type(prop):
    """The key type of a map: the key property's value type."""
    return value_type(prop.key.type)


def collection_type(prop):
    t = value_type(prop.type)
    if prop.is_reference:
        if prop.kind == "map":
            container = f"std::map<{key_type(prop)}, {t}>"
        else:
            container = f"std::vector<{t}>" if prop.kind == "sequence" else f"std::unordered_set<{t}>"
        return f"qf::zero::TypedReferenceCollectionWithProxies<{t}, {container}>"
    return f"qf::zero::Primitive{'Sequence' if prop.kind == 'sequence' else 'Set'}<{t}>"


def collection_alias(prop):
    return f"{prop.cap}Collection"


def member_type(prop):
    if getattr(prop, "held_as_text", False):
        return "qf::zero::JsonText"
    if prop.many:
        return collection_alias(prop)
    if prop.kind == "optional" and not prop.is_reference:
        return f"boost::optional<{value_type(prop.type)}>"
    return value_type(prop.type)


def param(prop):
    """Parameter type of a setter of a single-valued property."""
    if getattr(prop, "held_as_text", False):
        return f"const {value_type(prop.type)}&"
    mt = member_type(prop)
    return mt if by_value(prop.type) and prop.kind != "optional" else f"const {mt}&"


def getter_return(prop, in_handle=False):
    if getattr(prop, "held_as_text", False):
        return value_type(prop.type)  # parsed from the held text on each call
    if prop.many:
        return f"const {collection_type(prop) if in_handle else collection_alias(prop)}&"
    if prop.is_reference or by_value(prop.type):
        return member_type(prop)
    return f"const {member_type(prop)}&"


def member(prop):
    return f"{prop.name}_"


def default_initializer(prop):
    """The member initializer for a property's default, or '' for value-initialisation."""
    if prop.default is None or prop.many or prop.is_reference:
        return ""
    cpp = value_type(prop.type)
    if cpp == "std::u16string":
        return "" if prop.default == "" else f"{u16(prop.default)}"
    if cpp == "int":
        int(prop.default)
        return prop.default
    if cpp == "bool":
        if prop.default not in ("true", "false"):
            raise ValueError(f"{prop.where}: a Boolean default is true or false")
        return prop.default
    raise ValueError(f"{prop.where}: defaults of type {prop.type.name} are not supported")


def typeref(ref):
    if ref.cpp_override:
        return ref.cpp_override
    t = value_type(ref.type)
    if ref.many:
        t = f"std::vector<{t}>"
    if ref.optional:
        t = f"boost::optional<{t}>"
    return t


def argument_decl(arg):
    t = typeref(arg.type)
    if arg.direction == "out":
        return f"{t}& {arg.name}"
    if arg.type.cpp_override:
        return f"{t} {arg.name}"
    if not arg.type.many and not arg.type.optional and by_value(arg.type.type):
        return f"{t} {arg.name}"
    return f"const {t}& {arg.name}"


def result_decl(op):
    return typeref(op.result) if op.result else "void"


def op_params(op):
    return ", ".join(argument_decl(a) for a in op.args)


def op_call_args(op):
    return ", ".join(a.name for a in op.args)


def ns_open(namespace):
    return f"namespace {namespace} {{"


def ns_close(namespace):
    return f"}}  // namespace {namespace}"


def handle_base(cls):
    return cls.superclass.cpp if cls.superclass else "::qf::zero::ModelElement"


def impl_base(cls):
    return f"{cls.superclass.cpp}::Impl" if cls.superclass else "::qf::zero::ModelElement::Impl"


def package_getter(item):
    """The MetaPackage accessor of a type, property, literal or operation."""
    from .description import Operation, Property
    if isinstance(item, Property):
        return f"get{item.owner.name}_{item.name}"
    if isinstance(item, Operation):
        return f"get{item.owner.name}_{item.ident}_operation"
    return f"get{item.name}"


# The member types a map key holds as they are (the alternatives of qf::zero::MapKey).
_MAP_KEY_TYPES = {"std::u16string", "bool", "int", "qf::zero::Uuid"}


def map_key_properties(cls):
    """The single attributes of a class whose value can key a map, read without a Value."""
    return [p for p in cls.properties
            if not p.many and not p.is_reference and not p.held_as_text and p.type is not None
            and value_type(p.type) in _MAP_KEY_TYPES]
