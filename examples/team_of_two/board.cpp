#include "board.h"

#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/text.h"
#include "qf/zero/core/value.h"

#include <algorithm>
#include <iostream>
#include <stdexcept>

namespace team_of_two {

using namespace qf::zero;

Board::Board() : metaModel_(Model::create()) {
  auto& registry = meta::MetaRegistry::getInstance();
  const meta::Package package = meta::Package::create(metaModel_, {}, u"/demo/board", u"board");
  cardClass_ = meta::Class::create(metaModel_, {}, u"Card", u"board.Card", false);
  cardClass_->setSuperclass(ModelElement::metaClass());
  const auto add = [&](const char16_t* name, meta::ValueFlags kind, const char16_t* type, int index) {
    meta::Property property = meta::Property::create(metaModel_, {}, name, kind, false);
    property->setType(registry.getPrimitiveType(type));
    property->setPropertyIndex(index);
    property->setIsUnique(kind == meta::ValueFlags::Set);
    cardClass_->addProperty(property);
    return property;
  };
  title_ = add(u"title", meta::ValueFlags::Single, u"String", 1);
  points_ = add(u"points", meta::ValueFlags::Single, u"Integer", 2);
  tags_ = add(u"tags", meta::ValueFlags::Set, u"String", 3);
  package->addType(cardClass_);
  // Commits store elements as documents, which name classes by qualified name.
  registry.registerRootPackage(package);
}

ModelElement Board::addCard(const Model& model, const std::u16string& title, int points,
                            std::initializer_list<std::u16string> tags) const {
  ModelElement created = cardClass_.instantiate(model);
  setTitle(created, title);
  setPoints(created, points);
  for (const std::u16string& tag : tags) addTag(created, tag);
  return created;
}

ModelElement Board::card(const Model& model, const std::u16string& title) const {
  for (const ModelElement& element : model->getTopLevelElements()) {
    if (element.getPropertyValue(title_).getValue<std::u16string>() == title) return element;
  }
  throw std::out_of_range("no card titled '" + toUtf8(title) + "'");
}

void Board::setTitle(ModelElement card, const std::u16string& title) const {
  card.setPropertyValue(title_, Value::of(title));
}

void Board::setPoints(ModelElement card, int points) const {
  card.setPropertyValue(points_, Value::of(points));
}

void Board::addTag(ModelElement card, const std::u16string& tag) const {
  card.getPropertyValue(tags_).getValue<PrimitiveCollection*>()->genericAdd(Value::of(tag));
}

std::vector<std::string> Board::lines(const Model& model) const {
  std::vector<std::string> result;
  for (const ModelElement& element : model->getTopLevelElements()) {
    std::string line = toUtf8(element.getPropertyValue(title_).getValue<std::u16string>()) + ", " +
                       std::to_string(element.getPropertyValue(points_).getValue<int>()) + " pts";
    std::vector<std::string> tags;
    for (const Value& tag :
         element.getPropertyValue(tags_).getValue<PrimitiveCollection*>()->getAllValues()) {
      tags.push_back(toUtf8(tag.getValue<std::u16string>()));
    }
    std::sort(tags.begin(), tags.end());
    for (const std::string& tag : tags) line += " #" + tag;
    result.push_back(std::move(line));
  }
  std::sort(result.begin(), result.end());
  return result;
}

void Board::show(const Model& model, const std::string& heading) const {
  std::cout << heading << "\n";
  const std::vector<std::string> cards = lines(model);
  if (cards.empty()) std::cout << "    (no cards)\n";
  for (const std::string& line : cards) std::cout << "    " << line << "\n";
}

}  // namespace team_of_two
