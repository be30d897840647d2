// Defines a small metamodel at run time, edits a model in transactions, prints the
// change report, cancels a transaction and shows the model restored, then writes the
// model as a JSON document, reads it into a second model, and keeps that copy up to
// date by applying the first model's change reports as JSON, sent as packets between
// the two ends of an in-process channel.
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/in_process_channel.h"
#include "qf/zero/io/json_change_report_synchronizer.h"
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"
#include "qf/zero/io/packet_transport.h"

#include <nlohmann/json.hpp>

#include <iostream>

using namespace qf::zero;

namespace {

struct Printer : Listener {
  meta::Property title;
  io::JSONSerializer serializer;
  nlohmann::ordered_json lastReport;
  void transactionCommitted(const std::shared_ptr<ShallowChangeReport<ModelElement>>& report) {
    std::cout << "committed: " << report->getAdded().size() << " added, " << report->getModified().size()
              << " modified, " << report->getDestroyed().size() << " destroyed\n";
    for (const ModelElement& e : report->getModified()) {
      std::cout << "  " << e.identifier() << " title was '"
                << toUtf8(report->getOldValue(e, title).getValue<std::u16string>()) << "'\n";
    }
    lastReport = io::JSONChangeReportSynchronizer::writeChangeReport(*report, serializer);
  }
};

}  // namespace

int main() {
  Model metaModel = Model::create();
  meta::Package package = meta::Package::create(metaModel, {}, u"/demo", u"demo");
  meta::Class book = meta::Class::create(metaModel, {}, u"Book", u"demo.Book", false);
  book->setSuperclass(ModelElement::metaClass());
  meta::Property title = meta::Property::create(metaModel, {}, u"title", meta::ValueFlags::Single, false);
  title->setType(meta::MetaRegistry::getInstance().getPrimitiveType(u"String"));
  title->setPropertyIndex(1);
  book->addProperty(title);
  package->addType(book);
  meta::MetaRegistry::getInstance().registerRootPackage(package);  // documents name classes by qualified name

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

  nlohmann::ordered_json document;
  io::JSONSerializer().serialize(model, io::SerializationOutput::forIntermediateFormat(&document));
  std::cout << "as a document: " << document.dump(2) << "\n";
  Model copy = Model::create();
  io::JSONParser().parseVerbatim(document, copy);
  auto titleIn = [&](const Model& m) {
    return toUtf8(m->findElement(dune.getUuid()).getPropertyValue(title).getValue<std::u16string>());
  };
  std::cout << "read back into a second model: title '" << titleIn(copy) << "'\n";

  {
    Transaction t = model->beginTransaction();
    dune.setPropertyValue(title, Value::of(std::u16string(u"God Emperor of Dune")));
    t.commit();
  }
  std::cout << "the change report as JSON: " << printer.lastReport.dump() << "\n";

  // The copy lives behind a packet transport; its handler runs on the receiving thread
  // and is the only code that touches the copy meanwhile.
  auto [near, far] = io::InProcessChannel::createPair();
  io::PacketTransport sender(near), receiver(far);
  receiver.setPacketHandler("ChangeReport", [&](const io::JSONPacket& packet) {
    io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(packet.getJson(), copy,
                                                                std::make_unique<io::ModelBuilder>());
    return boost::optional<io::JSONPacket>(io::JSONPacket("Applied", titleIn(copy)));
  });
  const io::JSONPacket reply =
      sender.sendAndExpectPacket(io::JSONPacket("ChangeReport", printer.lastReport), "Applied");
  std::cout << "sent as a packet; the peer replied " << reply.getType() << ", title now "
            << reply.getJson().dump() << "\n";
  model->removeListener(&printer);
  return 0;
}
