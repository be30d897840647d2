// Builds on an installed kiv: the classes of shelf.json come from the installed generator,
// the library from the installed package. A user model is put under version control, two
// transactions become two commits, and undo and redo must step the model and the branch
// back and forth between them. Prints each failed check and exits with 1 when any failed.
#include "consumer/shelf/book_impl.h"
#include "consumer/shelf/meta_package_shelf.h"
#include "consumer/shelf/shelf_impl.h"
#include "foundation/core/except/exception.h"
#include "kiv/kiv.h"
#include "qf/zero/core/text.h"

#include <exception>
#include <iostream>
#include <string>

using consumer::shelf::Book;
using consumer::shelf::Shelf;
using qf::zero::Model;

namespace {

int failures = 0;

void check(bool ok, const std::string& what) {
  if (!ok) {
    std::cerr << "consumer: failed: " << what << "\n";
    ++failures;
  }
}

// The shelf of the user model as its label and the pages of its books, e.g. "Desk: 612 320".
std::string show(const Model& user, const qf::zero::Uuid& shelfId) {
  const Shelf shelf = qf::zero::elementCast<Shelf>(user->findElement(shelfId));
  if (!shelf) return "(no shelf)";
  std::string text = qf::zero::toUtf8(shelf.getLabel()) + ":";
  for (const Book& book : shelf.getBooks().getTypedValues()) text += " " + std::to_string(book.getPages());
  return text;
}

void run() {
  consumer::shelf::MetaPackageShelf::getInstance();
  kiv::MetaPackageKiv::getInstance();

  const Model repositories = Model::create();
  const Model user = Model::create();
  const kiv::LocalRepository repository = kiv::LocalRepository::create(repositories, user);
  repository->init(kiv::RepoType::Regular);
  const kiv::Workspace workspace = repository->getWorkspace(user);
  const kiv::Branch head = repository->getHead();
  check(qf::zero::toUtf8(head.getName()) == "master", "a new repository's head is master");

  Shelf shelf;
  workspace->commitTransaction([&] {
    const Book dune = Book::Builder(user).doSetTitle(u"Dune").doSetPages(612).create();
    shelf = Shelf::Builder(user).doSetLabel(u"Bedside").doAddBooks(dune).create();
  });
  const qf::zero::Uuid shelfId = shelf.getUuid();
  const kiv::Commit first = head.getTip();
  check(static_cast<bool>(first), "the first transaction made a commit");

  workspace->commitTransaction([&] {
    shelf->setLabel(u"Desk");
    const Book cosmos = Book::create(user);
    cosmos->setTitle(u"Cosmos");
    cosmos->setPages(320);
    shelf->getBooksMutable().add(cosmos);
  });
  const kiv::Commit second = head.getTip();
  const auto parents = second->getParents().getTypedValues();
  check(parents.size() == 1 && parents.front() == first, "the second commit continues the first");
  check(show(user, shelfId) == "Desk: 612 320", "after two commits: " + show(user, shelfId));

  workspace->undo();
  check(show(user, shelfId) == "Bedside: 612", "after undo: " + show(user, shelfId));
  check(head.getTip() == first, "undo moves the branch back to the first commit");
  check(user->getElementCount() == 2, "undo destroys the book the second commit made");
  check(workspace->canRedo(), "the undone commit can be redone");

  workspace->redo();
  check(show(user, shelfId) == "Desk: 612 320", "after redo: " + show(user, shelfId));
  check(head.getTip() == second, "redo moves the branch to the second commit again");

  workspace->undo();
  workspace->undo();
  check(user->getElementCount() == 0, "undoing both commits empties the user model");
  check(!workspace->canUndo(), "nothing is left to undo");
}

}  // namespace

int main() {
  try {
    run();
  } catch (const foundation::core::except::ExceptionBase& error) {
    std::cerr << "consumer: raised " << error.GetID() << ": " << error.message() << "\n";
    return 1;
  } catch (const std::exception& error) {
    std::cerr << "consumer: raised: " << error.what() << "\n";
    return 1;
  }
  if (failures > 0) return 1;
  std::cout << "consumer: generated classes, commit, undo and redo work against the installed kiv\n";
  return 0;
}
