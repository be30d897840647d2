// The program of docs/getting-started.md: defines a small metamodel at run time (a
// package, an enumeration, two classes with attributes and references), registers it,
// and builds and reads a model through the reflective API only. The page quotes this
// file; change both together.
#include "foundation/core/except/exception.h"
#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/meta_registry.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/primitive_collection.h"
#include "qf/zero/core/reference_collection.h"
#include "qf/zero/core/text.h"

#include <iostream>
#include <string>

using namespace qf::zero;

namespace {

// Package "shelf" (URI "/getting-started/shelf"):
//   enum Genre { Fiction, Science }
//   class Shelf: name String, books ordered containment of Book (opposite Book.shelf)
//   class Book:  title String, pages Integer (default 100), genre Genre, tags set of String,
//                shelf optional Shelf (opposite Shelf.books), sequel optional Book
struct ShelfMetamodel {
  Model metaModel = Model::create();  // holds the metamodel's items; keep it alive
  meta::Package package;
  meta::Enum genre;
  meta::EnumLiteral fiction, science;
  meta::Class shelf, book;
  meta::Property shelfName, books;
  meta::Property title, pages, bookGenre, tags, bookShelf, sequel;
};

meta::Property addProperty(const ShelfMetamodel& mm, const meta::Class& owner, const char16_t* name,
                           meta::ValueFlags kind, const meta::Type& type, int index, bool composite = false) {
  meta::Property property = meta::Property::create(mm.metaModel, {}, name, kind, composite);
  property->setType(type);
  property->setPropertyIndex(index);  // 1, 2, ... in each class, after the superclass's last
  property->setIsUnique(kind == meta::ValueFlags::Set);
  owner->addProperty(property);
  return property;
}

ShelfMetamodel defineMetamodel() {
  ShelfMetamodel mm;
  const auto& registry = meta::MetaRegistry::getInstance();
  const meta::PrimitiveType string = registry.getPrimitiveType(u"String");
  const meta::PrimitiveType integer = registry.getPrimitiveType(u"Integer");

  mm.package = meta::Package::create(mm.metaModel, {}, u"/getting-started/shelf", u"shelf");
  mm.genre = meta::Enum::create(mm.metaModel, {}, u"Genre", u"shelf.Genre");
  mm.fiction = meta::EnumLiteral::create(mm.metaModel, {}, u"Fiction", 0);
  mm.science = meta::EnumLiteral::create(mm.metaModel, {}, u"Science", 1);
  mm.genre->addLiteral(mm.fiction);
  mm.genre->addLiteral(mm.science);

  mm.shelf = meta::Class::create(mm.metaModel, {}, u"Shelf", u"shelf.Shelf", false);
  mm.book = meta::Class::create(mm.metaModel, {}, u"Book", u"shelf.Book", false);
  mm.shelf->setSuperclass(ModelElement::metaClass());
  mm.book->setSuperclass(ModelElement::metaClass());

  using Kind = meta::ValueFlags;
  mm.shelfName = addProperty(mm, mm.shelf, u"name", Kind::Single, string, 1);
  mm.books = addProperty(mm, mm.shelf, u"books", Kind::Sequence, mm.book, 2, /*composite=*/true);
  mm.books->setIsOrdered(true);
  mm.title = addProperty(mm, mm.book, u"title", Kind::Single, string, 1);
  mm.pages = addProperty(mm, mm.book, u"pages", Kind::Single, integer, 2);
  mm.pages->setDefaultValue(u"100");
  mm.bookGenre = addProperty(mm, mm.book, u"genre", Kind::Single, mm.genre, 3);
  mm.tags = addProperty(mm, mm.book, u"tags", Kind::Set, string, 4);
  mm.bookShelf = addProperty(mm, mm.book, u"shelf", Kind::Optional, mm.shelf, 5);
  mm.sequel = addProperty(mm, mm.book, u"sequel", Kind::Optional, mm.book, 6);
  mm.books->setOpposite(mm.bookShelf);  // each end names the other
  mm.bookShelf->setOpposite(mm.books);

  for (const meta::Type& type : {meta::Type(mm.genre), meta::Type(mm.shelf), meta::Type(mm.book)})
    mm.package->addType(type);
  return mm;
}

std::string text(const Value& value) { return toUtf8(value.getValue<std::u16string>()); }

void printShelf(const ShelfMetamodel& mm, const ModelElement& shelf) {
  std::cout << text(shelf.getPropertyValue(mm.shelfName)) << ":\n";
  auto* books = shelf.getPropertyValue(mm.books).getValue<ReferenceCollection*>();
  for (const ModelElement& book : books->getAllValues()) {
    const auto genre = elementCast<meta::EnumLiteral>(book.getPropertyValue(mm.bookGenre).getElement());
    std::cout << "  " << text(book.getPropertyValue(mm.title)) << ", "
              << book.getPropertyValue(mm.pages).getValue<int>() << " pages, " << toUtf8(genre.getName());
    auto* tags = book.getPropertyValue(mm.tags).getValue<PrimitiveCollection*>();
    for (const Value& tag : tags->getAllValues()) std::cout << " #" << text(tag);
    if (const ModelElement sequel = book.getPropertyValue(mm.sequel).getElement())
      std::cout << ", followed by " << text(sequel.getPropertyValue(mm.title));
    std::cout << "\n";
  }
}

}  // namespace

