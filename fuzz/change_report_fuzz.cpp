// Any sequence of change reports applied to a model of the test metamodel (every kind of
// property): each report is applied whole or refused with a catalog error and nothing
// changed, and after every report the model keeps its invariants (containment, opposites
// and map keys agree on both ends; every live element is found by its UUID).
//
// The input is a JSON array of reports, applied one after the other to an empty model.
#include "foundation/core/except/exception.h"
#include "qf/zero/io/json_change_report_synchronizer.h"
#include "qf/zero/io/model_builder.h"
#include "qf/zero/io/packet_codec.h"
#include "support/random_editor.h"
#include "support/test_metamodel.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>

namespace {

const support::TestMetamodel& metamodel() {
  static const support::TestMetamodel tm;  // immutable once built
  return tm;
}

// The editor's invariant checks report through gtest; outside a test, a failure lands in
// the ad hoc result.
bool invariantsHold(const qf::zero::Model& model) {
  support::RandomEditor(metamodel(), model, 0).checkInvariants();
  return !::testing::UnitTest::GetInstance()->ad_hoc_test_result().Failed();
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  metamodel();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  // Deeper nesting than a packet may carry is not a change report anyone receives.
  constexpr std::size_t maxDepth = qf::zero::io::PacketCodec::maxNestingDepth;
  std::size_t depth = 0;
  for (std::size_t i = 0; i < size; ++i) {
    if (data[i] == '[' || data[i] == '{') {
      if (++depth > maxDepth) return 0;
    } else if ((data[i] == ']' || data[i] == '}') && depth > 0) {
      --depth;
    }
  }
  const nlohmann::ordered_json reports = nlohmann::ordered_json::parse(data, data + size, nullptr, false);
  if (reports.is_discarded() || !reports.is_array()) return 0;

  const qf::zero::Model model = qf::zero::Model::create();
  for (const nlohmann::ordered_json& report : reports) {
    const std::string before = support::dumpModel(model);
    try {
      qf::zero::io::JSONChangeReportSynchronizer::applyChangeReportVerbatim(
          report, model, std::make_unique<qf::zero::io::ModelBuilder>());
    } catch (const foundation::core::except::ExceptionBase&) {
      if (support::dumpModel(model) != before) {
        std::fprintf(stderr, "change report: a refused report changed the model\n");
        std::abort();
      }
      continue;
    }
    if (!invariantsHold(model)) {
      std::fprintf(stderr, "change report: an applied report broke the model's invariants\n");
      std::abort();
    }
  }
  return 0;
}
