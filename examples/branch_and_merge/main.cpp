// Two lines of work on one model, recorded as commits on two branches and merged.
//
// Master and a branch "edits" start from one commit of two books. Each line edits in a
// working copy of its own: master changes the year of "Dune" and removes a book, the
// branch retitles "Dune" and adds a tag. Merged with the accept-theirs tool, the branch's
// copy of "Dune" wins whole and master's new year is lost; merged property by property,
// both edits stay. Then both lines set the same title differently: the property tool
// records the conflict and settles it by its policy. Each merge ends with master's
// working copy rewritten to the merged state.
#include "kiv/history/element_reuse_model_builder.h"
#include "kiv/merge/accept_theirs_merge_tool.h"
#include "kiv/merge/property_merge_tool.h"
#include "kiv/merge/recursive_merge3_strategy.h"
#include "kiv/metamodel/branch_impl.h"
#include "kiv/metamodel/commit_impl.h"
#include "kiv/metamodel/delta_impl.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/json_change_report_synchronizer.h"
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"

#include <nlohmann/json.hpp>

#include <functional>
#include <iostream>

using namespace qf::zero;

namespace {

// Package "/demo/library": class Book {title: String, year: Integer, tags: set of String}.
struct Library {
  Model metaModel = Model::create();
  meta::Class book = meta::Class::create(metaModel, {}, u"Book", u"library.Book", false);
  meta::Property title, year, tags;

  Library() {
    auto& registry = meta::MetaRegistry::getInstance();
    meta::Package package = meta::Package::create(metaModel, {}, u"/demo/library", u"library");
    book->setSuperclass(ModelElement::metaClass());
    const auto add = [&](const char16_t* name, meta::ValueFlags flags, const char16_t* type, int index) {
      meta::Property property = meta::Property::create(metaModel, {}, name, flags, false);
      property->setType(registry.getPrimitiveType(type));
      property->setPropertyIndex(index);
      book->addProperty(property);
      return property;
    };
    title = add(u"title", meta::ValueFlags::Single, u"String", 1);
    year = add(u"year", meta::ValueFlags::Single, u"Integer", 2);
    tags = add(u"tags", meta::ValueFlags::Set, u"String", 3);
    package->addType(book);
    registry.registerRootPackage(package);
  }
};

// Records the next committed transaction of a working copy as a commit on a branch.
class Recorder : public Listener {
 public:
  Recorder(Model history, kiv::Branch branch) : history_(std::move(history)), branch_(std::move(branch)) {}

  void transactionCommitted(const std::shared_ptr<ShallowChangeReport<ModelElement>>& report) {
    Transaction transaction = history_->beginTransaction();
    const kiv::Commit commit = kiv::Commit::create(history_);
    if (const kiv::Commit tip = branch_.getTip()) commit->addParent(tip);
    for (const ModelElement& element : report->getAdded()) commit->addCreated(element);
    for (const ModelElement& element : report->getModified()) commit->addUpdated(element);
    for (const ModelElement& element : report->getDestroyed()) {
      if (!commit->getDelta()) commit->setDelta(kiv::Delta::create(history_));
      commit->getDelta()->addDeleted(commit->find(element.getUuid()));
    }
    branch_->commit(commit);
    transaction.commit();
  }

 private:
  Model history_;
  kiv::Branch branch_;
};

void edit(const Model& copy, const Model& history, const kiv::Branch& branch,
          const std::function<void()>& change) {
  Recorder recorder(history, branch);
  copy->addShallowListener(&recorder);
  {
    Transaction transaction = copy->beginTransaction();
    change();
    transaction.commit();
  }
  copy->removeListener(&recorder);
}

Model copyOf(const Model& model) {
  nlohmann::ordered_json document;
  io::JSONSerializer().serialize(model, io::SerializationOutput::forIntermediateFormat(&document));
  Model copy = Model::create();
  io::JSONParser().parseVerbatim(document, copy);
  return copy;
}

void show(const Library& library, const Model& model, const char* heading) {
  std::cout << heading << "\n";
  for (const ModelElement& book : model->getTopLevelElements()) {
    std::cout << "  " << toUtf8(book.getPropertyValue(library.title).getValue<std::u16string>()) << " ("
              << book.getPropertyValue(library.year).getValue<int>() << "), tags:";
    for (const Value& tag :
         book.getPropertyValue(library.tags).getValue<PrimitiveCollection*>()->getAllValues()) {
      std::cout << " " << toUtf8(tag.getValue<std::u16string>());
    }
    std::cout << "\n";
  }
}

}  // namespace

