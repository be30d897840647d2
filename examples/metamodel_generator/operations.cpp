// The operations declared in library.json. The generator declares them on the Impl
// classes, forwards the handles' calls to them and installs reflective invokers; their
// bodies are the only hand-written part of the element classes.
#include "example/library/book_impl.h"
#include "example/library/library_impl.h"

#include <algorithm>

namespace example::library {

Book Library::Impl::findByTitle(const std::u16string& title) const {
  const auto& byTitle = getBooks().container();
  const auto found = byTitle.find(title);
  return found == byTitle.end() ? Book() : found->second;
}

int Library::Impl::countOf(Genre genre) const {
  const auto& byTitle = getBooks().container();
  return static_cast<int>(std::count_if(byTitle.begin(), byTitle.end(),
                                        [&](const auto& entry) { return entry.second.getGenre() == genre; }));
}

// Long enough to need a second evening.
bool Book::Impl::isLong() const { return getPages() > 400; }

}  // namespace example::library
