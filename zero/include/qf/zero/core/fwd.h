// Forward declarations of the framework's core types.
#pragma once

namespace qf::zero {

class Model;
class ModelImpl;
class ModelElement;
class Transaction;
class Value;
class JsonText;
class ValueMeta;
class AbstractOwnedCollection;
class ReferenceCollection;
class PrimitiveCollection;
class ReportData;
class Listener;
class ListenerHolderBase;
struct ProxyId;

namespace internal {
struct TransactionState;
struct ElementRecord;
}  // namespace internal

namespace meta {
class NamedElement;
class Package;
class Type;
class PrimitiveType;
class StructuredType;
class DataType;
class Class;
class Enum;
class EnumLiteral;
class TypedElement;
class Property;
class Operation;
class Argument;
class MetaRegistry;
class AbstractMethodInvoker;
}  // namespace meta

// How a property value is read: the default resolves proxies where it can; the
// no-proxy-resolve form hands back what is stored, proxies included.
enum class AccessTag { Default, NoProxyResolve };

}  // namespace qf::zero