int main() {
  kiv::MetaPackageKiv::getInstance();
  const Library library;
  const auto text = [](const char16_t* value) { return Value::of(std::u16string(value)); };

  const Model history = Model::create();
  const kiv::Branch master = kiv::Branch::create(history);
  master->setName(u"master");
  const kiv::Branch edits = kiv::Branch::create(history);
  edits->setName(u"edits");

  const Model ours = Model::create();
  ModelElement dune, emma;
  edit(ours, history, master, [&] {
    dune = library.book.instantiate(ours);
    dune.setPropertyValue(library.title, text(u"Dune"));
    dune.setPropertyValue(library.year, Value::of(1964));
    emma = library.book.instantiate(ours);
    emma.setPropertyValue(library.title, text(u"Emma"));
    emma.setPropertyValue(library.year, Value::of(1815));
  });
  edits->commit(master.getTip());

  const Model theirs = copyOf(ours);
  ModelElement theirDune = theirs->findElement(dune.getUuid());
  edit(theirs, history, edits, [&] {
    theirDune.setPropertyValue(library.title, text(u"Dune (first edition)"));
    theirDune.getPropertyValue(library.tags).getValue<PrimitiveCollection*>()->genericAdd(text(u"classic"));
  });
  edit(ours, history, master, [&] {
    dune.setPropertyValue(library.year, Value::of(1965));
    emma.destroy();
  });
  show(library, ours, "master:");
  show(library, theirs, "edits:");

  // A merge that is not kept: its transaction is cancelled.
  {
    Transaction tryOut = history->beginTransaction();
    const kiv::Commit merged = kiv::RecursiveMerge3Strategy(std::make_unique<kiv::AcceptTheirsMergeTool>())
                                   .run(master.getTip(), edits.getTip());
    const Model preview = copyOf(ours);
    io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
        merged->diff(master.getTip())->toChangeReport(), preview,
        std::make_unique<kiv::ElementReuseModelBuilder>());
    show(library, preview, "merged taking theirs whole (master's new year is lost):");
  }

  auto owned = std::make_unique<kiv::PropertyMergeTool>();
  const kiv::PropertyMergeTool& tool = *owned;
  const kiv::RecursiveMerge3Strategy byProperty(std::move(owned));
  const auto mergeIntoMaster = [&](const char* heading) {
    const kiv::Commit before = master.getTip();
    {
      Transaction transaction = history->beginTransaction();
      master->merge(edits, byProperty);
      transaction.commit();
    }
    io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
        master.getTip()->diff(before)->toChangeReport(), ours,
        std::make_unique<kiv::ElementReuseModelBuilder>());
    show(library, ours, heading);
  };
  mergeIntoMaster("merged property by property (both edits kept):");

  edit(ours, history, master, [&] { dune.setPropertyValue(library.title, text(u"Dune, revised")); });
  edit(theirs, history, edits, [&] { theirDune.setPropertyValue(library.title, text(u"Dune: the novel")); });
  mergeIntoMaster("both retitled Dune; merged again:");
  for (const kiv::MergeConflict& conflict : tool.conflicts()) {
    std::cout << "conflict on " << conflict.property << " (" << kiv::toString(conflict.kind) << "): base "
              << conflict.base.dump() << ", ours " << conflict.ours.dump() << ", theirs "
              << conflict.theirs.dump() << "; took " << conflict.merged.dump() << "\n";
  }
  return 0;
}
