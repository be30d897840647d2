// A user of the framework with a metamodel of their own: the classes of library.json
// are generated at build time (see CMakeLists.txt), the operations are written by hand
// in operations.cpp. Builds a small library in a transaction, cancels a second one and
// shows the model restored, calls the operations typed and reflectively, and prints the
// model as a JSON document.
#include "example/library/author_impl.h"
#include "example/library/book_impl.h"
#include "example/library/library_impl.h"
#include "example/library/meta_package_library.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/json_serializer.h"

#include <boost/date_time/posix_time/posix_time.hpp>

#include <nlohmann/json.hpp>

#include <iostream>
#include <memory>

using namespace example::library;
using qf::zero::Model;
using qf::zero::ModelElement;
using qf::zero::toUtf8;
using qf::zero::Value;

namespace {

void printShelf(const char* when, const Library& library) {
  std::cout << when << ": " << toUtf8(library.getName()) << " has";
  for (const auto& [title, book] : library.getBooks().container()) {
    std::cout << " '" << toUtf8(title) << "' (" << book.getPages() << " pages";
    if (const Author author = book.getAuthor()) std::cout << ", by " << toUtf8(author.getName());
    std::cout << ")";
  }
  std::cout << "\n";
}

}  // namespace

int main() {
  // Builds the metamodel on first use and registers it, so that documents can name its
  // classes and enumeration literals.
  const MetaPackageLibrary& package = MetaPackageLibrary::getInstance();

  Model model = Model::create();
  Library library;
  {
    auto t = model->beginTransaction();
    const Author herbert = Author::Builder(model).doSetName(u"Frank Herbert").create();
    // A child builder: the book is created inside the library, in the same step.
    auto dune = std::make_unique<Book::Builder>();
    dune->doSetTitle(u"Dune")
        .doSetPages(612)
        .doSetGenre(Genre::Fiction)
        .doSetPublished(boost::posix_time::time_from_string("1965-08-01 00:00:00"))
        .doAddTags({u"desert", u"politics"})
        .doSetAuthor(herbert);
    library = Library::Builder(model)
                  .doSetName(u"Town library")
                  .doAddBooks(std::move(dune))
                  .doAddAuthors(herbert)
                  .create();
    // Setters on the implementation; each change joins the open transaction.
    const Book cosmos = Book::create(model);
    cosmos->setTitle(u"Cosmos");
    cosmos->setPages(365);
    cosmos->setGenre(Genre::Science);
    cosmos->getTagsMutable().insert(u"astronomy");
    library->getBooksMutable().add(cosmos);
    t.commit();
  }
  printShelf("committed", library);
  const Author herbert = library.getAuthors().getTypedValues().front();
  std::cout << toUtf8(herbert.getName()) << " wrote " << herbert.getBooks().size()
            << " book(s) here: the opposite of Book.author\n";

  {
    auto t = model->beginTransaction();
    library.findByTitle(u"Dune")->setTitle(u"Dune (abridged)");  // the map is rekeyed
    library.findByTitle(u"Cosmos").destroy();
    library->setName(u"Village library");
    printShelf("inside a transaction", library);
  }  // not committed: cancelled
  printShelf("after cancel", library);

  const Book dune = library.findByTitle(u"Dune");
  std::cout << "typed: Dune is " << (dune.isLong() ? "long" : "short") << "; "
            << library.countOf(Genre::Science) << " science book(s)\n";
  const Value found =
      library.invoke(package.getLibrary_findByTitle_operation(), {Value::of(std::u16string(u"Cosmos"))});
  ModelElement cosmos = found.getElement();
  const Value isLong = cosmos.invoke(package.getBook_isLong_operation(), {});
  const Value count = library.invoke(package.getLibrary_countOf_operation(), {Value::of(Genre::Fiction)});
  std::cout << "reflective: Cosmos is " << (isLong.getValue<bool>() ? "long" : "short") << "; "
            << count.getValue<int>() << " fiction book(s)\n";

  nlohmann::ordered_json document;
  qf::zero::io::JSONSerializer().serialize(
      model, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
  std::cout << "as a document: " << document.dump(2) << "\n";
  return 0;
}
