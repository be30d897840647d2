#include "support/test_metamodel.h"

#include "qf/zero/core/meta/framework_package.h"
#include "qf/zero/core/text.h"

#include <boost/date_time/posix_time/posix_time.hpp>

#include <algorithm>
#include <sstream>
#include <vector>

namespace support {

using namespace qf::zero;

namespace {

meta::Property makeProperty(const Model& m, const meta::Class& owner, const char16_t* name, meta::ValueFlags flags,
                            bool composite, const meta::Type& type, int index) {
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
  return "?";
}

void dumpElement(std::ostringstream& out, const ModelElement& e) {
  out << toUtf8(e.getMetaClass().getQualifiedName()) << ' ' << e.identifier().substr(0, 8) << " in "
      << (e.container() ? e.container().identifier().substr(0, 8) : std::string("-"));
  std::vector<ModelElement> contained;
  for (const meta::Property& p : e->allProperties()) {
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
  for (const ModelElement& child : contained) dumpElement(out, child);
}

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
  born = makeProperty(metaModel, node, u"born", F::Optional, false, registry.getPrimitiveType(u"DateTime"), 10);
  code = makeProperty(metaModel, node, u"code", F::Optional, false, registry.getPrimitiveType(u"UUID"), 11);
  code->setIsReadOnly(true);
  code->setIsSetOnce(true);
  weight = makeProperty(metaModel, leaf, u"weight", F::Single, false, integer, 12);
  for (const meta::Type& type : {meta::Type(kindEnum), meta::Type(node), meta::Type(leaf)}) package->addType(type);
  registry.registerRootPackage(package);
}

TestMetamodel::~TestMetamodel() { meta::MetaRegistry::getInstance().unregisterRootPackage(u"/test/tm"); }

ReferenceCollection* TestMetamodel::refs(const ModelElement& e, const meta::Property& p) const {
  return e.getPropertyValue(p).getValue<ReferenceCollection*>();
}

PrimitiveCollection* TestMetamodel::values(const ModelElement& e, const meta::Property& p) const {
  return e.getPropertyValue(p).getValue<PrimitiveCollection*>();
}

void TestMetamodel::setName(ModelElement& e, const std::u16string& value) const {
  e.setPropertyValue(name, Value::of(value));
}

std::string dumpModel(const Model& model) {
  std::ostringstream out;
  out << model->getElementCount() << " elements\n";
  for (const ModelElement& e : model->getTopLevelElements()) dumpElement(out, e);
  return out.str();
}

}  // namespace support
