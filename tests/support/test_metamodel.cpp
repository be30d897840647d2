#include "support/test_metamodel.h"

#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/meta/property_serializer.h"
#include "qf/zero/core/text.h"

#include <boost/date_time/posix_time/posix_time.hpp>

#include <nlohmann/json.hpp>

#include <algorithm>
#include <sstream>
#include <vector>

namespace support {

using namespace qf::zero;

namespace {

meta::Property makeProperty(const Model& m, const meta::Class& owner, const char16_t* name,
                            meta::ValueFlags flags, bool composite, const meta::Type& type, int index) {
  meta::Property p = meta::Property::create(m, {}, name, flags, composite);
  p->setType(type);
  p->setPropertyIndex(index);
  p->setIsUnique(true);
  owner->addProperty(p);
  return p;
}

std::string text(const Value& v) {
  if (v.isEmpty()) return "-";
  if (v.isElement()) {
    if (auto literal = elementCast<meta::EnumLiteral>(v.getElement())) return toUtf8(literal.getName());
    return v.getElement().identifier().substr(0, 8);
  }
  if (v.holds<std::u16string>()) return "'" + toUtf8(v.getValue<std::u16string>()) + "'";
  if (v.holds<int>()) return std::to_string(v.getValue<int>());
  if (v.holds<Uuid>()) return toText(v.getValue<Uuid>()).substr(0, 8);
  if (v.holds<DateTime>()) return boost::posix_time::to_iso_extended_string(v.getValue<DateTime>());
  if (v.holds<bool>()) return v.getValue<bool>() ? "true" : "false";
  if (v.holds<JsonValue>()) return v.getValue<JsonValue>().dump();
  if (v.holds<Point>())
    return "(" + std::to_string(v.getValue<Point>().x) + "," + std::to_string(v.getValue<Point>().y) + ")";
  return "?";
}

void dumpElement(std::ostringstream& out, const ModelElement& e, bool includeTransient) {
  out << toUtf8(e.getMetaClass().getQualifiedName()) << ' ' << e.identifier().substr(0, 8) << " in "
      << (e.container() ? e.container().identifier().substr(0, 8) : std::string("-"));
  std::vector<ModelElement> contained;
  for (const meta::Property& p : e->allProperties()) {
    if (p->isTransient() && !includeTransient) continue;
    out << ' ' << toUtf8(p.getName()) << '=';
    const Value v = e.getPropertyValue(p);
    if (!p->isMany()) {
      out << text(v);
      if (p->isContainment() && v.isElement()) contained.push_back(v.getElement());
      continue;
    }
    auto* collection = v.getValue<AbstractOwnedCollection*>();
    std::vector<std::string> items;
    for (std::size_t i = 0; i < collection->size(); ++i) {
      const Value item = collection->genericAt(i);
      items.push_back(text(item));
      if (p->isContainment()) contained.push_back(item.getElement());
    }
    if (!p->isSequence()) std::sort(items.begin(), items.end());
    out << '[';
    for (const auto& item : items) out << item << ',';
    out << ']';
  }
  out << '\n';
  for (const ModelElement& child : contained) dumpElement(out, child, includeTransient);
}

// Points are written as {"x": .., "y": ..}.
class PointSerializer final : public meta::DatatypeSerializer {
 public:
  PointSerializer(meta::Property x, meta::Property y) : x_(std::move(x)), y_(std::move(y)) {}
  Value createDefault() const override { return Value::of(Point{}); }
  Value getPropertyValue(const Value& datum, const meta::Property& property) const override {
    const Point p = datum.getValue<Point>();
    return Value::of(coordinate(p, property));
  }
  Value setPropertyValue(const Value& datum, const meta::Property& property,
                         const Value& value) const override {
    Point p = datum.getValue<Point>();
    (property == x_ ? p.x : p.y) = value.getValue<int>();
    (void)coordinate(p, property);
    return Value::of(p);
  }

