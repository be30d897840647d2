// Model: the handle of a container of elements with transactions and listeners.
// Its implementation, ModelImpl (also known as Model::Impl), is in model_impl.h.
//
//   Model model = Model::create();
//   Transaction t = model->beginTransaction();
//   ...
//   t.commit();
#pragma once

#include "qf/zero/core/fwd.h"
#include "qf/zero/core/ref_counted.h"
#include "qf/zero/core/uuid.h"

#include <functional>

namespace qf::zero {

// How a model relates to others; passed through to the model.
enum class ModelConstellation { Standalone, Shared };

// A counted handle: copies share one ModelImpl, and a default-made handle holds none. ==
// compares identity.
class Model {
 public:
  using Impl = ModelImpl;
  class Freezer;
  class Thawer;

  // Out of line, like the destructor: including this header does not need ModelImpl.
  Model() noexcept;
  explicit Model(ModelImpl* impl) noexcept;
  Model(const Model& other) noexcept;
  Model(Model&& other) noexcept;
  Model& operator=(const Model& other) noexcept;
  Model& operator=(Model&& other) noexcept;
  ~Model();
  // A new empty model with UUID `id` (a fresh one when nil).
  static Model create(const Uuid& id = {}, ModelConstellation constellation = ModelConstellation::Standalone);
  // The framework's class "Model".
  static meta::Class metaClass();

  explicit operator bool() const noexcept { return impl_.get() != nullptr; }
  ModelImpl* getImpl() const noexcept { return impl_.get(); }
  ModelImpl* operator->() const noexcept { return impl_.get(); }
  friend bool operator==(const Model& a, const Model& b) noexcept { return a.impl_ == b.impl_; }

 private:
  IntrusivePtr<ModelImpl> impl_;
};

// While a Freezer lives (and until thaw()), every change to the model raises
// "CannotModifyFrozenModel". Freezers nest.
class Model::Freezer {
 public:
  explicit Freezer(const Model& model);
  ~Freezer();
  Freezer(const Freezer&) = delete;
  Freezer& operator=(const Freezer&) = delete;
  void thaw() noexcept;

 private:
  IntrusivePtr<ModelImpl> model_;
};

// Lifts every freeze of the model for its own scope.
class Model::Thawer {
 public:
  explicit Thawer(const Model& model);
  ~Thawer();
  Thawer(const Thawer&) = delete;
  Thawer& operator=(const Thawer&) = delete;

 private:
  IntrusivePtr<ModelImpl> model_;
};

}  // namespace qf::zero

// Hashes by identity, consistent with ==.
template <>
struct std::hash<qf::zero::Model> {
  std::size_t operator()(const qf::zero::Model& m) const noexcept {
    return std::hash<const void*>()(m.getImpl());
  }
};
