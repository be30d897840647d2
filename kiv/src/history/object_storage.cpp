#include "history/history_support.h"
#include "kiv/history/element_reuse_model_builder.h"
#include "kiv/metamodel/object_storage_impl.h"
#include "qf/zero/core/json_text.h"
#include "qf/zero/core/value.h"
#include "qf/zero/io/json_constants.h"
#include "qf/zero/io/json_parser.h"
#include "qf/zero/io/json_serializer.h"
#include "qf/zero/io/parse_customizer.h"

#include <nlohmann/json.hpp>

#include <memory>

namespace kiv {

namespace {

using qf::zero::io::JSONConstants;

// The serializer that captures elements for the storages of one history model, kept
// beside it: it learns each user class once, not once per capture.
qf::zero::io::JSONSerializer& captureSerializer(qf::zero::ModelImpl& model) {
  static const int key = 0;  // its address names the attachment; the object is immutable
  std::shared_ptr<void>& slot = model.attachment(&key);
  if (!slot) {
    auto serializer = std::make_shared<qf::zero::io::JSONSerializer>();
    serializer->getCustomizer().setShouldSkipDefaultValues(false);
    slot = serializer;
  }
  return *static_cast<qf::zero::io::JSONSerializer*>(slot.get());
}

}  // namespace

// The whole entry is written, default values included, so that replaying it resets
// every property of an element that is refreshed in place.
ObjectStorage ObjectStorage::Impl::setContent(const qf::zero::ModelElement& element) {
  history::requireLive(element, u"kiv.ObjectStorage.setContent");
  qf::zero::Transaction transaction = history::beginTransactionOn(*this);
  qf::zero::JsonText entry =
      qf::zero::JsonText::fromCompactText(captureSerializer(*getModelImpl()).writeEntryText(element));
  const auto& elementUuidProperty = MetaPackageKiv::getInstance().getObjectStorage_elementUUID();
  // elementUUID is read-only to users; the storage itself names the element it holds.
  if (elementUUID_ != element.getUuid()) {
    if (canStoreDirectly(elementUuidProperty, /*initializing=*/true)) {
      qf::zero::Transaction store = beginDirectStore(elementUuidProperty);
      elementUUID_ = element.getUuid();
      store.commit();
    } else {
      assignValue(elementUuidProperty,
                  qf::zero::Value::createPrimitiveValue(elementUuidProperty, element.getUuid()),
                  /*initializing=*/true);
    }
  }
  setContentText(std::move(entry));
  transaction.commit();
  return ObjectStorage(this);
}

bool ObjectStorage::Impl::isEmpty() const { return !elementUUID_ || elementUUID_->is_nil(); }

qf::zero::ModelElement ObjectStorage::Impl::instantiate(const qf::zero::Model& model) const {
  if (!model) qf::zero::reportException(qf0::messages::CannotCreateWithoutModel());
  qf::zero::JsonValue document = qf::zero::JsonValue::object();
  document[JSONConstants::VERSION_ATTR] = JSONConstants::FORMAT_VERSION;
  document[JSONConstants::ENTRIES_ATTR] = qf::zero::JsonValue::array();
  document[JSONConstants::ENTRIES_ATTR].push_back(content_.parse());
  qf::zero::io::JSONParser parser(std::make_unique<qf::zero::io::ParseCustomizer>(),
                                  std::make_unique<ElementReuseModelBuilder>());
  parser.parseVerbatim(document, model);
  return isEmpty() ? qf::zero::ModelElement() : model->findElement(*elementUUID_);
}

bool ObjectStorage::Impl::isEqual(const ObjectStorage& other) const {
  if (!history::isLive(other) || other.getUuid() != getUuid()) return false;
  if (other->elementUUID_ != elementUUID_) return false;
  return other.getImpl() == this || other->content_ == content_;
}

bool ObjectStorage::Impl::hasSameContent(const ObjectStorage& other) const {
  if (!history::isLive(other) || other->isEmpty() || isEmpty()) return false;
  return other.getImpl() == this || (other->elementUUID_ == elementUUID_ && other->content_ == content_);
}

}  // namespace kiv
