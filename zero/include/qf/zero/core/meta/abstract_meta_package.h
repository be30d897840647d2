// AbstractMetaPackage: the base of a generated metamodel package. It owns the model
// that holds the package's metamodel items and makes each item under a fixed UUID
// given as text, so that documents and packets naming metamodel items stay readable
// across runs and versions.
//
//   class MyPackage : public meta::AbstractMetaPackage {
//     void build() {
//       root_ = createPackage(u"/example/1", u"", "9d0f...-...");
//       book_ = createClass(u"Book", u"example.Book", false, "5a1c...-...");
//     }
//   };
//
// Items are built once, outside transactions, and never change afterwards.
#pragma once

#include "qf/zero/core/meta/enum.h"
#include "qf/zero/core/meta/operation.h"
#include "qf/zero/core/meta/package.h"
#include "qf/zero/core/meta/primitive_type.h"
#include "qf/zero/core/meta/structured_type.h"
#include "qf/zero/core/model.h"

#include <memory>
#include <string>
#include <string_view>

namespace qf::zero::meta {

// Owns the model of a metamodel's items and makes each item under a fixed UUID. A derived
// package builds its items once and never changes them.
class AbstractMetaPackage {
 public:
  AbstractMetaPackage();
  virtual ~AbstractMetaPackage();
  AbstractMetaPackage(const AbstractMetaPackage&) = delete;
  AbstractMetaPackage& operator=(const AbstractMetaPackage&) = delete;

  // The model the package's items live in.
  const Model& getMetaModel() const noexcept { return metaModel_; }

 protected:
  // `uuidText` is the item's canonical UUID text; a malformed text is a programming
  // error of the generator and raises "InvalidValue".
  Package createPackage(std::u16string uri, std::u16string name, std::string_view uuidText);
  Class createClass(std::u16string name, std::u16string qualifiedName, bool isAbstract,
                    std::string_view uuidText);
  DataType createDataType(std::u16string name, std::u16string qualifiedName, std::string_view uuidText);
  Enum createEnum(std::u16string name, std::u16string qualifiedName, std::string_view uuidText);
  EnumLiteral createEnumLiteral(std::u16string name, int value, std::string_view uuidText);
  PrimitiveType createPrimitiveType(std::u16string name, std::u16string qualifiedName,
                                    std::shared_ptr<const ValueTraits> traits, std::string_view uuidText);
  Property createProperty(std::u16string name, ValueFlags flags, bool isComposite, std::string_view uuidText);
  Operation createOperation(std::u16string name, std::string_view uuidText);
  Argument createArgument(std::u16string name, std::string_view uuidText);

  static void setPropertyIndex(const Property& property, int index) { property->setPropertyIndex(index); }
  static void setInvoker(const Operation& operation, std::unique_ptr<AbstractMethodInvoker> invoker) {
    operation->setInvoker(std::move(invoker));
  }
  static void registerRootPackage(const Package& package);
  static void unregisterRootPackage(std::u16string_view uri);

 private:
  Model metaModel_;
};

}  // namespace qf::zero::meta
