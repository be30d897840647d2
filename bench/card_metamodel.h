// The user metamodel of the benchmarks that need elements of a typical size: class Card
// {name, title, note: String; count, weight: Integer}, about 270 bytes of JSON each as
// `fillCard` sets them. Each benchmark registers it under a package of its own.
#pragma once

#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"

#include <string>

namespace bench {

struct CardMetamodel {
  qf::zero::Model metaModel = qf::zero::Model::create();
  std::u16string uri;
  qf::zero::meta::Package package;
  qf::zero::meta::Class card;
  qf::zero::meta::Property name, title, note, count, weight;

  // `prefix`: the package's name, which qualifies the class ("<prefix>.Card").
  CardMetamodel(std::u16string packageUri, const std::u16string& prefix) : uri(std::move(packageUri)) {
    namespace meta = qf::zero::meta;
    auto& registry = meta::MetaRegistry::getInstance();
    package = meta::Package::create(metaModel, {}, uri, prefix);
    card = meta::Class::create(metaModel, {}, u"Card", prefix + u".Card", false);
    card->setSuperclass(qf::zero::ModelElement::metaClass());
    int index = 0;
    const auto add = [&](const char16_t* propertyName, const char16_t* type) {
      meta::Property p = meta::Property::create(metaModel, {}, propertyName, meta::ValueFlags::Single, false);
      p->setType(registry.getPrimitiveType(type));
      p->setPropertyIndex(++index);
      card->addProperty(p);
      return p;
    };
    name = add(u"name", u"String");
    title = add(u"title", u"String");
    note = add(u"note", u"String");
    count = add(u"count", u"Integer");
    weight = add(u"weight", u"Integer");
    package->addType(card);
    registry.registerRootPackage(package);
  }
  ~CardMetamodel() { qf::zero::meta::MetaRegistry::getInstance().unregisterRootPackage(uri); }
  CardMetamodel(const CardMetamodel&) = delete;
  CardMetamodel& operator=(const CardMetamodel&) = delete;

  static std::u16string numbered(const char16_t* prefix, std::size_t number) {
    const std::string digits = std::to_string(number);
    return prefix + std::u16string(digits.begin(), digits.end());
  }

  // A new card numbered `number` in `model`. REQUIRES: an open transaction on it.
  qf::zero::ModelElement makeCard(const qf::zero::Model& model, std::size_t number) const {
    using qf::zero::Value;
    qf::zero::ModelElement made = card.instantiate(model);
    made.setPropertyValue(name, Value::of(numbered(u"card ", number)));
    made.setPropertyValue(title, Value::of(numbered(u"The title of the card numbered ", number)));
    made.setPropertyValue(note,
                          Value::of(numbered(u"A note long enough to make the entry about as large as a "
                                             u"typical element: ",
                                             number)));
    made.setPropertyValue(count, Value::of(static_cast<int>(number)));
    return made;
  }
};

}  // namespace bench
