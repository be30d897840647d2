// The task board the team edits: package "/demo/board" with
//   class Card {title: String, points: Integer, tags: set of String}
// defined at run time, and the few edits and prints the story needs.
//
// Cards are looked up by title on every edit rather than kept as handles: a checkout or a
// pull rewrites the user model, and a card that leaves the model and comes back (a
// branch's card, after a checkout and a merge) is a new element with the old UUID.
#pragma once

#include "qf/zero/core/meta/property.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model.h"
#include "qf/zero/core/model_element.h"

#include <initializer_list>
#include <string>
#include <vector>

namespace team_of_two {

class Board {
 public:
  // Defines the metamodel and registers its package; make one board per process.
  Board();

  // A new card in `model`. Call inside a transaction of the model.
  qf::zero::ModelElement addCard(const qf::zero::Model& model, const std::u16string& title, int points,
                                 std::initializer_list<std::u16string> tags) const;
  // The card of `model` titled `title`; raises std::out_of_range when there is none, which
  // in this story means the story itself is wrong.
  qf::zero::ModelElement card(const qf::zero::Model& model, const std::u16string& title) const;

  void setTitle(qf::zero::ModelElement card, const std::u16string& title) const;
  void setPoints(qf::zero::ModelElement card, int points) const;
  void addTag(qf::zero::ModelElement card, const std::u16string& tag) const;

  // One line per card, "title, N pts #tag ...", cards by title and tags sorted, so that
  // two models holding the same cards give the same lines whatever their element order.
  std::vector<std::string> lines(const qf::zero::Model& model) const;
  // Prints `heading` and the lines of `model` indented beneath it.
  void show(const qf::zero::Model& model, const std::string& heading) const;

 private:
  qf::zero::Model metaModel_;  // holds the metamodel's items: it lives as long as the board
  qf::zero::meta::Class cardClass_;
  qf::zero::meta::Property title_, points_, tags_;
};

}  // namespace team_of_two