 private:
  int coordinate(const Point& p, const meta::Property& property) const {
    if (property == x_) return p.x;
    if (property == y_) return p.y;
    reportException(qf0::messages::NoSuchProperty(u"tm.Point", property.getName()));
  }
  meta::Property x_, y_;
};

}  // namespace

TestMetamodel::TestMetamodel() {
  auto& registry = meta::MetaRegistry::getInstance();
  package = meta::Package::create(metaModel, {}, u"/test/tm", u"tm");
  kindEnum = meta::Enum::create(metaModel, {}, u"Kind", u"tm.Kind");
  kindEnum->addLiteral(meta::EnumLiteral::create(metaModel, {}, u"Plain", 0));
  kindEnum->addLiteral(meta::EnumLiteral::create(metaModel, {}, u"Fancy", 1));
  node = meta::Class::create(metaModel, {}, u"Node", u"tm.Node", false);
  leaf = meta::Class::create(metaModel, {}, u"Leaf", u"tm.Leaf", false);
  node->setSuperclass(ModelElement::metaClass());
  leaf->setSuperclass(node);
  const auto string = registry.getPrimitiveType(u"String");
  const auto integer = registry.getPrimitiveType(u"Integer");
  using F = meta::ValueFlags;
  name = makeProperty(metaModel, node, u"name", F::Single, false, string, 1);
  count = makeProperty(metaModel, node, u"count", F::Single, false, integer, 2);
  count->setDefaultValue(u"7");
  kind = makeProperty(metaModel, node, u"kind", F::Single, false, kindEnum, 3);
  tags = makeProperty(metaModel, node, u"tags", F::Set, false, string, 4);
  children = makeProperty(metaModel, node, u"children", F::Sequence, true, node, 5);
  children->setIsOrdered(true);
  parent = makeProperty(metaModel, node, u"parent", F::Optional, false, node, 6);
  children->setOpposite(parent);
  parent->setOpposite(children);
  friends = makeProperty(metaModel, node, u"friends", F::Set, false, node, 7);
  friends->setOpposite(friends);
  best = makeProperty(metaModel, node, u"best", F::Optional, false, node, 8);
  index = makeProperty(metaModel, node, u"index", F::Map, false, node, 9);
  index->setQualifiedBy(name);
  born =
      makeProperty(metaModel, node, u"born", F::Optional, false, registry.getPrimitiveType(u"DateTime"), 10);
  code = makeProperty(metaModel, node, u"code", F::Optional, false, registry.getPrimitiveType(u"UUID"), 11);
  code->setIsReadOnly(true);
  code->setIsSetOnce(true);
  weight = makeProperty(metaModel, leaf, u"weight", F::Single, false, integer, 12);

  gadget = meta::Class::create(metaModel, {}, u"Gadget", u"tm.Gadget", false);
  gadget->setSuperclass(leaf);
  point = meta::DataType::create(metaModel, {}, u"Point", u"tm.Point");
  pointX = meta::Property::create(metaModel, {}, u"x", F::Single, false);
  pointY = meta::Property::create(metaModel, {}, u"y", F::Single, false);
  for (auto& coordinate : {pointX, pointY}) {
    coordinate->setType(integer);
    point->addProperty(coordinate);
  }
  pointX->setPropertyIndex(1);
  pointY->setPropertyIndex(2);
  flag =
      makeProperty(metaModel, gadget, u"flag", F::Single, false, registry.getPrimitiveType(u"Boolean"), 13);
  flag->setDefaultValue(u"true");
  note =
      makeProperty(metaModel, gadget, u"note", F::Single, false, registry.getPrimitiveType(u"JsonValue"), 14);
  scores = makeProperty(metaModel, gadget, u"scores", F::Sequence, false, integer, 15);
  scores->setIsUnique(false);
  scores->setIsOrdered(true);
  spot = makeProperty(metaModel, gadget, u"spot", F::Optional, false, point, 16);
  scratch = makeProperty(metaModel, gadget, u"scratch", F::Single, false, string, 17);
  scratch->setIsTransient(true);

  for (const meta::Type& type :
       {meta::Type(kindEnum), meta::Type(node), meta::Type(leaf), meta::Type(gadget), meta::Type(point)}) {
    package->addType(type);
  }
  registry.registerRootPackage(package);
  meta::PropertySerializerRegistry::getInstance().registerDatatypeSerializer(
      point, std::make_unique<PointSerializer>(pointX, pointY));
}

TestMetamodel::~TestMetamodel() {
  meta::PropertySerializerRegistry::getInstance().unregister(point);
  meta::MetaRegistry::getInstance().unregisterRootPackage(u"/test/tm");
}

ReferenceCollection* TestMetamodel::refs(const ModelElement& e, const meta::Property& p) const {
  return e.getPropertyValue(p).getValue<ReferenceCollection*>();
}

PrimitiveCollection* TestMetamodel::values(const ModelElement& e, const meta::Property& p) const {
  return e.getPropertyValue(p).getValue<PrimitiveCollection*>();
}

void TestMetamodel::setName(ModelElement& e, const std::u16string& value) const {
  e.setPropertyValue(name, Value::of(value));
}

std::string dumpModel(const Model& model, bool includeTransient) {
  std::ostringstream out;
  out << model->getElementCount() << " elements\n";
  for (const ModelElement& e : model->getTopLevelElements()) dumpElement(out, e, includeTransient);
  return out.str();
}

}  // namespace support
