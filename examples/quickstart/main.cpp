// Defines a small metamodel at run time, edits a model in transactions, prints the
// change report, then cancels a transaction and shows the model restored.
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/text.h"

#include <iostream>

using namespace qf::zero;

namespace {

struct Printer : Listener {
  meta::Property title;
  void transactionCommitted(const std::shared_ptr<ShallowChangeReport<ModelElement>>& report) {
    std::cout << "committed: " << report->getAdded().size() << " added, " << report->getModified().size()
              << " modified, " << report->getDestroyed().size() << " destroyed\n";
    for (const ModelElement& e : report->getModified()) {
      std::cout << "  " << e.identifier() << " title was '"
                << toUtf8(report->getOldValue(e, title).getValue<std::u16string>()) << "'\n";
    }
  }
};

}  // namespace

int main() {
  Model metaModel = Model::create();
  meta::Class book = meta::Class::create(metaModel, {}, u"Book", u"demo.Book", false);
  book->setSuperclass(ModelElement::metaClass());
  meta::Property title = meta::Property::create(metaModel, {}, u"title", meta::ValueFlags::Single, false);
  title->setType(meta::MetaRegistry::getInstance().getPrimitiveType(u"String"));
  title->setPropertyIndex(1);
  book->addProperty(title);

  Model model = Model::create();
  Printer printer;
  printer.title = title;
  model->addShallowListener(&printer);

  ModelElement dune;
  {
    Transaction t = model->beginTransaction();
    dune = book.instantiate(model);
    dune.setPropertyValue(title, Value::of(std::u16string(u"Dune")));
    t.commit();
  }
  {
    Transaction t = model->beginTransaction();
    dune.setPropertyValue(title, Value::of(std::u16string(u"Dune Messiah")));
    t.commit();
  }
  {
    Transaction t = model->beginTransaction();
    dune.setPropertyValue(title, Value::of(std::u16string(u"Children of Dune")));
    book.instantiate(model);
    std::cout << "inside a transaction: " << model->getElementCount() << " elements, title '"
              << toUtf8(dune.getPropertyValue(title).getValue<std::u16string>()) << "'\n";
  }  // not committed: cancelled
  std::cout << "after cancel: " << model->getElementCount() << " element, title '"
            << toUtf8(dune.getPropertyValue(title).getValue<std::u16string>()) << "'\n";
  model->removeListener(&printer);
  return 0;
}
