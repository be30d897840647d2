// Randomised edits inside nested savepoints, some cancelled, then a commit: the change
// report's old value of every collection is what the collection held when the
// transaction began, and a collection edited back to its old contents is no change.
#include "support/random_editor.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

namespace qf::zero {
namespace {

using support::RandomEditor;
using support::TestMetamodel;

// An item as text: an element by its UUID, a string or integer by its value.
std::string itemText(const Value& item) {
  if (item.isElement()) return item.getElement().identifier();
  if (item.holds<std::u16string>()) {
    const auto text = item.getValue<std::u16string>();
    return std::string(text.begin(), text.end());
  }
  return std::to_string(item.getValue<int>());
}

// A collection's items as text; sequences and maps list them in a fixed order, sets
// in none, so a set's are sorted.
std::vector<std::string> itemsOf(const std::vector<Value>& items, const meta::Property& property) {
  std::vector<std::string> texts;
  for (const Value& item : items) texts.push_back(itemText(item));
  if (!property->isSequence() && !property->isMap()) std::sort(texts.begin(), texts.end());
  return texts;
}

struct Collection {
  ModelElement element;
  meta::Property property;
  std::vector<std::string> items;
};

std::vector<Collection> capture(const TestMetamodel& tm, const Model& model) {
  std::vector<Collection> all;
  for (const ModelElement& e : model->getInstances(tm.node, query::SearchClassMatchMode::IncludeSubclasses)) {
    for (const meta::Property& p : {tm.tags, tm.children, tm.friends, tm.index, tm.scores}) {
      if (p == tm.scores && e.getMetaClass() != tm.gadget) continue;
      auto* collection = e.getPropertyValue(p).getValue<AbstractOwnedCollection*>();
      all.push_back({e, p, itemsOf(collection->snapshot(), p)});
    }
  }
  return all;
}

struct LastReport : Listener {
  std::shared_ptr<DeepChangeReport<ModelElement>> report;
  void transactionCommitted(const std::shared_ptr<DeepChangeReport<ModelElement>>& r) { report = r; }
};

class RandomOldValues : public ::testing::TestWithParam<unsigned> {};

TEST_P(RandomOldValues, ReportOldCollectionsAsTheTransactionFoundThem) {
  const unsigned seed = GetParam();
  SCOPED_TRACE("seed " + std::to_string(seed));
  TestMetamodel tm;
  Model model = Model::create();
  RandomEditor editor(tm, model, seed);
  for (int i = 0; i < 40; ++i) editor.step();
  const std::vector<Collection> before = capture(tm, model);
  LastReport last;
  model->addDeepListener(&last);

  Transaction outer = model->beginTransaction();
  for (int round = 0; round < 5; ++round) {
    Transaction inner = model->beginTransaction();
    for (int i = 0; i < 12; ++i) {
      editor.step();
      if (HasFatalFailure()) return;
    }
    if (round % 3 == 1) {
      inner.cancel();
    } else {
      inner.commit();
    }
  }
  for (int i = 0; i < 8; ++i) editor.step();
  std::vector<std::vector<std::string>> after;
  for (const Collection& c : before) {
    after.push_back(
        c.element.isLive()
            ? itemsOf(c.element.getPropertyValue(c.property).getValue<AbstractOwnedCollection*>()->snapshot(),
                      c.property)
            : std::vector<std::string>{"(destroyed)"});
  }
  outer.commit();
  model->removeListener(&last);
  ASSERT_TRUE(last.report);

  for (std::size_t i = 0; i < before.size(); ++i) {
    const Collection& c = before[i];
    const std::string where = c.element.identifier() + "." + itemText(Value::of(c.property.getName()));
    const bool destroyed = last.report->isDestroyed(c.element);
    // A map is a set of items: renaming its items reorders it without changing it.
    const auto members = [&](std::vector<std::string> items) {
      if (c.property->isMap()) std::sort(items.begin(), items.end());
      return items;
    };
    if (!last.report->isChanged(c.element, c.property)) {
      if (!destroyed) {
        EXPECT_EQ(members(c.items), members(after[i])) << where << " is reported unchanged";
      }
      continue;
    }
    EXPECT_EQ(c.items, itemsOf(last.report->getOldValue(c.element, c.property).getList(), c.property))
        << where;
    if (!destroyed) {
      EXPECT_NE(members(c.items), members(after[i])) << where << " came back but is reported changed";
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Seeds, RandomOldValues, ::testing::Range(1u, 201u));

}  // namespace
}  // namespace qf::zero
