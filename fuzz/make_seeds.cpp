// Writes a seed corpus for each fuzz target: packets, pushed histories and change reports
// as the library itself writes them, so that fuzzing starts from inputs that go deep.
//
//   fuzz_seeds <directory>   writes <directory>/{packet_codec,history_unpack,change_report}/*
#include "kiv/kiv.h"
#include "kiv/metamodel/protocol/history_impl.h"
#include "kiv/workspace/load_context.h"
#include "qf/zero/core/listener.h"
#include "qf/zero/io/json_change_report_synchronizer.h"
#include "qf/zero/io/packet_codec.h"
#include "support/random_editor.h"
#include "support/test_metamodel.h"

#include <nlohmann/json.hpp>

#include <filesystem>
#include <fstream>
#include <iostream>
#include <string>
#include <vector>

namespace {

using nlohmann::ordered_json;
using qf::zero::io::JSONPacket;
using qf::zero::io::PacketCodec;

void write(const std::filesystem::path& directory, const std::string& name, const std::string& text) {
  std::filesystem::create_directories(directory);
  std::ofstream(directory / name, std::ios::binary) << text;
}

// The body a clone pushes to its fresh bare origin after `edits` random edits, each a commit.
std::string pushedHistory(const support::TestMetamodel& tm, unsigned seed, int edits) {
  const qf::zero::Model repositories = qf::zero::Model::create();
  const qf::zero::Model originUser = qf::zero::Model::create();
  const qf::zero::Model user = qf::zero::Model::create();
  const kiv::LocalRepository origin = kiv::LocalRepository::create(repositories, originUser);
  origin->init(kiv::RepoType::Bare);
  const kiv::LocalRepository clone = kiv::LocalRepository::clone(origin, kiv::RepoType::Regular);
  const kiv::Workspace workspace = clone->getWorkspace(user);
  kiv::loadContext(workspace);
  support::RandomEditor editor(tm, user, seed);
  for (int i = 0; i < edits; ++i) workspace->commitTransaction([&] { editor.step(); });

  qf::zero::Transaction transaction = repositories->beginTransaction();
  const kiv::protocol::History history = kiv::protocol::History::create(repositories);
  history->getPreviousMutable().add(origin->getBranches().container().at(u"master"));
  history->getCurrentMutable().add(clone->getHead());
  transaction.commit();
  return history.pack().dump();
}

struct ReportWriter : qf::zero::Listener {
  qf::zero::io::JSONSerializer serializer;
  ordered_json reports = ordered_json::array();
  void transactionCommitted(
      const std::shared_ptr<qf::zero::ShallowChangeReport<qf::zero::ModelElement>>& report) {
    reports.push_back(qf::zero::io::JSONChangeReportSynchronizer::writeChangeReport(*report, serializer));
  }
};

// The reports of `edits` random edits of an empty model.
std::string changeReports(const support::TestMetamodel& tm, unsigned seed, int edits) {
  const qf::zero::Model model = qf::zero::Model::create();
  ReportWriter writer;
  model->addShallowListener(&writer);
  support::RandomEditor editor(tm, model, seed);
  for (int i = 0; i < edits; ++i) editor.step();
  model->removeListener(&writer);
  return writer.reports.dump();
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2) {
    std::cerr << "usage: fuzz_seeds <directory>\n";
    return 2;
  }
  const std::filesystem::path root = argv[1];
  const support::TestMetamodel tm;
  kiv::MetaPackageKiv::getInstance();

  const std::filesystem::path packets = root / "packet_codec";
  write(packets, "pull_info", PacketCodec::encode(JSONPacket("PullInfo", nullptr), 1));
  write(packets, "repo_info",
        PacketCodec::encode(JSONPacket("RepoInfo", {{"isBare", true}, {"head", "master"}}), 2, 1));
  write(packets, "error",
        PacketCodec::encode(JSONPacket("Error", {{"message", "no"}, {"messageId", "x/y"}}), 3, 2));
  write(packets, "push",
        PacketCodec::encode(JSONPacket("Push", ordered_json::parse(pushedHistory(tm, 1, 1))), 4));

  // Small seeds: libFuzzer mutates within the size of the largest, and every byte costs.
  for (unsigned seed = 1; seed <= 6; ++seed) {
    const int edits = static_cast<int>(seed);
    write(root / "history_unpack", "push_" + std::to_string(seed), pushedHistory(tm, seed, edits));
    write(root / "change_report", "reports_" + std::to_string(seed), changeReports(tm, seed, edits * 3));
  }
  return 0;
}