int main() {
  const ShelfMetamodel mm = defineMetamodel();
  // Once per process per URI: the registry is process-wide, and a second metamodel whose
  // types have the same qualified names raises "TypeAlreadyRegistered".
  meta::MetaRegistry::getInstance().registerRootPackage(mm.package);

  Model model = Model::create();
  ModelElement shelf;
  {
    Transaction t = model->beginTransaction();
    shelf = mm.shelf.instantiate(model);
    shelf.setPropertyValue(mm.shelfName, Value::of(std::u16string(u"Bedside")));

    ModelElement dune = mm.book.instantiate(model);
    dune.setPropertyValue(mm.title, Value::of(std::u16string(u"Dune")));
    dune.setPropertyValue(mm.pages, Value::of(612));
    dune.setPropertyValue(mm.bookGenre, Value::createElementValue(mm.fiction));  // a literal is an element
    auto* tags = dune.getPropertyValue(mm.tags).getValue<PrimitiveCollection*>();
    tags->genericAdd(Value::of(std::u16string(u"desert")));
    tags->genericAdd(Value::of(std::u16string(u"politics")));

    // Unset values are the defaults: 100 pages, and an enumeration's first literal.
    ModelElement messiah = mm.book.instantiate(model);
    messiah.setPropertyValue(mm.title, Value::of(std::u16string(u"Dune Messiah")));
    dune.setPropertyValue(mm.sequel, Value::createElementValue(messiah));

    auto* books = shelf.getPropertyValue(mm.books).getValue<ReferenceCollection*>();
    books->add(dune);  // checked and recorded like a setter; sets Book.shelf, the opposite
    books->add(messiah);
    t.commit();
  }
  printShelf(mm, shelf);

  // Book.shelf was set as the opposite of Shelf.books; a containment also makes the container.
  ModelElement dune =
      shelf.getPropertyValue(mm.books).getValue<ReferenceCollection*>()->getAllValues().front();
  const ModelElement dunesShelf = dune.getPropertyValue(mm.bookShelf).getElement();
  std::cout << "Dune is on " << text(dunesShelf.getPropertyValue(mm.shelfName))
            << ", its container: " << std::boolalpha << (dune.container() == shelf) << "\n";

  // Bad input is refused with a message from the catalog; the transaction, left without a
  // commit, rolls back.
  try {
    Transaction t = model->beginTransaction();
    dune.setPropertyValue(mm.pages, Value::of(300));
    dune.setPropertyValue(mm.pages, Value::of(std::u16string(u"many")));
    t.commit();
  } catch (const foundation::core::except::ExceptionBase& error) {
    std::cout << "refused: " << error.GetID() << ": " << error.message() << "\n";
  }
  std::cout << "Dune still has " << dune.getPropertyValue(mm.pages).getValue<int>() << " pages\n";

  // What registering gives: the types are found by qualified name, as documents name them.
  const meta::Class found = meta::MetaRegistry::getInstance().getClass(u"shelf.Book");
  std::cout << "registered: " << toUtf8(found.getQualifiedName()) << " has "
            << found->getAllProperties().size() << " properties\n";
  return 0;
}
