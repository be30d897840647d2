#include "support/random_editor.h"

#include "qf/zero/core/meta/framework_package.h"

#include <boost/date_time/gregorian/gregorian.hpp>

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

namespace support {

using namespace qf::zero;

void RandomEditor::step() {
  const std::string before = dumpModel(model_);
  try {
    edit();
  } catch (const foundation::core::except::ExceptionBase&) {
    ASSERT_EQ(before, dumpModel(model_)) << "a refused edit changed the model";
  }
}

void RandomEditor::checkInvariants() const {
  const std::vector<ModelElement> all = live();
  ASSERT_EQ(model_->getElementCount(), all.size());
  for (const ModelElement& e : all) {
    ASSERT_EQ(model_->findElement(e.getUuid()), e) << e.identifier() << " is not found by its UUID";
    const ModelElement parent = e.getPropertyValue(tm_.parent).getElement();
    ASSERT_EQ(parent, e.container());
    if (parent) {
      ASSERT_TRUE(tm_.refs(parent, tm_.children)->contains(e));
    }
    for (const ModelElement& child : tm_.refs(e, tm_.children)->getAllValues()) {
      ASSERT_EQ(child.container(), e);
      ASSERT_TRUE(child.isLive());
    }
    for (const ModelElement& f : tm_.refs(e, tm_.friends)->getAllValues()) {
      ASSERT_TRUE(f.isLive());
      ASSERT_TRUE(tm_.refs(f, tm_.friends)->contains(e));
    }
    auto* index = tm_.refs(e, tm_.index);
    for (const ModelElement& member : index->getAllValues()) {
      ASSERT_TRUE(member.isLive());
      ASSERT_EQ(index->genericFind(member.getPropertyValue(tm_.name)).getElement(), member);
    }
    const ModelElement best = e.getPropertyValue(tm_.best).getElement();
    if (best) {
      ASSERT_TRUE(best.isLive());
    }
  }
}

Uuid RandomEditor::reusedUuid() {
  if (!reuseDestroyedUuids_ || destroyed_.empty() || pick(2) == 0) return {};
  const Uuid id = destroyed_[static_cast<std::size_t>(pick(static_cast<int>(destroyed_.size())))];
  return model_->findElement(id) ? Uuid() : id;
}

std::vector<ModelElement> RandomEditor::live() const {
  return model_->getInstances(tm_.node, query::SearchClassMatchMode::IncludeSubclasses);
}

ModelElement RandomEditor::any() {
  auto all = live();
  return all.empty() ? ModelElement() : all[static_cast<std::size_t>(pick(static_cast<int>(all.size())))];
}

std::u16string RandomEditor::someName() { return std::u16string(1, static_cast<char16_t>(u'a' + pick(6))); }

void RandomEditor::edit() {
  ModelElement a = any(), b = any();
  if (!a || pick(8) == 0) {
    const int which = pick(4);
    ModelElement created = (which == 0   ? tm_.leaf
                            : which == 1 ? tm_.gadget
                                         : tm_.node)
                               .instantiate(model_, reusedUuid());
    if (a && pick(2) == 0) tm_.refs(a, tm_.children)->add(created);
    return;
  }
  if (elementCast<meta::Class>(ModelElement(a.getMetaClass())) == tm_.gadget && pick(3) == 0) {
    editGadget(a);
    return;
  }
  switch (pick(16)) {
    case 0:
      a.setPropertyValue(tm_.name, Value::of(someName()));
      break;
    case 1:
      a.setPropertyValue(tm_.count, Value::of(pick(3)));
      break;
    case 2:
      a.setPropertyValue(tm_.kind, Value::createElementValue(
                                       tm_.kindEnum->getLiterals()[static_cast<std::size_t>(pick(2))]));
      break;
    case 3:
      tm_.values(a, tm_.tags)->genericAdd(Value::of(someName()));
      break;
    case 4:
      tm_.values(a, tm_.tags)->genericRemove(Value::of(someName()));
      break;
    case 5:
      tm_.refs(a, tm_.children)->insert(static_cast<std::size_t>(pick(3)), b);
      break;
    case 6:
      b.setPropertyValue(tm_.parent, pick(4) == 0 ? Value() : Value::createElementValue(a));
      break;
    case 7:
      tm_.refs(a, tm_.friends)->add(b);
      break;
    case 8:
      tm_.refs(a, tm_.friends)->remove(b);
      break;
    case 9:
      a.setPropertyValue(tm_.best, Value::createElementValue(b));
      break;
    case 10:
      tm_.refs(a, tm_.index)->add(b);
      break;
    case 11:
      a.setPropertyValue(tm_.born, Value::of(DateTime(boost::gregorian::date(2020, 1, 1 + pick(5)))));
      break;
    case 13:
      tm_.refs(a, tm_.children)->removeAt(static_cast<std::size_t>(pick(3)));
      break;
    case 14:
      if (pick(2) == 0)
        tm_.refs(a, tm_.friends)->clear();
      else
        tm_.values(a, tm_.tags)->genericClear();
      break;
    case 15:
      tm_.refs(a, tm_.index)->remove(b);
      break;
    case 12:
      if (pick(3) == 0) {
        const Uuid id = a.getUuid();
        a.destroy();
        if (reuseDestroyedUuids_) destroyed_.push_back(id);
      }
      break;
  }
}

void RandomEditor::editGadget(ModelElement& gadget) {
  switch (pick(8)) {
    case 6: {
      auto* scores = tm_.values(gadget, tm_.scores);
      const auto at = static_cast<std::size_t>(pick(3));
      if (pick(2) == 0)
        scores->genericInsert(at, Value::of(pick(3)));
      else
        scores->genericRemoveAt(at);
      break;
    }
    case 7:
      tm_.values(gadget, tm_.scores)->genericReplace(static_cast<std::size_t>(pick(3)), Value::of(pick(3)));
      break;
    case 0:
      gadget.setPropertyValue(tm_.flag, Value::of(pick(2) == 0));
      break;
    case 1: {
      JsonValue note = JsonValue::object();
      note["n"] = pick(4);
      note["tags"] = JsonValue::array({"x", pick(2) == 0});
      gadget.setPropertyValue(tm_.note, Value::of(note));
      break;
    }
    case 2:
      tm_.values(gadget, tm_.scores)->genericAdd(Value::of(pick(3)));
      break;
    case 3:
      gadget.setPropertyValue(tm_.spot, pick(3) == 0 ? Value() : Value::of(Point{pick(9), -pick(9)}));
      break;
    case 4:
      gadget.setPropertyValue(tm_.scratch, Value::of(someName()));
      break;
    case 5:
      gadget.setPropertyValue(tm_.weight, Value::of(pick(100)));
      break;
  }
}

}  // namespace support
