#include "qf/zero/io/json_change_report_synchronizer.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/model_impl.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"
#include "qf/zero/io/json_constants.h"
#include "qf/zero/io/json_parser.h"

#include <nlohmann/json.hpp>

namespace qf::zero::io {

using nlohmann::ordered_json;

namespace {

// Hands back the live element an entry names, so that applying a report refreshes
// elements rather than duplicating them; everything else goes to the caller's builder.
class ReusingBuilder final : public ModelBuilder {
 public:
  explicit ReusingBuilder(std::unique_ptr<ModelBuilder> inner)
      : inner_(inner ? std::move(inner) : std::make_unique<ModelBuilder>()) {}

  ModelElement instantiate(const Model& model, const meta::Class& metaClass, const ElementId& id) override {
    if (ModelElement existing = findLiveElement(model, id)) return existing;
    return inner_->instantiate(model, metaClass, id);
  }
  Value instantiateDataType(const meta::DataType& type) override { return inner_->instantiateDataType(type); }
  ModelElement findReference(const Model& model, const meta::Class& metaClass, const ElementId& id) override {
    return inner_->findReference(model, metaClass, id);
  }
  void setValue(ModelElement& element, const meta::Property& property, const Value& value) override {
    inner_->setValue(element, property, value);
  }
  void setJsonValue(ModelElement& element, const meta::Property& property, const JsonValue& json) override {
    inner_->setJsonValue(element, property, json);
  }
  void setObjectValue(ModelElement& element, const meta::Property& property, const Value& item) override {
    inner_->setObjectValue(element, property, item);
  }
  void clearObjectValue(ModelElement& element, const meta::Property& property) override {
    inner_->clearObjectValue(element, property);
  }
  Value createEmptyOptionalValue(const meta::Property& property) override {
    return inner_->createEmptyOptionalValue(property);
  }

 private:
  std::unique_ptr<ModelBuilder> inner_;
};

const ordered_json& memberArray(const ordered_json& report, const char* name) {
  static const ordered_json empty = ordered_json::array();
  const auto it = report.find(name);
  if (it == report.end() || it->is_null()) return empty;
  if (!it->is_array()) {
    reportException(
        qf0::messages::MalformedDocument(std::string("the member '") + name + "' is not an array"));
  }
  return *it;
}

}  // namespace

void JSONChangeReportSynchronizer::applyChangeReportVerbatim(const ordered_json& report, const Model& model,
                                                             std::unique_ptr<ModelBuilder> builder,
                                                             std::unique_ptr<ParseCustomizer> customizer) {
  if (!report.is_object())
    reportException(qf0::messages::MalformedDocument("the change report is not an object"));
  std::vector<const ordered_json*> entries;
  for (const char* member : {JSONConstants::ADDED_ATTR, JSONConstants::MODIFIED_ATTR}) {
    for (const ordered_json& entry : memberArray(report, member)) entries.push_back(&entry);
  }
  std::vector<Uuid> destroyed;
  for (const ordered_json& entry : memberArray(report, JSONConstants::DESTROYED_ATTR)) {
    const auto id = entry.is_object() ? entry.find(JSONConstants::ID_ATTR) : entry.end();
    std::optional<Uuid> uuid;
    if (id != entry.end() && id->is_string()) uuid = parseUuid(id->get_ref<const std::string&>());
    if (!uuid) reportException(qf0::messages::MalformedDocument("a destroyed entry has no element id"));
    destroyed.push_back(*uuid);
  }

  Transaction transaction = model->beginTransaction(true);
  JSONParser parser(std::move(customizer), std::make_unique<ReusingBuilder>(std::move(builder)));
  parser.parseEntries(entries, model);
  for (const Uuid& uuid : destroyed) {
    if (ModelElement element = model->findElement(uuid); element && element.isLive()) element.destroy();
  }
  transaction.commit();
}

ordered_json JSONChangeReportSynchronizer::writeChangeReport(const ReportData& report,
                                                             JSONSerializer& serializer) {
  ordered_json added = ordered_json::array();
  ordered_json modified = ordered_json::array();
  ordered_json destroyed = ordered_json::array();
  for (const ReportData::Entry& entry : report.getEntries()) {
    switch (entry.kind) {
      case ReportData::Kind::Added:
        added.push_back(serializer.writeEntry(entry.element));
        break;
      case ReportData::Kind::Modified:
        modified.push_back(serializer.writeEntry(entry.element));
        break;
      case ReportData::Kind::Destroyed: {
        ordered_json gone = ordered_json::object();
        gone[JSONConstants::TYPE_ATTR] = toUtf8(entry.element.getMetaClass().getQualifiedName());
        gone[JSONConstants::ID_ATTR] = entry.element.identifier();
        gone[JSONConstants::CONTENT_ATTR] = ordered_json::object();
        destroyed.push_back(std::move(gone));
        break;
      }
    }
  }
  return makeChangeReport(std::move(added), std::move(modified), std::move(destroyed));
}

ordered_json JSONChangeReportSynchronizer::makeChangeReport(ordered_json added, ordered_json modified,
                                                            ordered_json destroyed) {
  // An ordered object keeps its members in a vector whose pairs have a const key, so growing
  // it copies every member it holds: a whole array of entries per insertion. Room for all
  // three first makes each insertion a move.
  ordered_json result = ordered_json::object();
  result.get_ref<ordered_json::object_t&>().reserve(3);
  result[JSONConstants::ADDED_ATTR] = std::move(added);
  result[JSONConstants::MODIFIED_ATTR] = std::move(modified);
  result[JSONConstants::DESTROYED_ATTR] = std::move(destroyed);
  return result;
}

}  // namespace qf::zero::io
