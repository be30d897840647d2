// JSONChangeReportSynchronizer: change reports as JSON, written from one model and
// applied to another.
//
//   {"added": [entry ...], "modified": [entry ...], "destroyed": [entry ...]}
//
// "added" and "modified" hold the elements' entries as the JSON serializer writes
// them; "destroyed" entries need only their type and id.
#pragma once

#include "qf/zero/core/change_report.h"
#include "qf/zero/core/model.h"
#include "qf/zero/io/json_serializer.h"
#include "qf/zero/io/model_builder.h"
#include "qf/zero/io/parse_customizer.h"

#include <nlohmann/json_fwd.hpp>

#include <memory>

namespace qf::zero::io {

// Writes a committed transaction's report as JSON, and applies such a report to another model
// all or nothing.
class JSONChangeReportSynchronizer {
 public:
  // Applies `report` to `model` in one transaction (a savepoint of the caller's, when
  // one is open): entries of "added" and "modified" are parsed together, an element
  // that exists being updated in place and one that does not being made by `builder`;
  // then the live elements named in "destroyed" are destroyed, and a destroyed entry
  // the model does not hold is ignored. A failure changes nothing.
  static void applyChangeReportVerbatim(const nlohmann::ordered_json& report, const Model& model,
                                        std::unique_ptr<ModelBuilder> builder,
                                        std::unique_ptr<ParseCustomizer> customizer = nullptr);

  // The JSON form of a committed transaction's report, written with `serializer`.
  static nlohmann::ordered_json writeChangeReport(const ReportData& report, JSONSerializer& serializer);

  // A report of the three given arrays, taken over without a copy.
  static nlohmann::ordered_json makeChangeReport(nlohmann::ordered_json added,
                                                 nlohmann::ordered_json modified,
                                                 nlohmann::ordered_json destroyed);
};

}  // namespace qf::zero::io
